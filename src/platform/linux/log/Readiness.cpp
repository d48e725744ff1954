#include "platform/linux/log/Readiness.h"

#include <systemd/sd-daemon.h>

namespace kelvo {

void reportReadiness() {
    static_cast<void>(sd_notify(0, "READY=1"));
}

}  // namespace kelvo
