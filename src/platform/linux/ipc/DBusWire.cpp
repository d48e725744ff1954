#include "platform/IPCBounds.h"
#include "platform/linux/ipc/DBusMessage.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <string_view>

namespace kelvo::dbus {
namespace {

enum Field : std::uint8_t {
    kPath = 1,
    kInterface = 2,
    kMember = 3,
    kErrorName = 4,
    kReplySerial = 5,
    kDestination = 6,
    kSender = 7,
    kSignature = 8,
    kDescriptors = 9,
};

constexpr std::size_t kLongestName = 255;
/// What most messages' headers fit into; a larger one grows.
constexpr std::size_t kUsualHeader = 384;

KVError malformed(const char* what) {
    return KVError::posix(EBADMSG, what);
}

std::uint32_t numberAt(std::span<const std::byte> bytes, std::size_t place) {
    std::uint32_t number = 0;
    std::memcpy(&number, bytes.data() + place, sizeof(number));
    return number;
}

constexpr std::size_t alignedTo8(std::size_t size) {
    return (size + 7) & ~std::size_t{7};
}

/// Reads the header's fields, one after the other. After a failure everything reads as nothing.
class HeaderReader {
  public:
    HeaderReader(std::span<const std::byte> bytes, Message& message, std::uint32_t& descriptorCount)
        : bytes_(bytes), message_(message), descriptorCount_(descriptorCount) {}

    bool read() {
        place_ = kFixedHeader;
        while (place_ < bytes_.size() && isGood_) {
            align(8);
            readField();
        }
        return isGood_;
    }

  private:
    void readField() {
        const std::uint8_t field = byte();
        const std::string_view type = text(byte());
        if (type == "u") return readNumber(field);
        if (type != "s" && type != "o" && type != "g") return fail();
        const std::string_view content = type == "g" ? text(byte()) : text(number());
        if (std::string_view* place = placeOf(field, type)) *place = content;
    }
    void readNumber(std::uint8_t field) {
        const std::uint32_t content = number();
        if (field == kReplySerial) message_.replySerial = content;
        if (field == kDescriptors) descriptorCount_ = content;
    }
    /// Where the field goes; none for one that says nothing here, or that has a wrong type.
    std::string_view* placeOf(std::uint8_t field, std::string_view type) {
        switch (field) {
            case kPath:
                return check(type == "o") ? &message_.path : nullptr;
            case kInterface:
                return check(type == "s") ? &message_.interface : nullptr;
            case kMember:
                return check(type == "s") ? &message_.member : nullptr;
            case kErrorName:
                return check(type == "s") ? &message_.errorName : nullptr;
            case kSignature:
                return check(type == "g") ? &message_.signature : nullptr;
            default:
                return nullptr;  // destination, sender, and what later versions add
        }
    }
    std::uint8_t byte() {
        if (place_ >= bytes_.size()) return fail(), 0;
        return std::to_integer<std::uint8_t>(bytes_[place_++]);
    }
    std::uint32_t number() {
        align(4);
        if (bytes_.size() - place_ < 4) return fail(), 0;
        const std::uint32_t read = numberAt(bytes_, place_);
        place_ += 4;
        return read;
    }
    std::string_view text(std::size_t size) {
        if (size > kLongestName * 4 || bytes_.size() - place_ <= size ||
            bytes_[place_ + size] != std::byte{0})
            return fail(), std::string_view();
        const std::string_view read(reinterpret_cast<const char*>(bytes_.data() + place_), size);
        place_ += size + 1;
        return check(read.find('\0') == std::string_view::npos) ? read : std::string_view();
    }
    void align(std::size_t boundary) {
        while (place_ % boundary != 0 && isGood_)
            check(byte() == 0);
    }
    bool check(bool holds) {
        if (!holds) fail();
        return holds;
    }
    void fail() {
        isGood_ = false;
        place_ = bytes_.size();
    }

    std::span<const std::byte> bytes_;
    Message& message_;
    std::uint32_t& descriptorCount_;
    std::size_t place_ = 0;
    bool isGood_ = true;
};

class HeaderWriter {
  public:
    explicit HeaderWriter(const Message& message) : message_(message) {}

