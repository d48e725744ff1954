#include "ipc/CBOR.h"

#include "base/KVError.h"
#include "base/UTF8.h"

#include <bit>
#include <cerrno>
#include <cmath>
#include <cstdint>
#include <string>

namespace kelvo::cbor {
namespace {

enum Major : std::uint8_t { kUnsigned, kNegative, kBytes, kText, kArray, kMap, kTag, kSimple };

constexpr std::uint8_t kFalse = 20;
constexpr std::uint8_t kTrue = 21;
constexpr std::uint8_t kNull = 22;
constexpr std::uint8_t kUndefined = 23;
constexpr std::uint8_t kDouble = 27;

constexpr std::uint64_t kDateTag = 1;  // seconds since 1970, here always as a double
constexpr std::uint64_t kURITag = 32;
constexpr std::uint64_t kErrorTag = 40801;  // an array of domain, code and user information

class Encoder {
  public:
    void write(const Value& value) {
        if (value.isNothing()) return writeSimple(kNull);
        if (const auto* boolean = value.as<bool>()) return writeSimple(*boolean ? kTrue : kFalse);
        if (const auto* number = value.as<std::int64_t>()) return writeInteger(*number);
        if (const auto* number = value.as<std::uint64_t>()) return writeHead(kUnsigned, *number);
        if (const auto* number = value.as<double>()) return writeDouble(*number);
        if (const auto* text = value.asString()) return writeText(*text);
        if (const auto* bytes = value.as<Bytes>()) return writeBytes(*bytes);
        if (const auto* array = value.asArray()) return writeArray(*array);
        if (const auto* dictionary = value.asDictionary()) return writeMap(*dictionary);
        writeTagged(value);
    }

    Bytes take() { return std::move(out_); }

  private:
    void writeTagged(const Value& value) {
        if (const auto* date = value.as<Date>()) {
            writeHead(kTag, kDateTag);
            return writeDouble(date->secondsSince1970());
        }
        if (const auto* url = value.as<URL>()) {
            writeHead(kTag, kURITag);
            return writeText(url->absoluteString());
        }
        if (const KVError* error = value.asError()) {
            writeHead(kTag, kErrorTag);
            return writeArray({error->domain(), error->code(), error->userInfo()});
        }
        writeSimple(kUndefined);
    }

    void writeHead(Major major, std::uint64_t argument) {
        const auto type = static_cast<std::uint8_t>(major << 5);
        if (argument < 24) return put(type | static_cast<std::uint8_t>(argument));
        int width = 3;  // as a power of two, in bytes
        while (width > 0 && argument >> (4 << width) == 0)
            --width;
        put(static_cast<std::uint8_t>(type | (24 + width)));
        putBigEndian(argument, 1 << width);
    }
    void writeInteger(std::int64_t number) {
        if (number >= 0) return writeHead(kUnsigned, static_cast<std::uint64_t>(number));
        writeHead(kNegative, ~static_cast<std::uint64_t>(number));
    }
    void writeSimple(std::uint8_t simple) { put(static_cast<std::uint8_t>(kSimple << 5 | simple)); }
    void writeDouble(double number) {
        writeSimple(kDouble);
        putBigEndian(std::bit_cast<std::uint64_t>(number), 8);
    }
    void writeText(const std::string& text) {
        writeHead(kText, text.size());
        const auto* first = reinterpret_cast<const std::byte*>(text.data());
        out_.insert(out_.end(), first, first + text.size());
    }
    void writeBytes(const Bytes& bytes) {
        writeHead(kBytes, bytes.size());
        out_.insert(out_.end(), bytes.begin(), bytes.end());
    }
    void writeArray(const Array& array) {
        writeHead(kArray, array.size());
        for (const Value& item : array)
            write(item);
    }
    void writeMap(const Dictionary& dictionary) {
        writeHead(kMap, dictionary.size());
        for (const auto& [key, value] : dictionary) {
            writeText(key);
            write(value);
        }
    }
    void put(std::uint8_t byte) { out_.push_back(std::byte{byte}); }
    void putBigEndian(std::uint64_t number, int width) {
        for (int shift = (width - 1) * 8; shift >= 0; shift -= 8)
            put(static_cast<std::uint8_t>(number >> shift));
    }

    Bytes out_;
};

/// Reads forward and remembers the first failure; after it everything reads as nothing.
class Decoder {
  public:
    Decoder(std::span<const std::byte> bytes, const Bounds& bounds) : rest_(bytes), bounds_(bounds) {}

    Result<Value> readWhole() {
        Value value = read(0);
        if (!failure_ && !rest_.empty()) fail("bytes behind the value");
        if (failure_) return *failure_;
        return value;
    }

  private:
    struct Head {
        Major major;
        std::uint8_t information;
        std::uint64_t argument;
    };

