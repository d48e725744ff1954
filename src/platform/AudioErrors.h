#pragma once

#include "platform/AudioInputQueue.h"

#include <string>

namespace kelvo {

/// An error of an audio operation: what failed, for the log, and the status number.
inline KVError audioError(std::int32_t status, std::string_view subject) {
    Dictionary userInfo;
    userInfo.set(kLocalizedDescriptionKey, std::string(subject));
    return KVError(std::string(kAudioErrorDomain), status, std::move(userInfo));
}

}  // namespace kelvo
