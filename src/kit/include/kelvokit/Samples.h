#pragma once

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <kelvokit/Export.h>
#include <memory>
#include <optional>
#include <span>

namespace kelvokit {

/// The time of a sample on the clock of the recording; all its streams share it.
using SampleTime = std::chrono::nanoseconds;

/// One captured picture, in memory that is shared with the daemon and can only be read. Copies are handles to
/// the same picture. It stays as it is for as long as a handle exists, past the handler that brought it; the
/// last handle gives it back. Few pictures exist (eight for one capture): while all are held, no new one
/// comes. Thread-safe.
class KELVOKIT_EXPORT Frame {
  public:
    /// Pixels.
    std::uint32_t width() const;
    std::uint32_t height() const;
    /// At least four times the width.
    std::size_t bytesPerRow() const;
    /// `bytesPerRow() * height()` bytes from the top row down; a pixel is blue, green, red and one unused
    /// byte.
    std::span<const std::byte> pixels() const;
    /// None when the capture gave none.
    std::optional<SampleTime> presentationTime() const;

    struct KELVOKIT_HIDDEN Content;
    KELVOKIT_HIDDEN explicit Frame(std::shared_ptr<const Content> content);

  private:
    std::shared_ptr<const Content> content_;
};

/// Captured sound. Copies are handles to the same bytes, which nobody changes. Thread-safe.
class KELVOKIT_EXPORT AudioBuffer {
  public:
    enum class Source { application, microphone };

    Source source() const;
    /// Hertz.
    double sampleRate() const;
    std::uint32_t channels() const;
    /// Of one sample of one channel.
    std::uint32_t bitsPerSample() const;
    /// Floating point numbers; else signed or unsigned integers.
    bool isFloat() const;
    bool isSigned() const;
    /// One channel's samples stand after the other's, not side by side.
    bool isPlanar() const;
    /// Samples of each channel.
    std::int64_t frameCount() const;
    std::span<const std::byte> bytes() const;
    std::optional<SampleTime> presentationTime() const;

    struct KELVOKIT_HIDDEN Content;
    KELVOKIT_HIDDEN explicit AudioBuffer(std::shared_ptr<const Content> content);

  private:
    std::shared_ptr<const Content> content_;
};

}  // namespace kelvokit
