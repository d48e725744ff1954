#include "platform/linux/system/DescriptorLimit.h"

#include "base/KVLog.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <sys/resource.h>

namespace kelvo {
namespace {

constexpr rlim_t kEnough = 65536;

}  // namespace

void raiseDescriptorLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
    const rlim_t wanted = std::min(limit.rlim_max, kEnough);
    if (limit.rlim_cur >= wanted) return;
    limit.rlim_cur = wanted;
    if (::setrlimit(RLIMIT_NOFILE, &limit) != 0)
        KVLogError("cannot have more open descriptors: %s",
                   std::strerror(errno));  // NOLINT(concurrency-mt-unsafe)
}

}  // namespace kelvo
