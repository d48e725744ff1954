#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

namespace kelvo {

/// The domain of what goes wrong with movies themselves. Failures of the file system keep the POSIX domain.
inline constexpr std::string_view kMediaErrorDomain = "KVMediaErrorDomain";

enum MediaErrorCode : std::int64_t {
    kMediaErrorUnreadableMovie = 1,     ///< not a movie, damaged, or cut short
    kMediaErrorUnsupportedFormat = 2,   ///< a movie, but with content that is not handled
    kMediaErrorInvalidRange = 3,        ///< nothing of the movie lies in the time range
    kMediaErrorEncoderUnavailable = 4,  ///< no encoder takes these settings
    kMediaErrorEncodingFailed = 5,      ///< an encoder or decoder gave up
    kMediaErrorServiceMissing = 6,      ///< the media module is not installed
    kMediaErrorMisuse = 7,              ///< called out of order
};

inline KVError mediaError(MediaErrorCode code, std::string_view reason) {
    return {std::string(kMediaErrorDomain), code,
            Dictionary{{std::string(kLocalizedFailureReasonKey), Value(reason)}}};
}

}  // namespace kelvo
