#include "platform/linux/media/LavPointers.h"

#include <array>

namespace kelvo {

KVError lavError(int result, MediaErrorCode code, std::string_view what) {
    const int number = AVUNERROR(result);
    if (number > 0 && number < 256) return KVError::posix(number, what);
    std::array<char, AV_ERROR_MAX_STRING_SIZE> text{};
    av_strerror(result, text.data(), text.size());
    return mediaError(code, std::string(what) + ": " + text.data());
}

void prepareLav() {
    av_log_set_level(AV_LOG_QUIET);
    av_max_alloc(kMostLavBytes);
}

}  // namespace kelvo
