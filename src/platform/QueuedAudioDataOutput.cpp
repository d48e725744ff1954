#include "platform/QueuedAudioDataOutput.h"

#include <utility>

namespace kelvo {

void QueuedAudioDataOutput::setSampleBufferDelegate(std::weak_ptr<CaptureOutputDelegate> delegate,
                                                    std::shared_ptr<SerialQueue> queue) {
    receiver_.set({std::move(delegate), std::move(queue)});
}

void QueuedAudioDataOutput::deliver(const SampleBufferRef& sample, CaptureConnection connection,
                                    IsWanted isWanted) {
    const Receiver receiver = receiver_.copy();
    if (!receiver.queue) return;
    receiver.queue->async([self = shared_from_this(), delegate = receiver.delegate, sample,
                           connection = std::move(connection), isWanted = std::move(isWanted)] {
        const auto living = delegate.lock();
        if (living && isWanted(self)) living->captureOutputDidOutputSampleBuffer(self, sample, connection);
    });
}

void QueuedAudioDataOutput::afterSamples(Task task) {
    if (const auto queue = receiver_.copy().queue) queue->async(std::move(task));
}

}  // namespace kelvo
