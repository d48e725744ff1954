#include "platform/linux/bundles/DesktopBundle.h"

#include "platform/linux/bundles/LocaleLanguages.h"

namespace kelvo {

std::optional<std::string> DesktopBundle::localizedDisplayName() const {
    return nameForUser(entry_->file.localizedNames, *languages_);
}

}  // namespace kelvo