    Value read(int depth) {
        if (depth > bounds_.nesting) return fail("nested too deep");
        if (++items_ > bounds_.items) return fail("too many items");
        const Head head = readHead();
        if (failure_) return {};
        switch (head.major) {
            case kUnsigned:
                if (head.argument > INT64_MAX) return head.argument;
                return static_cast<std::int64_t>(head.argument);
            case kNegative:
                if (head.argument > INT64_MAX) return fail("number out of range");
                return static_cast<std::int64_t>(~head.argument);
            case kBytes:
                return readBytes(head.argument);
            case kText:
                return readText(head.argument);
            case kArray:
                return readArray(head.argument, depth);
            case kMap:
                return readMap(head.argument, depth);
            case kTag:
                return readTagged(head.argument, depth);
            case kSimple:
                return readSimple(head);
        }
        return fail("unknown item");
    }

    Head readHead() {
        const auto initial = std::to_integer<std::uint8_t>(take(1).front());
        const auto major = static_cast<Major>(initial >> 5);
        const std::uint8_t information = initial & 31;
        if (information < 24) return {major, information, information};
        if (information > 27) fail("length that is not definite");
        if (failure_) return {major, information, 0};
        std::uint64_t argument = 0;
        const std::size_t width = std::size_t{1} << (information - 24);
        for (const std::byte byte : take(width))
            argument = argument << 8 | std::to_integer<std::uint64_t>(byte);
        return {major, information, argument};
    }

    Value readSimple(const Head& head) {
        switch (head.information) {
            case kFalse:
                return false;
            case kTrue:
                return true;
            case kNull:
            case kUndefined:
                return {};
            case kDouble:
                return std::bit_cast<double>(head.argument);
            default:
                return fail("unknown simple value");
        }
    }
    Value readBytes(std::uint64_t size) {
        const auto bytes = take(size);
        if (failure_) return {};
        return Bytes(bytes.begin(), bytes.end());
    }
    Value readText(std::uint64_t size) {
        const auto bytes = take(size);
        if (failure_) return {};
        const std::string_view text(reinterpret_cast<const char*>(bytes.data()), bytes.size());
        if (!isUTF8(text)) return fail("text that is not UTF-8");
        return text;
    }
    Value readArray(std::uint64_t count, int depth) {
        if (!isPlausible(count)) return fail("fewer items than it claims");
        Array array;
        for (std::uint64_t i = 0; i < count && !failure_; ++i)
            array.push_back(read(depth + 1));
        return array;
    }
    Value readMap(std::uint64_t count, int depth) {
        if (!isPlausible(count)) return fail("fewer items than it claims");
        if (count > kMostEntries) return fail("too many entries");
        Dictionary dictionary;
        for (std::uint64_t i = 0; i < count && !failure_; ++i) {
            const Value key = read(depth + 1);
            if (key.asString() == nullptr) return fail("key that is no text");
            if (dictionary.contains(*key.asString())) return fail("key that stands twice");
            dictionary.set(*key.asString(), read(depth + 1));
        }
        return dictionary;
    }
    Value readTagged(std::uint64_t tag, int depth) {
        const Value content = read(depth + 1);
        if (failure_) return {};
        if (tag == kDateTag && content.asDouble() && std::abs(*content.asDouble()) < 9e9)
            return Date::fromSecondsSince1970(*content.asDouble());
        if (tag == kURITag && content.asString() != nullptr) return URL(*content.asString());
        if (tag == kErrorTag) return readError(content);
        return fail("unknown tag");
    }
    Value readError(const Value& content) {
        const Array* parts = content.asArray();
        if (parts == nullptr || parts->size() != 3) return fail("error without its parts");
        const auto* domain = (*parts)[0].asString();
        const auto* code = (*parts)[1].as<std::int64_t>();
        const auto* userInfo = (*parts)[2].asDictionary();
        if (domain == nullptr || code == nullptr || userInfo == nullptr)
            return fail("error without its parts");
        return KVError(*domain, *code, *userInfo);
    }

    /// Every item takes a byte at least.
    bool isPlausible(std::uint64_t count) const { return count <= rest_.size(); }

    std::span<const std::byte> take(std::uint64_t size) {
        static constexpr std::byte kNone[8]{};
        if (size > rest_.size()) {
            fail("cut short");
            return std::span(kNone, std::min<std::uint64_t>(size, sizeof(kNone)));
        }
        const auto taken = rest_.first(size);
        rest_ = rest_.subspan(size);
        return taken;
    }

    Value fail(const char* what) {
        if (!failure_) failure_ = KVError::posix(EBADMSG, std::string("archive: ") + what);
        return {};
    }

    /// Look-ups walk a dictionary's entries; so many bound what a hostile one costs.
    static constexpr std::uint64_t kMostEntries = 1024;

    std::span<const std::byte> rest_;
    const Bounds bounds_;
    std::size_t items_ = 0;
    OptionalError failure_;
};

}  // namespace

Bytes encode(const Value& value) {
    Encoder encoder;
    encoder.write(value);
    return encoder.take();
}

Result<Value> decode(std::span<const std::byte> bytes, const Bounds& bounds) {
    return Decoder(bytes, bounds).readWhole();
}

}  // namespace kelvo::cbor
