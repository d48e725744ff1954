#include "ipc/KVUserErrors.h"

#include <array>
#include <string>

namespace kelvo {
namespace {

/// Message keys of the codes -5800, -5801 and so on downwards. -5819 has none.
constexpr std::array<std::string_view, 19> kMessageKeys{
    "RECORDING_ERROR_UNKNOWN",
    "RECORDING_ERROR_USER_DECLINED",
    "RECORDING_ERROR_DISABLED",
    "RECORDING_ERROR_FAILED_TO_START",
    "RECORDING_ERROR_FAILED",
    "RECORDING_ERROR_INSUFFICIENT_STORAGE",
    "RECORDING_ERROR_INTERRUPTED",
    "RECORDING_ERROR_CONTENT_RESIZE",
    "RECORDING_ERROR_INVALID_BROADCAST_SESSION",
    "RECORDING_ERROR_SYSTEM_DORMANCY",
    "RECORDING_ERROR_ENTITLEMENTS",
    "RECORDING_ERROR_ACTIVE_PHONE_CALL",
    "RECORDING_ERROR_FAILED_TO_SAVE",
    "RECORDING_ERROR_AUTOBAY",
    "RECORDING_ERROR_CONNECTION_INVALID",
    "RECORDING_ERROR_CONNECTION_INTERRUPTED",
    "RECORDING_ERROR_NO_CONTEXTID_MATCH",
    "RECORDING_ERROR_MEDIASERVICES_FAILED",
    "RECORDING_ERROR_MIXING_FAILURE",
};

constexpr std::int64_t kLowestCodeWithKey =
    kRecordingErrorUnknown - static_cast<std::int64_t>(kMessageKeys.size()) + 1;
static_assert(kLowestCodeWithKey == kRecordingErrorMixingFailure);

}  // namespace

std::string_view messageKeyForErrorCode(std::int64_t code) {
    if (code > kRecordingErrorUnknown || code < kLowestCodeWithKey) code = kRecordingErrorUnknown;
    return kMessageKeys[static_cast<std::size_t>(kRecordingErrorUnknown - code)];
}

KVError KVUserErrors::kvUserErrorForCode(std::int64_t code, const std::optional<Dictionary>& userInfo) const {
    Dictionary information = userInfo.value_or(Dictionary());
    if (auto text =
            localization_->kvLocalizedStringFromFrameworkBundleWithKey(messageKeyForErrorCode(code))) {
        information.set(kLocalizedDescriptionKey, *text);
    }
    return {std::string(KVRecordingErrorDomain), code, std::move(information)};
}

}  // namespace kelvo
