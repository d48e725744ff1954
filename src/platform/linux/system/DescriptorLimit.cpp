#include "platform/linux/system/DescriptorLimit.h"

#include "base/KVLog.h"

#include <sys/resource.h>

namespace kelvo {

void raiseDescriptorLimit() {
    rlimit limit{};
    if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return;
    limit.rlim_cur = limit.rlim_max;
    if (::setrlimit(RLIMIT_NOFILE, &limit) != 0) KVLogError("the limit on open files cannot be raised");
}

}  // namespace kelvo
