#include "TestMovie.h"

#include "platform/MediaSettings.h"

#include <algorithm>
#include <chrono>
#include <cmath>
#include <cstring>
#include <future>
#include <numbers>
#include <thread>

namespace kelvo::test {
namespace {

constexpr std::int64_t kAudioBufferLength = 1024;
constexpr std::int32_t kNanoseconds = 1000000000;

TimingRecord timingAt(std::int64_t nanoseconds, std::int64_t duration) {
    const MediaTime time = MediaTime::make(nanoseconds, kNanoseconds);
    return {MediaTime::make(duration, kNanoseconds), time, time};
}

VideoSurfaceRef surfaceOf(const Size& size) {
    const auto geometry = VideoSurface::Geometry::packed(static_cast<std::uint32_t>(size.width),
                                                         static_cast<std::uint32_t>(size.height));
    return VideoSurface::create(geometry).valueOr(nullptr);
}

}  // namespace

Dictionary videoSettings(const Size& size, const Dictionary& compressionProperties) {
    return {{std::string(kVideoCodecKey), kVideoCodecH264},
            {std::string(kVideoWidthKey), size.width},
            {std::string(kVideoHeightKey), size.height},
            {std::string(kVideoCompressionPropertiesKey), compressionProperties}};
}

Dictionary videoSettings(const Size& size, std::int64_t bitRate) {
    return videoSettings(size, Dictionary{{std::string(kExpectedSourceFrameRateKey), 60},
                                          {std::string(kProfileLevelKey), kProfileLevelH264High},
                                          {std::string(kAverageBitRateKey), bitRate},
                                          {std::string(kMaxKeyFrameIntervalKey), 60}});
}

Dictionary audioSettings() {
    Bytes layout(32, std::byte{0});
    std::memcpy(layout.data(), &kStereoLayoutTag, sizeof(kStereoLayoutTag));
    return {{std::string(kAudioFormatKey), kAACFormat},
            {std::string(kAudioChannelCountKey), 2},
            {std::string(kAudioSampleRateKey), 44100.0},
            {std::string(kAudioChannelLayoutKey), layout},
            {std::string(kAudioBitRateKey), 128000}};
}

SampleBufferRef plainFrame(const Size& size, std::uint8_t red, std::uint8_t green, std::uint8_t blue,
                           std::int64_t nanoseconds) {
    const VideoSurfaceRef surface = surfaceOf(size);
    const std::span<std::byte> pixels = surface->writablePixels();
    for (std::size_t i = 0; i < pixels.size(); i += 4) {
        pixels[i] = std::byte{blue};
        pixels[i + 1] = std::byte{green};
        pixels[i + 2] = std::byte{red};
    }
    return SampleBuffer::video(surface, timingAt(nanoseconds, kSecond / 60));
}

SampleBufferRef testFrame(const Size& size, std::int64_t number, std::int64_t nanoseconds) {
    const VideoSurfaceRef surface = surfaceOf(size);
    const std::size_t rowSize = surface->geometry().bytesPerRow;
    const std::size_t rows = surface->height();
    std::byte* pixels = surface->writablePixels().data();
    constexpr std::size_t kBarHeight = 16;
    const std::size_t bar = static_cast<std::size_t>(number) * 4 % rows;
    for (std::size_t row = 0; row < rows; ++row) {
        const bool isBar = row >= bar && row < bar + kBarHeight;
        std::memset(pixels + row * rowSize, isBar ? 0xE0 : static_cast<int>(0x20 + row % 64), rowSize);
    }
    return SampleBuffer::video(surface, timingAt(nanoseconds, kSecond / 60));
}

SampleBufferRef testTone(std::int64_t nanoseconds, std::int64_t count, double hertz, double amplitude,
                         double sampleRate) {
    Bytes bytes(static_cast<std::size_t>(count) * 4);
    const double start = static_cast<double>(nanoseconds) / kSecond;
    for (std::int64_t i = 0; i < count; ++i) {
        const double time = start + static_cast<double>(i) / sampleRate;
        const double level = amplitude * std::sin(2 * std::numbers::pi * hertz * time);
        const auto sample = static_cast<std::int16_t>(std::lround(level * 32767));
        std::memcpy(bytes.data() + i * 4, &sample, 2);
        std::memcpy(bytes.data() + i * 4 + 2, &sample, 2);
    }
    const auto duration = static_cast<std::int64_t>(static_cast<double>(count * kSecond) / sampleRate);
    return SampleBuffer::audio(AudioFormatRecord::signed16(sampleRate, 2), std::move(bytes), count,
                               timingAt(nanoseconds, duration));
}

TestMovie::TestMovie(MediaService& service, const std::string& path, Options options)
    : options_(std::move(options)) {
    auto writer = service.createFileWriter(URL::file(path), MediaFileType::mpeg4);
    if (!writer) return;
    writer_ = *writer;
    video_ = service.createWriterInput(MediaType::video, options_.videoSettings.empty()
                                                             ? videoSettings(options_.size)
                                                             : options_.videoSettings);
    audio1_ = service.createWriterInput(MediaType::audio, audioSettings());
    audio2_ = service.createWriterInput(MediaType::audio, audioSettings());
    for (const auto& input : {video_, audio1_, audio2_}) {
        input->setExpectsMediaDataInRealTime(true);
        writer_->addInput(input);
    }
    video_->setTransform(options_.transform);
}

std::int64_t TestMovie::timeAt(double seconds) const {
    return options_.start + std::llround(seconds * kSecond);
}

bool TestMovie::start() {
    if (!writer_ || !writer_->startWriting()) return false;
    writer_->startSession(MediaTime::make(options_.start, kNanoseconds));
    return true;
}

bool TestMovie::appendWhenReady(WriterInput& input, const SampleBufferRef& sample) const {
    while (!input.isReadyForMoreMediaData()) {
        if (writer_->status() != MediaFileWriter::Status::writing) return false;
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    return input.append(sample);
}

void TestMovie::recordUntil(double seconds) {
    const auto audioTime = [this] { return static_cast<double>(audioBuffers_ * kAudioBufferLength) / 44100; };
    for (; static_cast<double>(frames_) / options_.frameRate < seconds - 1e-9; ++frames_) {
        const double time = static_cast<double>(frames_) / options_.frameRate;
        if (!appendWhenReady(*video_, testFrame(options_.size, frames_, timeAt(time)))) return;
        for (; audioTime() < time + 1 / options_.frameRate; ++audioBuffers_) {
            const std::int64_t at = timeAt(audioTime());
            if (options_.hasAudio1) appendWhenReady(*audio1_, testTone(at, kAudioBufferLength, 440));
            if (options_.hasAudio2) appendWhenReady(*audio2_, testTone(at, kAudioBufferLength, 1000));
        }
    }
}

MediaFileWriter::Status TestMovie::finish() {
    std::promise<void> finished;
    writer_->finishWriting([&] { finished.set_value(); });
    finished.get_future().wait();
    return writer_->status();
}

MediaFileWriter::Status TestMovie::make(double seconds) {
    if (!start()) return writer_ ? writer_->status() : MediaFileWriter::Status::unknown;
    recordUntil(seconds);
    return finish();
}

}  // namespace kelvo::test
