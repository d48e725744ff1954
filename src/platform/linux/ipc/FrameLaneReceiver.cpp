#include "platform/linux/ipc/FrameLaneReceiver.h"

namespace kelvo {

/// At first there may be something already. Then the bell is read before what it stands for is looked at, so
/// that nothing that comes later is slept over.
bool FrameLaneReceiver::wait() {
    while (!isStopped_) {
        const std::uint32_t bell = lane_.bell();
        if (heard_ != bell) {
            heard_ = bell;
            return true;
        }
        lane_.waitForBell(bell);
    }
    return false;
}

void FrameLaneReceiver::stop() {
    isStopped_ = true;
    lane_.ring();
}

}  // namespace kelvo
