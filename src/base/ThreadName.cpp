#include "base/ThreadName.h"

#include <pthread.h>

namespace kelvo {

void nameCurrentThread(const std::string& label) {
    constexpr std::size_t kLongestName = 15;
    const std::size_t start = label.size() > kLongestName ? label.size() - kLongestName : 0;
    ::pthread_setname_np(::pthread_self(), label.c_str() + start);
}

}  // namespace kelvo
