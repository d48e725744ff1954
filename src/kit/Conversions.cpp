#include "kit/Conversions.h"

#include <utility>

namespace kelvokit {
namespace {

template <typename Type>
bool take(const kelvo::Value& value, const std::string& key, Dictionary& to) {
    const auto* content = value.as<Type>();
    if (content != nullptr) to.emplace(key, *content);
    return content != nullptr;
}

std::optional<SampleTime> publicTime(const kelvo::MediaTime& time) {
    const kelvo::MediaTime exact = time.isValid() ? time.convertedTo(1'000'000'000) : kelvo::MediaTime();
    return exact.isValid() ? std::optional<SampleTime>(exact.value) : std::nullopt;
}

}  // namespace

Error publicError(const kelvo::KVError& error) {
    return {error.domain(), error.code(), error.localizedDescription(), error.localizedFailureReason()};
}

std::optional<Error> publicError(const kelvo::OptionalError& error) {
    return error ? std::optional(publicError(*error)) : std::nullopt;
}

std::optional<std::string> publicPath(const std::optional<kelvo::URL>& movie) {
    return movie ? std::optional(movie->path()) : std::nullopt;
}

Dictionary publicDictionary(const kelvo::Dictionary& dictionary) {
    Dictionary result;
    for (const auto& [key, value] : dictionary) {
        static_cast<void>(take<bool>(value, key, result) || take<std::int64_t>(value, key, result) ||
                          take<double>(value, key, result) || take<std::string>(value, key, result) ||
                          take<kelvo::Bytes>(value, key, result));
    }
    return result;
}

kelvo::Dictionary wireDictionary(const Dictionary& dictionary) {
    kelvo::Dictionary result;
    for (const auto& [key, value] : dictionary)
        std::visit([&, &name = key](const auto& content) { result.set(name, kelvo::Value(content)); }, value);
    return result;
}

Frame::Frame(std::shared_ptr<const Content> content) : content_(std::move(content)) {}
std::uint32_t Frame::width() const {
    return content_->surface->width();
}
std::uint32_t Frame::height() const {
    return content_->surface->height();
}
std::size_t Frame::bytesPerRow() const {
    return content_->surface->geometry().bytesPerRow;
}
std::span<const std::byte> Frame::pixels() const {
    return std::as_const(*content_->surface).pixels();
}
std::optional<SampleTime> Frame::presentationTime() const {
    return publicTime(content_->time);
}

AudioBuffer::AudioBuffer(std::shared_ptr<const Content> content) : content_(std::move(content)) {}
AudioBuffer::Source AudioBuffer::source() const {
    return content_->source;
}
double AudioBuffer::sampleRate() const {
    return content_->format.sampleRate;
}
std::uint32_t AudioBuffer::channels() const {
    return content_->format.channelsPerFrame;
}
std::uint32_t AudioBuffer::bitsPerSample() const {
    return content_->format.bitsPerChannel;
}
bool AudioBuffer::isFloat() const {
    return (content_->format.formatFlags & kelvo::kAudioFlagFloat) != 0;
}
bool AudioBuffer::isSigned() const {
    return (content_->format.formatFlags & kelvo::kAudioFlagSignedInteger) != 0;
}
bool AudioBuffer::isPlanar() const {
    return (content_->format.formatFlags & kelvo::kAudioFlagNonInterleaved) != 0;
}
std::int64_t AudioBuffer::frameCount() const {
    return content_->frameCount;
}
std::span<const std::byte> AudioBuffer::bytes() const {
    return content_->bytes;
}
std::optional<SampleTime> AudioBuffer::presentationTime() const {
    return publicTime(content_->time);
}

}  // namespace kelvokit
