#include "ipc/IPCCoding.h"

#include "ipc/KVIOSurfaceObjectCoding.h"

namespace kelvo {
namespace {

constexpr std::string_view kSurfaceKey = "ioSurface";

/// The one object of a class that an array holds: none for an empty array, no value for anything else.
template <typename Object>
std::optional<std::shared_ptr<Object>> onlyObject(const Value& value) {
    const Array* array = value.asArray();
    if (array == nullptr || array->size() > 1) return std::nullopt;
    if (array->empty()) return std::shared_ptr<Object>();
    const auto* handle = array->front().as<std::shared_ptr<ObjectHandle>>();
    auto object = handle != nullptr ? std::dynamic_pointer_cast<Object>(*handle) : nullptr;
    return object ? std::optional(std::move(object)) : std::nullopt;
}

}  // namespace

std::optional<std::shared_ptr<IPCEndpoint>> IPCCoding<std::shared_ptr<IPCEndpoint>>::decode(
    const Value& value) {
    return onlyObject<IPCEndpoint>(value);
}

Value IPCCoding<std::shared_ptr<KVIOSurfaceObject>>::encode(const Content& object) {
    KVCoder coder(KVCoder::Kind::ipc);
    if (object) KVIOSurfaceObjectCoding::encodeWithCoder(*object, coder);
    const Value* handle = coder.decode(kSurfaceKey);
    return handle != nullptr ? Array{*handle} : Array();
}

std::optional<std::shared_ptr<KVIOSurfaceObject>> IPCCoding<std::shared_ptr<KVIOSurfaceObject>>::decode(
    const Value& value) {
    const auto surface = onlyObject<VideoSurface>(value);
    if (!surface) return std::nullopt;
    KVCoder coder(KVCoder::Kind::ipc);
    if (*surface) coder.encode(kSurfaceKey, std::shared_ptr<ObjectHandle>(*surface));
    return std::make_shared<KVIOSurfaceObject>(KVIOSurfaceObjectCoding::initWithCoder(coder));
}

}  // namespace kelvo
