#include "ipc/CBOR.h"
#include "ipc/KVBroadcastConfigurationCoding.h"
#include "ipc/KVIOSurfaceObjectCoding.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <span>

/// Any bytes are a record or an error, none of them brings a surface, and a value that was read reads the
/// same once it is written again.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    const auto bytes = std::as_bytes(std::span(data, size));
    static_cast<void>(unarchived<KVBroadcastConfigurationCoding>(bytes));
    const auto surface = unarchived<KVIOSurfaceObjectCoding>(bytes);
    if (surface && surface->ioSurface()) std::abort();
    constexpr cbor::Bounds kBounds{kDeepestArchive, kMostArchivedItems};
    const auto value = cbor::decode(bytes, kBounds);
    if (!value) return 0;
    const Bytes written = cbor::encode(*value);
    const auto again = cbor::decode(written, kBounds);
    // Compared as bytes: a number that is none is not equal to itself.
    if (!again || cbor::encode(*again) != written) std::abort();
    return 0;
}
