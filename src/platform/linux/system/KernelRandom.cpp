#include "platform/linux/system/KernelRandom.h"

#include <cerrno>
#include <cstdlib>
#include <sys/random.h>

namespace kelvo {

void KernelRandom::fill(std::span<std::byte> bytes) {
    while (!bytes.empty()) {
        const ssize_t count = ::getrandom(bytes.data(), bytes.size(), 0);
        if (count < 0 && errno != EINTR) std::abort();  // without the generator no identifier would be unique
        if (count > 0) bytes = bytes.subspan(static_cast<std::size_t>(count));
    }
}

}  // namespace kelvo
