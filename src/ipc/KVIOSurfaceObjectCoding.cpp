#include "ipc/KVIOSurfaceObjectCoding.h"

namespace kelvo {
namespace {

constexpr std::string_view kSurfaceKey = "ioSurface";

}  // namespace

void KVIOSurfaceObjectCoding::encodeWithCoder(const KVIOSurfaceObject& object, KVCoder& coder) {
    if (!coder.isIPCCoder() || !object.ioSurface()) return;
    coder.encode(kSurfaceKey, std::shared_ptr<ObjectHandle>(object.ioSurface()));
}

KVIOSurfaceObject KVIOSurfaceObjectCoding::initWithCoder(const KVCoder& coder) {
    KVIOSurfaceObject object;
    const Value* entry = coder.isIPCCoder() ? coder.decode(kSurfaceKey) : nullptr;
    const auto* handle = entry != nullptr ? entry->as<std::shared_ptr<ObjectHandle>>() : nullptr;
    if (handle != nullptr) object.setIOSurface(std::dynamic_pointer_cast<VideoSurface>(*handle));
    return object;
}

}  // namespace kelvo
