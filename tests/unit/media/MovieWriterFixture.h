#pragma once

#include "base/GlobalQueue.h"
#include "media/KVMovieWriter.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/LogRecorder.h"

#include <optional>
#include <string>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

inline constexpr std::int32_t kNanoseconds = 1000000000;

inline TimingRecord timingAt(std::int64_t value) {
    const MediaTime time = MediaTime::make(value, kNanoseconds);
    return {MediaTime::make(10, kNanoseconds), time, time};
}

inline SampleBufferRef videoSample(const TimingRecord& timing) {
    static const VideoSurfaceRef surface =
        VideoSurface::create(VideoSurface::Geometry::packed(2, 2)).valueOr(nullptr);
    return SampleBuffer::video(surface, timing);
}
inline SampleBufferRef videoSample(std::int64_t value) {
    return videoSample(timingAt(value));
}
inline SampleBufferRef audioSample(std::int64_t value) {
    return SampleBuffer::audio(AudioFormatRecord::signed16(44100, 2), Bytes(8), 2, timingAt(value));
}

/// A movie writer on the simulated device.
class MovieWriterFixture : public ::testing::Test {
  protected:
    static constexpr const char* kPath = "/private/var/mobile/Library/KelvoKit//movie.mp4";

    std::shared_ptr<KVMovieWriter> makeWriter(const Size& windowSize = {1080, 1920}) {
        const auto store =
            std::make_shared<KVTemporaryFileStore>(device.fileSystem, device.textFolding, device.clock);
        return KVMovieWriter::create(windowSize, kPath,
                                     {device.media, store, device.preferences, device.device});
    }

    /// Waits for the writer's queue and for what it started in the background.
    void settle(KVMovieWriter& movieWriter) {
        for (int i = 0; i < 2; ++i) {
            movieWriter.movieWriterQueue().sync([] {});
            GlobalQueue::drain();
        }
    }
    void settle() { settle(*writer); }

    void start() {
        writer->startWritingHandler(nullptr);
        settle();
    }
    /// Starts and appends the first video sample, at 100.
    void startMovie() {
        start();
        appendVideo(100);
    }
    void appendVideo(std::int64_t value) { writer->appendVideoSampleBuffer(videoSample(value), {}); }
    void appendAudio1(std::int64_t value) { writer->appendAudio1SampleBuffer(audioSample(value)); }
    void appendAudio2(std::int64_t value) { writer->appendAudio2SampleBuffer(audioSample(value)); }

    /// Finishes and returns what the handler was called with, one entry a call.
    std::vector<std::optional<URL>> finish() {
        Guarded<std::vector<std::optional<URL>>> urls;
        writer->finishWritingWithHandler(
            [&](const auto& url) { urls.with([&](auto& all) { all.push_back(url); }); });
        settle();
        return urls.copy();
    }

    std::shared_ptr<SimulatedFileWriter> fileWriter() const { return device.media->writers().back(); }
    std::shared_ptr<SimulatedWriterInput> input(std::size_t index) const {
        return fileWriter()->inputs().at(index);
    }
    std::shared_ptr<SimulatedWriterInput> video() const { return input(0); }
    std::shared_ptr<SimulatedWriterInput> audio1() const { return input(1); }
    std::shared_ptr<SimulatedWriterInput> audio2() const { return input(2); }

    using Values = std::vector<std::int64_t>;

    LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<KVMovieWriter> writer = makeWriter();
};

}  // namespace kelvo::test