    Bytes write() {
        out_.reserve(kUsualHeader + message_.body.size());
        const std::array<std::uint8_t, 4> head{'l', static_cast<std::uint8_t>(message_.type), message_.flags,
                                               1};
        append(head.data(), head.size());
        putNumber(static_cast<std::uint32_t>(message_.body.size()));
        putNumber(message_.serial);
        putNumber(0);  // the fields' length, known below
        putText(kPath, 'o', message_.path);
        putText(kInterface, 's', message_.interface);
        putText(kMember, 's', message_.member);
        putText(kErrorName, 's', message_.errorName);
        putNumberField(kReplySerial, message_.replySerial);
        putText(kSignature, 'g', message_.signature);
        putNumberField(kDescriptors, static_cast<std::uint32_t>(message_.sentDescriptors.size()));
        const auto fields = static_cast<std::uint32_t>(out_.size() - kFixedHeader);
        std::memcpy(out_.data() + 12, &fields, sizeof(fields));
        align(8);
        return std::move(out_);
    }

  private:
    void putText(Field field, char type, std::string_view text) {
        if (text.empty()) return;
        begin(field, type);
        if (type == 'g') {
            put(static_cast<std::uint8_t>(text.size()));
        } else {
            putNumber(static_cast<std::uint32_t>(text.size()));
        }
        append(text.data(), text.size());
        put(0);
    }
    void putNumberField(Field field, std::uint32_t number) {
        if (number == 0) return;
        begin(field, 'u');
        putNumber(number);
    }
    void begin(Field field, char type) {
        align(8);
        const std::array<std::uint8_t, 4> head{static_cast<std::uint8_t>(field), 1,
                                               static_cast<std::uint8_t>(type), 0};
        append(head.data(), head.size());
    }
    void putNumber(std::uint32_t number) { append(&number, sizeof(number)); }
    void put(std::uint8_t byte) { append(&byte, 1); }
    void append(const void* bytes, std::size_t size) {
        const std::size_t place = out_.size();
        out_.resize(place + size);
        std::memcpy(out_.data() + place, bytes, size);
    }
    void align(std::size_t boundary) { out_.resize((out_.size() + boundary - 1) / boundary * boundary); }

    const Message& message_;
    Bytes out_;
};

/// Whether a message has the fields that its type needs.
bool isComplete(const Message& message) {
    switch (message.type) {
        case MessageType::call:
            return !message.path.empty() && !message.member.empty();
        case MessageType::reply:
            return message.replySerial != 0;
        case MessageType::error:
            return message.replySerial != 0 && !message.errorName.empty();
        case MessageType::signal:
            return !message.path.empty() && !message.member.empty();
    }
    return false;
}

}  // namespace

Result<std::size_t> messageSize(std::span<const std::byte> head) {
    if (head.size() < kFixedHeader) return malformed("cut header");
    if (head[0] != std::byte{'l'} || head[3] != std::byte{1}) return malformed("no little-endian message");
    const std::uint32_t body = numberAt(head, 4);
    const std::uint32_t fields = numberAt(head, 12);
    if (fields > ipc_bounds::kLargestHeader) return malformed("header beyond its bound");
    const std::size_t header = kFixedHeader + alignedTo8(fields);
    if (body > ipc_bounds::kLargestMessage || header + body > ipc_bounds::kLargestMessage)
        return malformed("message beyond its bound");
    return header + body;
}

Result<Message> parse(std::span<const std::byte> bytes, std::uint32_t& descriptorCount) {
    const auto size = messageSize(bytes);
    if (!size) return size.error();
    if (*size != bytes.size()) return malformed("cut message");
    Message message;
    const auto type = std::to_integer<std::uint8_t>(bytes[1]);
    if (type < 1 || type > 4) return malformed("unknown type of message");
    message.type = static_cast<MessageType>(type);
    message.flags = std::to_integer<std::uint8_t>(bytes[2]);
    message.serial = numberAt(bytes, 8);
    descriptorCount = 0;
    const std::size_t fields = kFixedHeader + numberAt(bytes, 12);
    if (!HeaderReader(bytes.first(fields), message, descriptorCount).read())
        return malformed("broken header");
    const auto body = bytes.subspan(kFixedHeader + alignedTo8(numberAt(bytes, 12)));
    message.body.assign(body.begin(), body.end());
    if (message.serial == 0 || !isComplete(message)) return malformed("incomplete header");
    return message;
}

Bytes serialize(const Message& message) {
    Bytes bytes = HeaderWriter(message).write();
    bytes.insert(bytes.end(), message.body.begin(), message.body.end());
    return bytes;
}

}  // namespace kelvo::dbus
