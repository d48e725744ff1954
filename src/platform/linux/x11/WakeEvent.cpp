#include "platform/linux/x11/WakeEvent.h"

#include <sys/eventfd.h>

namespace kelvo::x11 {

WakeEvent::WakeEvent() : descriptor_(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK)) {}

void WakeEvent::set() {
    ::eventfd_write(descriptor_.get(), 1);
}

void WakeEvent::clear() {
    eventfd_t value = 0;
    ::eventfd_read(descriptor_.get(), &value);
}

}  // namespace kelvo::x11
