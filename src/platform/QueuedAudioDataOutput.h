#pragma once

#include "base/Guarded.h"
#include "platform/AudioDataOutput.h"

#include <functional>

namespace kelvo {

/// Hands each sample to its delegate on the delegate's queue: the output that every capture session uses.
/// Thread-safe.
class QueuedAudioDataOutput : public AudioDataOutput,
                              public std::enable_shared_from_this<QueuedAudioDataOutput> {
  public:
    /// Says, when a sample's turn comes, whether its session still yields samples here.
    using IsWanted = std::function<bool(const CaptureOutputRef& output)>;

    void setSampleBufferDelegate(std::weak_ptr<CaptureOutputDelegate> delegate,
                                 std::shared_ptr<SerialQueue> queue) override;

    void deliver(const SampleBufferRef& sample, CaptureConnection connection, IsWanted isWanted);

    /// Runs `task` on the delegate's queue behind what was delivered; not at all without a queue.
    void afterSamples(Task task);

  private:
    struct Receiver {
        std::weak_ptr<CaptureOutputDelegate> delegate;
        std::shared_ptr<SerialQueue> queue;
    };
    Guarded<Receiver> receiver_;
};

}  // namespace kelvo
