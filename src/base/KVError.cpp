#include "base/KVError.h"

#include <system_error>
#include <utility>

namespace kelvo {

KVError::KVError(std::string domain, std::int64_t code, Dictionary userInfo)
    : domain_(std::move(domain)), code_(code), userInfo_(std::move(userInfo)) {}

KVError KVError::posix(int code, std::string_view subject) {
    std::string text = std::generic_category().message(code);
    if (!subject.empty()) text = std::string(subject) + ": " + text;
    return {std::string(kPOSIXErrorDomain), code, {{std::string(kLocalizedDescriptionKey), text}}};
}

std::string KVError::textFor(std::string_view key) const {
    const Value* value = userInfo_.find(key);
    const std::string* text = value != nullptr ? value->asString() : nullptr;
    return text != nullptr ? *text : std::string();
}

std::string KVError::description() const {
    std::string text = domain_ + " " + std::to_string(code_);
    if (const std::string detail = localizedDescription(); !detail.empty()) text += " (" + detail + ")";
    return text;
}

}  // namespace kelvo
