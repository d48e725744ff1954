#include "base/KVError.h"
#include "base/UTF8.h"
#include "base/VideoSurface.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/Signature.h"
#include "platform/linux/ipc/SocketEndpoint.h"

#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <string_view>

namespace kelvo::dbus {
namespace {

/// Inside a variant, types of ours that D-Bus has none for: a date, a URL, an error, and nothing.
constexpr std::string_view kDateSignature = "(x)";
constexpr std::string_view kURLSignature = "(s)";
constexpr std::string_view kErrorSignature = "(sxa{sv})";
constexpr std::string_view kNothingSignature = "y";
constexpr std::string_view kSurfaceSignature = "(huuuu)";

std::size_t alignmentOf(char type) {
    switch (type) {
        case 'y':
        case 'g':
        case 'v':
            return 1;
        case 'n':
        case 'q':
            return 2;
        case 'x':
        case 't':
        case 'd':
        case '(':
        case '{':
            return 8;
        default:
            return 4;
    }
}

/// The signature under which a value travels inside a variant; empty for an object.
std::string_view variantSignature(const Value& value) {
    if (value.isNothing()) return kNothingSignature;
    if (value.as<bool>() != nullptr) return "b";
    if (value.as<std::int64_t>() != nullptr) return "x";
    if (value.as<std::uint64_t>() != nullptr) return "t";
    if (value.as<double>() != nullptr) return "d";
    if (value.asString() != nullptr) return "s";
    if (value.as<Bytes>() != nullptr) return "ay";
    if (value.as<Date>() != nullptr) return kDateSignature;
    if (value.as<URL>() != nullptr) return kURLSignature;
    if (value.asError() != nullptr) return kErrorSignature;
    if (value.asArray() != nullptr) return "av";
    if (value.asDictionary() != nullptr) return "a{sv}";
    return {};
}

/// What a variant's value looks like to its signature.
Value asStructure(const Value& value) {
    if (value.isNothing()) return 0;
    if (const auto* date = value.as<Date>()) return Array{date->nanosecondsSince1970};
    if (const auto* url = value.as<URL>()) return Array{url->absoluteString()};
    if (const KVError* error = value.asError())
        return Array{error->domain(), error->code(), error->userInfo()};
    return value;
}

/// The same backwards; `value` was read with `signature`.
Value fromStructure(std::string_view signature, Value value) {
    if (signature == kNothingSignature) return {};
    const Array* fields = value.asArray();
    if (fields == nullptr) return value;
    if (signature == kDateSignature) return Date{*fields->front().as<std::int64_t>()};
    if (signature == kURLSignature) return URL(*fields->front().asString());
    if (signature == kErrorSignature) {
        return KVError(*(*fields)[0].asString(), *(*fields)[1].as<std::int64_t>(),
                       *(*fields)[2].asDictionary());
    }
    return value;
}

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
        return endpoint && putDescriptor(endpoint->descriptor());
    }
    bool writeSurface(const Value& value) {
        const auto* handle = value.as<std::shared_ptr<ObjectHandle>>();
        const auto surface = handle != nullptr ? std::dynamic_pointer_cast<VideoSurface>(*handle) : nullptr;
        if (!surface) return false;
        surface->keepOutNewWriters();
        const VideoSurface::Geometry& geometry = surface->geometry();
        return putDescriptor(surface->descriptor()) && put(geometry.width) && put(geometry.height) &&
               put(geometry.bytesPerRow) && put(static_cast<std::uint32_t>(geometry.pixelFormat));
    }
    bool putDescriptor(int descriptor) {
        UniqueFd duplicate(::fcntl(descriptor, F_DUPFD_CLOEXEC, 0));
        if (!duplicate) return false;
        put(static_cast<std::uint32_t>(message_.descriptors.size()));
        message_.descriptors.push_back(std::move(duplicate));
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

/// Reads forward and remembers that it failed; after that everything reads as nothing.
class BodyReader {
  public:
    BodyReader(Message& message, bool objectsAllowed, const OpenSurface& openSurface)
        : message_(message),
          bytes_(message.body),
          objectsAllowed_(objectsAllowed),
          openSurface_(openSurface) {}

    Result<Array> read() {
        Array values;
        if (!isValidSignature(message_.signature)) fail("signature");
        SignatureParts parts(message_.signature);
        while (!failure_) {
            const auto type = parts.next();
            if (!type) break;
            values.push_back(read(*type, 0));
        }
        if (!failure_ && place_ != bytes_.size()) fail("bytes behind the arguments");
        if (failure_) return *failure_;
        return values;
    }

  private:
    Value read(std::string_view type, int depth) {
        if (depth > ipc_bounds::kDeepestNesting) return fail("nested too deep");
        if (++values_ > ipc_bounds::kMostValues) return fail("too many values");
        align(alignmentOf(type.front()));
        switch (type.front()) {
            case 'y':
                return static_cast<std::int64_t>(take<std::uint8_t>());
            case 'b':
                return readBoolean();
            case 'n':
                return static_cast<std::int64_t>(take<std::int16_t>());
            case 'q':
                return static_cast<std::int64_t>(take<std::uint16_t>());
            case 'i':
                return static_cast<std::int64_t>(take<std::int32_t>());
            case 'u':
                return static_cast<std::int64_t>(take<std::uint32_t>());
            case 'x':
                return take<std::int64_t>();
            case 't':
                return take<std::uint64_t>();
            case 'd':
                return take<double>();
            case 's':
            case 'o':
                return readText(take<std::uint32_t>());
            case 'g':
                return readText(take<std::uint8_t>());
            case 'h':
                return readEndpoint();
            case 'v':
                return readVariant(depth);
            case '(':
                return type == kSurfaceSignature ? readSurface() : readStructure(type, depth);
            case 'a':
                return readArray(type.substr(1), depth);
            default:
                return fail("type");
        }
    }

    Value readBoolean() {
        const auto number = take<std::uint32_t>();
        return number > 1 ? fail("boolean") : Value(number == 1);
    }
    Value readText(std::size_t size) {
        if (size > ipc_bounds::kLongestString) return fail("string beyond its bound");
        if (bytes_.size() - place_ <= size || bytes_[place_ + size] != std::byte{0})
            return fail("cut string");
        const std::string_view text(reinterpret_cast<const char*>(bytes_.data() + place_), size);
        place_ += size + 1;
        if (text.find('\0') != std::string_view::npos || !isUTF8(text)) return fail("string is not UTF-8");
        return text;
    }
    Value readVariant(int depth) {
        const Value text = readText(take<std::uint8_t>());
        if (failure_) return {};
        const std::string signature = *text.asString();
        if (!isSingleType(signature)) return fail("variant");
        Value value = read(signature, depth + 1);
        return failure_ ? Value() : fromStructure(signature, std::move(value));
    }
    Value readStructure(std::string_view type, int depth) {
        Array fields;
        SignatureParts parts(type.substr(1, type.size() - 2));
        while (const auto part = parts.next())
            fields.push_back(read(*part, depth + 1));
        return fields;
    }
    Value readArray(std::string_view element, int depth) {
        const auto length = take<std::uint32_t>();
        align(alignmentOf(element.front()));
        if (failure_ || length > bytes_.size() - place_) return fail("array longer than its message");
        const std::size_t end = place_ + length;
        if (element == "y") {
            const auto* first = bytes_.data() + place_;
            place_ = end;
            return Bytes(first, first + length);
        }
        Value content =
            element.front() == '{' ? readEntries(element, end, depth) : readItems(element, end, depth);
        if (!failure_ && place_ != end) return fail("array that does not end with an element");
        return content;
    }
    Value readItems(std::string_view element, std::size_t end, int depth) {
        Array items;
        while (!failure_ && place_ < end) {
            if (items.size() == ipc_bounds::kMostElements) return fail("array beyond its bound");
            items.push_back(read(element, depth + 1));
        }
        return items;
    }
    Value readEntries(std::string_view element, std::size_t end, int depth) {
        if (element != "{sv}") return fail("dictionary of other types");
        Dictionary dictionary;
        while (!failure_ && place_ < end) {
            if (dictionary.size() == ipc_bounds::kMostEntries) return fail("dictionary beyond its bound");
            align(8);
            const Value key = read("s", depth + 1);
            Value value = read("v", depth + 1);
            if (failure_) break;
            if (dictionary.contains(*key.asString())) return fail("key that stands twice");
            dictionary.set(*key.asString(), std::move(value));
        }
        return dictionary;
    }

    UniqueFd takeDescriptor() {
        const auto index = take<std::uint32_t>();
        if (!objectsAllowed_ || index >= message_.descriptors.size()) return fail("descriptor"), UniqueFd();
        return std::move(message_.descriptors[index]);
    }
    Value readEndpoint() {
        UniqueFd descriptor = takeDescriptor();
        if (failure_) return {};
        auto endpoint = SocketEndpoint::fromDescriptor(std::move(descriptor));
        if (!endpoint) return fail("endpoint that is none");
        return std::shared_ptr<ObjectHandle>(*endpoint);
    }
    Value readSurface() {
        align(8);
        UniqueFd descriptor = takeDescriptor();
        VideoSurface::Geometry geometry;
        geometry.width = take<std::uint32_t>();
        geometry.height = take<std::uint32_t>();
        geometry.bytesPerRow = take<std::uint32_t>();
        geometry.pixelFormat = static_cast<VideoSurface::PixelFormat>(take<std::uint32_t>());
        if (failure_) return {};
        auto surface = openSurface_(std::move(descriptor), geometry);
        if (!surface) return fail("surface that is not what it claims");
        return std::shared_ptr<ObjectHandle>(*surface);
    }

    template <typename Number>
    Number take() {
        align(sizeof(Number));
        Number number{};
        if (bytes_.size() - place_ < sizeof(number)) return fail("cut arguments"), number;
        std::memcpy(&number, bytes_.data() + place_, sizeof(number));
        place_ += sizeof(number);
        return number;
    }
    void align(std::size_t boundary) {
        while (place_ % boundary != 0 && !failure_) {
            const bool isPadding = place_ < bytes_.size() && bytes_[place_] == std::byte{0};
            if (!isPadding) return static_cast<void>(fail("padding"));
            ++place_;
        }
    }
    Value fail(const char* what) {
        if (!failure_) failure_ = KVError::posix(EBADMSG, what);
        place_ = bytes_.size();
        return {};
    }

    Message& message_;
    std::span<const std::byte> bytes_;
    const bool objectsAllowed_;
    const OpenSurface& openSurface_;
    std::size_t place_ = 0;
    std::size_t values_ = 0;
    OptionalError failure_;
};

}  // namespace

OptionalError writeBody(const Array& values, Message& message) {
    if (BodyWriter(message).write(values)) return std::nullopt;
    return KVError::posix(EINVAL, "arguments of " + message.member);
}

Result<Array> readBody(Message& message, bool objectsAllowed, const OpenSurface& openSurface) {
    return BodyReader(message, objectsAllowed, openSurface).read();
}

}  // namespace kelvo::dbus
