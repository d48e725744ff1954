#include "platform/linux/settings/JsonPreferences.h"

#include "base/KVLog.h"
#include "platform/linux/settings/JsonFile.h"

namespace kelvo {

Value JsonPreferences::value(std::string_view key, std::string_view domain) {
    if (domain.find('/') != std::string_view::npos) return {};
    const std::string path = "/private/var/mobile/Library/Preferences/" + std::string(domain) + ".json";
    const Result<Dictionary> values = readJsonFile(root_->hostPath(path));
    if (!values) {
        KVLogError("cannot read preferences: %s", values.error().localizedDescription().c_str());
        return {};
    }
    const Value* value = values->find(key);
    return value != nullptr ? *value : Value();
}

}  // namespace kelvo
