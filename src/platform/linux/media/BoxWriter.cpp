#include "platform/linux/media/BoxWriter.h"

#include "platform/linux/media/FileWriting.h"

#include <array>

namespace kelvo {
namespace {

constexpr std::size_t kSpillSize = 64 * 1024;

}  // namespace

void BoxWriter::put(std::uint64_t number, int byteCount) {
    for (int shift = 8 * (byteCount - 1); shift >= 0; shift -= 8)
        buffer_.push_back(static_cast<std::byte>(number >> shift));
    spillWhenLarge();
}

void BoxWriter::type(const char (&code)[5]) {
    for (int i = 0; i < 4; ++i)
        u8(static_cast<std::uint8_t>(code[i]));
}

void BoxWriter::bytes(std::span<const std::byte> content) {
    buffer_.insert(buffer_.end(), content.begin(), content.end());
    spillWhenLarge();
}

void BoxWriter::zeros(std::size_t count) {
    buffer_.insert(buffer_.end(), count, std::byte{0});
    spillWhenLarge();
}

void BoxWriter::patch32(std::uint64_t at, std::uint32_t number) {
    std::array<std::byte, 4> patch{};
    for (std::size_t i = 0; i < 4; ++i)
        patch[i] = static_cast<std::byte>(number >> (24 - 8 * i));
    // A field may lie astride what is written out and what is still buffered.
    for (std::size_t i = 0; i < 4; ++i) {
        if (at + i >= base_) {
            buffer_[at + i - base_] = patch[i];
        } else if (!error_) {
            error_ = writeAt(descriptor_, at + i, std::span(patch).subspan(i, 1));
        }
    }
}

void BoxWriter::spillWhenLarge() {
    if (descriptor_ >= 0 && buffer_.size() >= kSpillSize) static_cast<void>(flush());
}

OptionalError BoxWriter::flush() {
    if (!error_) error_ = writeAt(descriptor_, base_, buffer_);
    base_ += buffer_.size();
    buffer_.clear();
    return error_;
}

}  // namespace kelvo
