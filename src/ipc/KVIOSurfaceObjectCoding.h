#pragma once

#include "ipc/KVIOSurfaceObject.h"

#include <memory>
#include <string_view>

namespace kelvo {

/// How a surface object crosses processes: only a message can carry the surface's handle, so every other
/// archive of it is empty. A coder is a `KVCoder`, or what a message has in its place. Caller's thread.
struct KVIOSurfaceObjectCoding {
    static constexpr std::string_view kClassName = "KVIOSurfaceObject";
    static constexpr bool supportsSecureCoding = true;

    template <typename Coder>
    static void encodeWithCoder(const KVIOSurfaceObject& object, Coder& coder) {
        if (!coder.isIPCCoder() || !object.ioSurface()) return;
        coder.encode(kSurfaceKey, std::shared_ptr<ObjectHandle>(object.ioSurface()));
    }

    /// An object without a surface when the coder carries none.
    template <typename Coder>
    static KVIOSurfaceObject initWithCoder(const Coder& coder) {
        KVIOSurfaceObject object;
        const Value* entry = coder.isIPCCoder() ? coder.decode(kSurfaceKey) : nullptr;
        const auto* handle = entry != nullptr ? entry->template as<std::shared_ptr<ObjectHandle>>() : nullptr;
        if (handle != nullptr) object.setIOSurface(VideoSurface::fromHandle(*handle));
        return object;
    }

  private:
    static constexpr std::string_view kSurfaceKey = "ioSurface";
};

}  // namespace kelvo
