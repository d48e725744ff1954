#pragma once

#include "platform/AudioQueueBuffers.h"
#include "platform/linux/pulse/PulseTap.h"
#include "platform/linux/pulse/Ticker.h"

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>

namespace kelvo::pulse {

/// The tap of one process as an audio input queue. Buffers are filled by the host's clock, whatever the sound
/// server does. Thread-safe, but for calls from within the callback.
class PulseInputQueue : public AudioInputQueue {
  public:
    using ServerSource = std::function<std::shared_ptr<PulseServer>()>;

    /// Frames in a filled buffer: about 46 ms, so that little sound is on its way when a recording ends; but
    /// twice as many for each buffer that its user keeps, so that those that are left last the longer.
    static constexpr std::int64_t kFramesInBuffer = 2048;
    static constexpr std::int64_t kMostFramesInBuffer = 14 * kFramesInBuffer;

    /// Whether buffers of `format` can be filled.
    static bool isSupported(const AudioFormatRecord& format);

    PulseInputQueue(ServerSource server, std::shared_ptr<Clock> clock, const AudioFormatRecord& format,
                    AudioInputCallback callback);
    ~PulseInputQueue() override;

    OptionalError setTapProcess(std::int32_t processIdentifier) override;
    Result<AudioFormatRecord> streamFormat() override;
    Result<std::uint32_t> maximumOutputPacketSize() override;
    Result<AudioQueueBufferRef> allocateBuffer(std::uint32_t byteSize) override;
    OptionalError enqueueBuffer(const AudioQueueBufferRef& buffer) override;
    OptionalError freeBuffer(const AudioQueueBufferRef& buffer) override;
    OptionalError start() override;
    OptionalError stop() override;
    OptionalError dispose() override;
    OptionalError addRunningListener(std::function<void()> listener) override;
    OptionalError removeRunningListener() override;

  private:
    /// What exists while the queue runs. Members go in reverse order: each before what it calls or reads.
    struct Run {
        Run(PulseInputQueue& queue, const RecordStream::Source& format);
        MixTimeline timeline;
        Ticker ticker;
        PulseTap tap;
    };

    void endRun();
    bool canFillBuffer(const MixTimeline& timeline) const;
    void fillBuffers(MixTimeline& timeline);
    std::int64_t framesInNextBuffer() const;
    void fill(MixTimeline& timeline, const AudioQueueBufferRef& buffer, std::int64_t frames);
    OptionalError unlessDisposed(const char* operation) const;
    void runningChanged() const;

    const ServerSource server_;
    const std::shared_ptr<Clock> clock_;
    const AudioFormatRecord format_;
    const AudioInputCallback callback_;
    AudioQueueBuffers buffers_;
    Guarded<std::function<void()>> listener_;
    Bytes lost_;  ///< the ticker's own: where sound goes for which there is no buffer

    /// Held by the operations that change the run, never by the callback's thread.
    std::mutex control_;
    std::int32_t processIdentifier_ = 0;
    std::unique_ptr<Run> run_;
    std::atomic<bool> isDisposed_{false};
};

}  // namespace kelvo::pulse
