#include "base/KVError.h"
#include "base/UTF8.h"
#include "base/VideoSurface.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/DBusTypes.h"
#include "platform/linux/ipc/Signature.h"
#include "platform/linux/ipc/SocketEndpoint.h"

#include <cerrno>
#include <cstring>
#include <string>
#include <string_view>
#include <utility>

namespace kelvo::dbus {
namespace {

/// What most messages' arguments fit into; larger ones grow.
constexpr std::size_t kUsualBody = 256;

class BodyWriter {
  public:
    explicit BodyWriter(Message& message) : message_(message), out_(message.body) {}

    bool write(const Array& values) {
        SignatureParts parts(message_.signature);
        for (const Value& value : values) {
            const auto type = parts.next();
            if (!type || !write(*type, value, 0)) return false;
        }
        return !parts.next();
    }

  private:
    bool write(std::string_view type, const Value& value, int depth) {
        if (depth > ipc_bounds::kDeepestNesting) return false;
        align(alignmentOf(type.front()));
        switch (type.front()) {
            case 'y':
            case 'b':
            case 'i':
            case 'u':
            case 'x':
            case 't':
                return writeInteger(type.front(), value);
            case 'd':
                return writeDouble(value);
            case 's':
                return writeText(value.asString());
            case 'h':
                return writeEndpoint(value);
            case 'v':
                return writeVariant(value, depth);
            case '(':
                return writeStructure(type, value, depth);
            case 'a':
                return writeArray(type.substr(1), value, depth);
            default:
                return false;
        }
    }

    bool writeInteger(char type, const Value& value) {
        if (type == 'b') return value.as<bool>() != nullptr && put(std::uint32_t{*value.as<bool>()});
        const auto* large = value.as<std::uint64_t>();
        if (type == 't' && large != nullptr) return put(*large);
        const auto* number = value.as<std::int64_t>();
        if (number == nullptr) return false;
        switch (type) {
            case 'y':
                return std::in_range<std::uint8_t>(*number) && put(static_cast<std::uint8_t>(*number));
            case 'i':
                return std::in_range<std::int32_t>(*number) && put(static_cast<std::int32_t>(*number));
            case 'u':
                return std::in_range<std::uint32_t>(*number) && put(static_cast<std::uint32_t>(*number));
            default:
                return put(*number);
        }
    }
    bool writeDouble(const Value& value) { return value.as<double>() != nullptr && put(*value.as<double>()); }
    bool writeText(const std::string* text) {
        if (text == nullptr || text->size() > ipc_bounds::kLongestString ||
            text->find('\0') != std::string::npos || !isUTF8(*text))
            return false;
        put(static_cast<std::uint32_t>(text->size()));
        putBytes(text->c_str(), text->size() + 1);
        return true;
    }
    bool writeVariant(const Value& value, int depth) {
        const std::string_view signature = variantSignature(value);
        if (signature.empty()) return false;
        put(static_cast<std::uint8_t>(signature.size()));
        putBytes(signature.data(), signature.size());
        put(std::uint8_t{0});
        return write(signature, asStructure(value), depth + 1);
    }
    bool writeStructure(std::string_view type, const Value& value, int depth) {
        if (type == kSurfaceSignature) return writeSurface(value);
        const Array* fields = value.asArray();
        if (fields == nullptr) return false;
        SignatureParts parts(type.substr(1, type.size() - 2));
        for (const Value& field : *fields) {
            const auto part = parts.next();
            if (!part || !write(*part, field, depth + 1)) return false;
        }
        return !parts.next();
    }
    bool writeArray(std::string_view element, const Value& value, int depth) {
        const std::size_t lengthPlace = out_.size();
        put(std::uint32_t{0});
        align(alignmentOf(element.front()));
        const std::size_t begin = out_.size();
        if (!writeElements(element, value, depth)) return false;
        const auto length = static_cast<std::uint32_t>(out_.size() - begin);
        std::memcpy(out_.data() + lengthPlace, &length, sizeof(length));
        return true;
    }
    bool writeElements(std::string_view element, const Value& value, int depth) {
        if (element == "y") {
            const auto* bytes = value.as<Bytes>();
            if (bytes == nullptr) return false;
            putBytes(bytes->data(), bytes->size());
            return true;
        }
        if (element == "{sv}") return writeEntries(value.asDictionary(), depth);
        const Array* array = value.asArray();
        if (array == nullptr) return false;
        for (const Value& item : *array) {
            if (!write(element, item, depth + 1)) return false;
        }
        return true;
    }
    bool writeEntries(const Dictionary* dictionary, int depth) {
        if (dictionary == nullptr) return false;
        for (const auto& [key, value] : *dictionary) {
            align(8);
            align(4);
            if (!writeText(&key) || !writeVariant(value, depth + 1)) return false;
        }
        return true;
    }
    bool writeEndpoint(const Value& value) {
        const auto* handle = value.as<std::shared_ptr<ObjectHandle>>();
        const auto endpoint =
            handle != nullptr ? std::dynamic_pointer_cast<SocketEndpoint>(*handle) : nullptr;
        return endpoint && putDescriptor({endpoint, endpoint->descriptor()});
    }
    bool writeSurface(const Value& value) {
        const auto* handle = value.as<std::shared_ptr<ObjectHandle>>();
        const auto surface = handle != nullptr ? VideoSurface::fromHandle(*handle) : nullptr;
        if (!surface) return false;
        surface->keepOutNewWriters();
        const VideoSurface::Geometry& geometry = surface->geometry();
        return putDescriptor({surface, surface->descriptor()}) && put(geometry.width) &&
               put(geometry.height) && put(geometry.bytesPerRow) &&
               put(static_cast<std::uint32_t>(geometry.pixelFormat));
    }
    bool putDescriptor(SentDescriptor descriptor) {
        put(static_cast<std::uint32_t>(message_.sentDescriptors.size()));
        message_.sentDescriptors.push_back(std::move(descriptor));
        return true;
    }
    template <typename Number>
    bool put(Number number) {
        putBytes(&number, sizeof(number));
        return true;
    }
    void putBytes(const void* bytes, std::size_t size) {
        const auto* first = static_cast<const std::byte*>(bytes);
        out_.insert(out_.end(), first, first + size);
    }
    void align(std::size_t boundary) { out_.resize((out_.size() + boundary - 1) / boundary * boundary); }

    Message& message_;
    Bytes& out_;
};

}  // namespace

OptionalError writeBody(const Array& values, Message& message) {
    message.body.reserve(kUsualBody);
    if (BodyWriter(message).write(values)) return std::nullopt;
    return KVError::posix(EINVAL, "arguments of " + std::string(message.member));
}

}  // namespace kelvo::dbus
