#pragma once

#include "ipc/KVArchive.h"
#include "ipc/KVIOSurfaceObject.h"

#include <string_view>

namespace kelvo {

/// How a surface object crosses processes: only a message can carry the surface's handle, so every other
/// archive of it is empty. Caller's thread.
struct KVIOSurfaceObjectCoding {
    static constexpr std::string_view kClassName = "KVIOSurfaceObject";
    static constexpr bool supportsSecureCoding = true;

    static void encodeWithCoder(const KVIOSurfaceObject& object, KVCoder& coder);
    /// An object without a surface when the coder carries none.
    static KVIOSurfaceObject initWithCoder(const KVCoder& coder);
};

}  // namespace kelvo
