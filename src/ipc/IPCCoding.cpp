#include "ipc/IPCCoding.h"

#include "ipc/KVIOSurfaceObjectCoding.h"

namespace kelvo {
namespace {

/// An argument as a coder: the one object that its array holds. There is no other, so a frame needs no
/// dictionary to find it by its key.
struct ArgumentEncoder {
    Array& argument;

    static constexpr bool isIPCCoder() { return true; }
    void encode(std::string_view, Value object) { argument.push_back(std::move(object)); }
};
struct ArgumentDecoder {
    const Array& argument;

    static constexpr bool isIPCCoder() { return true; }
    const Value* decode(std::string_view) const { return argument.empty() ? nullptr : &argument.front(); }
};

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
    Array argument;
    ArgumentEncoder coder{argument};
    if (object) KVIOSurfaceObjectCoding::encodeWithCoder(*object, coder);
    return argument;
}

std::optional<std::shared_ptr<KVIOSurfaceObject>> IPCCoding<std::shared_ptr<KVIOSurfaceObject>>::decode(
    const Value& value) {
    const Array* argument = value.asArray();
    if (argument == nullptr || argument->size() > 1) return std::nullopt;
    auto object = std::make_shared<KVIOSurfaceObject>(
        KVIOSurfaceObjectCoding::initWithCoder(ArgumentDecoder{*argument}));
    const bool isSurface = argument->empty() || object->ioSurface();
    return isSurface ? std::optional(std::move(object)) : std::nullopt;
}

}  // namespace kelvo
