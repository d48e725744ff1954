#pragma once

#include "base/Geometry.h"
#include "base/SampleBuffer.h"
#include "platform/MediaService.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <string>

namespace kelvo::test {

inline constexpr std::int64_t kSecond = 1000000000;

/// Output settings as a movie writer makes them.
Dictionary videoSettings(const Size& size, const Dictionary& compressionProperties);
Dictionary videoSettings(const Size& size, std::int64_t bitRate = 1000000);
Dictionary audioSettings();

/// A grey picture with a bright bar that moves with `number`.
SampleBufferRef testFrame(const Size& size, std::int64_t number, std::int64_t nanoseconds);
/// A frame of one colour.
SampleBufferRef plainFrame(const Size& size, std::uint8_t red, std::uint8_t green, std::uint8_t blue,
                           std::int64_t nanoseconds);
/// A sine tone of `count` frames, 16-bit stereo, whose phase runs on with time.
SampleBufferRef testTone(std::int64_t nanoseconds, std::int64_t count, double hertz = 440,
                         double amplitude = 0.5, double sampleRate = 44100);

/// A writer with a video input and two audio inputs, fed with test pictures and tones.
class TestMovie {
  public:
    struct Options {
        Size size{320, 240};
        double frameRate = 30;
        bool hasAudio1 = true;
        bool hasAudio2 = true;
        AffineTransform transform{};
        Dictionary videoSettings{};  ///< the usual ones when empty
        std::int64_t start = 5 * kSecond;
    };

    TestMovie(MediaService& service, const std::string& path, Options options);

    /// Starts writing and the session; false when the writer does not start.
    bool start();
    /// Appends frames and tones from where it stands to `seconds` after the start, waiting for readiness.
    void recordUntil(double seconds);
    /// Finishes and waits for it. The writer's status.
    MediaFileWriter::Status finish();
    /// Records that long and finishes.
    MediaFileWriter::Status make(double seconds);

    /// Appends one sample as soon as the input is ready; gives up when the writer failed.
    bool appendWhenReady(WriterInput& input, const SampleBufferRef& sample) const;

    const std::shared_ptr<MediaFileWriter>& writer() const { return writer_; }
    WriterInput& video() const { return *video_; }
    WriterInput& audio1() const { return *audio1_; }
    WriterInput& audio2() const { return *audio2_; }
    std::int64_t timeAt(double seconds) const;

  private:
    const Options options_;
    std::shared_ptr<MediaFileWriter> writer_;
    std::shared_ptr<WriterInput> video_;
    std::shared_ptr<WriterInput> audio1_;
    std::shared_ptr<WriterInput> audio2_;
    std::int64_t frames_ = 0;
    std::int64_t audioBuffers_ = 0;
};

}  // namespace kelvo::test
