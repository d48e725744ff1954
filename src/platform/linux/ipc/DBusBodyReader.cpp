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
#include <string_view>

namespace kelvo::dbus {
namespace {

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

Result<Array> readBody(Message& message, bool objectsAllowed, const OpenSurface& openSurface) {
    return BodyReader(message, objectsAllowed, openSurface).read();
}

}  // namespace kelvo::dbus
