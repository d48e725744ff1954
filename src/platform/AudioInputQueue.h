#pragma once

#include "base/KVError.h"
#include "base/MediaRecords.h"
#include "base/MediaTime.h"
#include "base/Result.h"
#include "base/Value.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string_view>
#include <vector>

namespace kelvo {

/// Domain of the errors of audio operations; their codes are the system's status numbers.
inline constexpr std::string_view kAudioErrorDomain = "KVAudioErrorDomain";

/// Status numbers that adapters report, besides those of the system underneath.
enum AudioStatus : std::int32_t {
    kAudioInvalidBuffer = -66687,     ///< a buffer of another queue, or one that is in use
    kAudioInvalidParameter = -66683,  ///< a process, size or format that makes no sense
    kAudioInvalidRunState = -66681,   ///< not while the queue runs, or not after its disposal
    kAudioFormatNotSupported = 1718449215,
};

/// Creation flag of a queue that can be pointed at a process.
inline constexpr std::uint32_t kAudioQueueTapsProcess = 0x800;

/// A moment as an hours-and-frames code; not used by the system's own streams.
struct AudioTimeCode {
    std::int16_t subframes = 0;
    std::int16_t subframeDivisor = 0;
    std::uint32_t counter = 0;
    std::uint32_t type = 0;
    std::uint32_t flags = 0;
    std::int16_t hours = 0;
    std::int16_t minutes = 0;
    std::int16_t seconds = 0;
    std::int16_t frames = 0;

    friend bool operator==(const AudioTimeCode&, const AudioTimeCode&) = default;
};

/// Which fields of a time stamp hold something.
enum AudioTimeStampFlag : std::uint32_t {
    kAudioSampleTimeValid = 1U << 0,
    kAudioHostTimeValid = 1U << 1,
};

/// The start of a buffer on several clocks.
struct AudioTimeStamp {
    double sampleTime = 0;       ///< frames since the queue started
    std::uint64_t hostTime = 0;  ///< nanoseconds of the host's monotonic clock
    double rateScalar = 1.0;     ///< host ticks a frame, against the nominal rate
    std::uint64_t wordClockTime = 0;
    AudioTimeCode timeCode;
    std::uint32_t flags = 0;

    friend bool operator==(const AudioTimeStamp&, const AudioTimeStamp&) = default;
};

/// A host time as media time: on the host clock, timescale 1 000 000 000.
inline MediaTime mediaTimeFromHostTime(std::uint64_t hostTime) {
    return MediaTime::make(static_cast<std::int64_t>(hostTime), 1000000000);
}

/// Where one packet lies in a buffer, for formats whose packets differ in size.
struct AudioPacketDescription {
    std::int64_t startOffset = 0;
    std::uint32_t framesInPacket = 0;
    std::uint32_t byteSize = 0;

    friend bool operator==(const AudioPacketDescription&, const AudioPacketDescription&) = default;
};

/// Memory that circulates through a queue. The queue writes it while it is enqueued, its user reads it
/// otherwise.
struct AudioQueueBuffer {
    Bytes bytes;               ///< as many as were allocated
    std::size_t byteSize = 0;  ///< how many of them are filled
};
using AudioQueueBufferRef = std::shared_ptr<AudioQueueBuffer>;

/// Called on the queue's thread with each filled buffer, which is the user's until it is enqueued again.
/// `packetDescriptions` are valid during the call, and none for formats of constant packets.
using AudioInputCallback = std::function<void(const AudioQueueBufferRef& buffer, const AudioTimeStamp& start,
                                              std::uint32_t packetCount,
                                              std::span<const AudioPacketDescription> packetDescriptions)>;

/// Records what one process plays. Implemented by the PulseAudio adapter and the simulated device; used by
/// the capture manager, which makes a new one for every process. Thread-safe.
///
/// In this order: `setTapProcess`, buffers allocated and enqueued, `start`, `stop`, buffers freed, `dispose`.
/// Buffers are filled in the order in which they were enqueued and follow one another without a gap, with
/// silence where the process is quiet, gone or out of reach; while none is enqueued, sound is lost. A sound
/// server that is absent, dies or comes back makes no operation fail and stops no buffer. Failures are of
/// `kAudioErrorDomain`.
class AudioInputQueue {
  public:
    virtual ~AudioInputQueue() = default;

    /// Before the start; `processIdentifier` is 1 or more.
    virtual OptionalError setTapProcess(std::int32_t processIdentifier) = 0;
    /// What the buffers hold.
    virtual Result<AudioFormatRecord> streamFormat() = 0;
    /// In bytes.
    virtual Result<std::uint32_t> maximumOutputPacketSize() = 0;

    virtual Result<AudioQueueBufferRef> allocateBuffer(std::uint32_t byteSize) = 0;
    virtual OptionalError enqueueBuffer(const AudioQueueBufferRef& buffer) = 0;
    virtual OptionalError freeBuffer(const AudioQueueBufferRef& buffer) = 0;

    virtual OptionalError start() = 0;
    /// At once: no callback begins after the return. Not from within a callback.
    virtual OptionalError stop() = 0;
    /// Ends the queue; every other operation fails from then on.
    virtual OptionalError dispose() = 0;

    /// `listener` runs, on any thread, each time the queue begins or ceases to run, until it is
    /// taken away. One at a time.
    virtual OptionalError addRunningListener(std::function<void()> listener) = 0;
    /// Fails when there is none. The listener may run once more if it was about to.
    virtual OptionalError removeRunningListener() = 0;
};

using AudioInputQueueRef = std::shared_ptr<AudioInputQueue>;

}  // namespace kelvo
