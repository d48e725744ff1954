#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>

/// Any bytes are a message within the bounds, or an error; what a body yields can be written again.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    const auto bytes = std::as_bytes(std::span(data, size));
    const auto claimed = dbus::messageSize(bytes);
    if (claimed && *claimed > ipc_bounds::kLargestMessage) std::abort();
    std::uint32_t descriptorCount = 0;
    auto message = dbus::parse(bytes, descriptorCount);
    if (message) static_cast<void>(dbus::readBody(*message, true));
    return 0;
}
