#pragma once

#include "base/Geometry.h"
#include "base/KVError.h"
#include "base/SampleBuffer.h"
#include "ipc/KVIOSurfaceObject.h"
#include "platform/IPC.h"

#include <algorithm>
#include <array>
#include <concepts>
#include <limits>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

/// How each C++ type of a protocol travels: its D-Bus signature, the value it becomes, and back. `decode` is
/// none for a value that is not one. A type without an `IPCCoding` cannot stand in a protocol.
namespace kelvo {

template <typename T>
struct IPCCoding;

/// What an argument of type `T` may carry by handle.
template <typename T>
inline constexpr IPCObjects kAllowedObjects = IPCObjects::none;
template <>
inline constexpr IPCObjects kAllowedObjects<std::shared_ptr<IPCEndpoint>> = IPCObjects::endpoints;
template <>
inline constexpr IPCObjects kAllowedObjects<std::shared_ptr<KVIOSurfaceObject>> = IPCObjects::surfaces;

/// Types that a value holds as they are.
template <typename T>
struct StoredCoding {
    static Value encode(const T& content) { return content; }
    static std::optional<T> decode(const Value& value) {
        const T* content = value.as<T>();
        return content != nullptr ? std::optional<T>(*content) : std::nullopt;
    }
};
template <>
struct IPCCoding<bool> : StoredCoding<bool> {
    static std::string signature() { return "b"; }
};
template <>
struct IPCCoding<double> : StoredCoding<double> {
    static std::string signature() { return "d"; }
};
template <>
struct IPCCoding<std::string> : StoredCoding<std::string> {
    static std::string signature() { return "s"; }
};
template <>
struct IPCCoding<Bytes> : StoredCoding<Bytes> {
    static std::string signature() { return "ay"; }
};
template <>
struct IPCCoding<Dictionary> : StoredCoding<Dictionary> {
    static std::string signature() { return "a{sv}"; }
};

/// Signed numbers and those of 32 bits, which a value holds as 64-bit integers.
template <std::integral Number>
struct IPCCoding<Number> {
    static std::string signature() {
        if constexpr (sizeof(Number) == 8) return "x";
        return std::is_signed_v<Number> ? "i" : "u";
    }
    static Value encode(Number number) { return static_cast<std::int64_t>(number); }
    static std::optional<Number> decode(const Value& value) {
        const auto* number = value.as<std::int64_t>();
        if (number == nullptr || !std::in_range<Number>(*number)) return std::nullopt;
        return static_cast<Number>(*number);
    }
};

template <>
struct IPCCoding<SampleBuffer::Type> {
    static std::string signature() { return "x"; }
    static Value encode(SampleBuffer::Type type) { return static_cast<std::int64_t>(type); }
    static std::optional<SampleBuffer::Type> decode(const Value& value) {
        const auto* number = value.as<std::int64_t>();
        if (number == nullptr || *number < 1 || *number > 3) return std::nullopt;
        return static_cast<SampleBuffer::Type>(*number);
    }
};

template <>
struct IPCCoding<URL> {
    static std::string signature() { return "s"; }
    static Value encode(const URL& url) { return url.absoluteString(); }
    static std::optional<URL> decode(const Value& value) {
        const std::string* text = value.asString();
        return text != nullptr ? std::optional<URL>(URL(*text)) : std::nullopt;
    }
};

/// Bytes that are only looked at; they arrive as `Bytes`.
template <>
struct IPCCoding<std::span<const std::byte>> {
    static std::string signature() { return "ay"; }
    static Value encode(std::span<const std::byte> bytes) { return Bytes(bytes.begin(), bytes.end()); }
    static std::optional<Bytes> decode(const Value& value) { return IPCCoding<Bytes>::decode(value); }
};

/// The bytes of a record: exactly as many as it has.
template <std::size_t Size>
struct IPCCoding<std::array<std::byte, Size>> {
    static std::string signature() { return "ay"; }
    static Value encode(const std::array<std::byte, Size>& bytes) {
        return Bytes(bytes.begin(), bytes.end());
    }
    static std::optional<std::array<std::byte, Size>> decode(const Value& value) {
        const auto* bytes = value.as<Bytes>();
        if (bytes == nullptr || bytes->size() != Size) return std::nullopt;
        std::array<std::byte, Size> record;
        std::ranges::copy(*bytes, record.begin());
        return record;
    }
};

template <>
struct IPCCoding<Size> {
    static std::string signature() { return "(dd)"; }
    static Value encode(const Size& size) { return Array{size.width, size.height}; }
    static std::optional<Size> decode(const Value& value) {
        const Array* fields = value.asArray();
        if (fields == nullptr || fields->size() != 2) return std::nullopt;
        const auto* width = (*fields)[0].as<double>();
        const auto* height = (*fields)[1].as<double>();
        return width != nullptr && height != nullptr ? std::optional<Size>({*width, *height}) : std::nullopt;
    }
};

/// Domain, code and user information.
template <>
struct IPCCoding<KVError> {
    static std::string signature() { return "(sxa{sv})"; }
    static Value encode(const KVError& error) {
        return Array{error.domain(), error.code(), error.userInfo()};
    }
    static std::optional<KVError> decode(const Value& value) {
        const Array* fields = value.asArray();
        if (fields == nullptr || fields->size() != 3) return std::nullopt;
        const std::string* domain = (*fields)[0].asString();
        const auto* code = (*fields)[1].as<std::int64_t>();
        const Dictionary* userInfo = (*fields)[2].asDictionary();
        if (domain == nullptr || code == nullptr || userInfo == nullptr) return std::nullopt;
        return KVError(*domain, *code, *userInfo);
    }
};

template <typename Element>
struct IPCCoding<std::vector<Element>> {
    static std::string signature() { return "a" + IPCCoding<Element>::signature(); }
    static Value encode(const std::vector<Element>& elements) {
        Array array;
        for (const Element& element : elements)
            array.push_back(IPCCoding<Element>::encode(element));
        return array;
    }
    static std::optional<std::vector<Element>> decode(const Value& value) {
        const Array* array = value.asArray();
        if (array == nullptr) return std::nullopt;
        std::vector<Element> elements;
        for (const Value& item : *array) {
            auto element = IPCCoding<Element>::decode(item);
            if (!element) return std::nullopt;
            elements.push_back(std::move(*element));
        }
        return elements;
    }
};

/// What may be absent is an array of none or one.
template <typename Content>
struct IPCCoding<std::optional<Content>> {
    static std::string signature() { return "a" + IPCCoding<Content>::signature(); }
    static Value encode(const std::optional<Content>& content) {
        return content ? Array{IPCCoding<Content>::encode(*content)} : Array();
    }
    static std::optional<std::optional<Content>> decode(const Value& value) {
        const Array* array = value.asArray();
        if (array == nullptr || array->size() > 1) return std::nullopt;
        if (array->empty()) return std::optional<Content>();
        auto content = IPCCoding<Content>::decode(array->front());
        return content ? std::optional(std::move(content)) : std::nullopt;
    }
};

/// Endpoint or nothing; no other class of object is allowed.
template <>
struct IPCCoding<std::shared_ptr<IPCEndpoint>> {
    using Content = std::shared_ptr<IPCEndpoint>;
    static std::string signature() { return "ah"; }
    static Value encode(const Content& endpoint) {
        return endpoint ? Array{std::shared_ptr<ObjectHandle>(endpoint)} : Array();
    }
    static std::optional<Content> decode(const Value& value);
};

/// The surface by handle, or nothing for an object that holds none.
template <>
struct IPCCoding<std::shared_ptr<KVIOSurfaceObject>> {
    using Content = std::shared_ptr<KVIOSurfaceObject>;
    static std::string signature() { return "a(huuuu)"; }
    static Value encode(const Content& object);
    static std::optional<Content> decode(const Value& value);
};

}  // namespace kelvo
