#include "media/AppAudioTap.h"

#include "platform/AudioErrors.h"

namespace kelvo {
namespace {

KVError missing() {
    return audioError(kAudioInvalidParameter, "there is no audio input queue");
}

}  // namespace

OptionalError MissingInputQueue::setTapProcess(std::int32_t) {
    return missing();
}
Result<AudioFormatRecord> MissingInputQueue::streamFormat() {
    return missing();
}
Result<std::uint32_t> MissingInputQueue::maximumOutputPacketSize() {
    return missing();
}
Result<AudioQueueBufferRef> MissingInputQueue::allocateBuffer(std::uint32_t) {
    return missing();
}
OptionalError MissingInputQueue::enqueueBuffer(const AudioQueueBufferRef&) {
    return missing();
}
OptionalError MissingInputQueue::freeBuffer(const AudioQueueBufferRef&) {
    return missing();
}
OptionalError MissingInputQueue::start() {
    return missing();
}
OptionalError MissingInputQueue::stop() {
    return missing();
}
OptionalError MissingInputQueue::dispose() {
    return missing();
}
OptionalError MissingInputQueue::addRunningListener(std::function<void()>) {
    return missing();
}
OptionalError MissingInputQueue::removeRunningListener() {
    return missing();
}

}  // namespace kelvo
