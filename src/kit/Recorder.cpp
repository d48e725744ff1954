#include "kit/LocalDaemon.h"
#include "kit/RecorderCore.h"

#include <kelvokit/Recorder.h>
#include <utility>

namespace kelvokit {

// Taken as a copy, as users pass what they need no more.
// NOLINTNEXTLINE(performance-unnecessary-value-param)
Recorder::Recorder(RecorderOptions options) : core_(std::make_shared<Core>(localEnvironment(options))) {}
Recorder::Recorder(std::shared_ptr<Core> core) : core_(std::move(core)) {}
Recorder::~Recorder() {
    core_->shutDown();
}

std::unique_ptr<Recorder> RecorderTestAccess::make(RecorderEnvironment environment) {
    // The constructor is for tests alone.
    return std::unique_ptr<Recorder>(new Recorder(std::make_shared<Recorder::Core>(std::move(environment))));
}

void Recorder::start(const RecordingOptions& options, StartHandler handler) {
    core_->start(Core::Kind::recording, options, std::move(handler));
}
void Recorder::startCapture(const RecordingOptions& options, StartHandler handler) {
    core_->start(Core::Kind::capture, options, std::move(handler));
}
void Recorder::startBroadcast(const RecordingOptions& options, StartHandler handler) {
    core_->start(Core::Kind::broadcast, options, std::move(handler));
}
void Recorder::stop(MovieHandler handler) {
    core_->stop(0, 0, std::move(handler));
}
void Recorder::stop(double startClipDuration, double endClipDuration, MovieHandler handler) {
    core_->stop(startClipDuration, endClipDuration, std::move(handler));
}
void Recorder::pause() {
    core_->pause();
}
void Recorder::resume(std::uint32_t window) {
    core_->resume(window);
}
void Recorder::setMicrophoneEnabled(bool isEnabled) {
    core_->setMicrophoneEnabled(isEnabled);
}
void Recorder::discard(DoneHandler handler) {
    core_->discard(std::move(handler));
}
void Recorder::save(const std::string& movie, DoneHandler handler) {
    core_->save(movie, std::move(handler));
}
void Recorder::setUpBroadcast(const BroadcastOptions& options, DoneHandler handler) {
    core_->setUpBroadcast(options, std::move(handler));
}
void Recorder::getBroadcastImages(ImagesHandler handler) {
    core_->getBroadcastImages(std::move(handler));
}
void Recorder::getBroadcastExtensions(ExtensionsHandler handler) {
    core_->getBroadcastExtensions(std::move(handler));
}
void Recorder::isBroadcasting(const std::string& extensionBundleID, BooleanHandler handler) {
    core_->isBroadcasting(extensionBundleID, std::move(handler));
}
void Recorder::setBroadcastURL(const std::string& url) {
    core_->setBroadcastURL(url);
}
void Recorder::refreshState() {
    core_->refreshState();
}
RecorderState Recorder::state() const {
    return core_->state();
}
std::uint64_t Recorder::droppedAudioBuffers() const {
    return core_->droppedAudioBuffers();
}

void Recorder::onState(std::function<void(const RecorderState&)> handler) {
    core_->setHandler(&RecorderHandlers::state, std::move(handler));
}
void Recorder::onStop(MovieHandler handler) {
    core_->setHandler(&RecorderHandlers::stop, std::move(handler));
}
void Recorder::onLock(std::function<void(const Error&)> handler) {
    core_->setHandler(&RecorderHandlers::lock, std::move(handler));
}
void Recorder::onShouldResume(std::function<void()> handler) {
    core_->setHandler(&RecorderHandlers::shouldResume, std::move(handler));
}
void Recorder::onTimer(std::function<void(const std::string&)> handler) {
    core_->setHandler(&RecorderHandlers::timer, std::move(handler));
}
void Recorder::onFrame(std::function<void(const Frame&)> handler) {
    core_->setHandler(&RecorderHandlers::frame, std::move(handler));
}
void Recorder::onAudio(std::function<void(const AudioBuffer&)> handler) {
    core_->setHandler(&RecorderHandlers::audio, std::move(handler));
}
void Recorder::onBroadcastInfo(std::function<void(const Dictionary&)> handler) {
    core_->setHandler(&RecorderHandlers::broadcastInfo, std::move(handler));
}
void Recorder::onBroadcastURL(std::function<void(const std::string&)> handler) {
    core_->setHandler(&RecorderHandlers::broadcastURL, std::move(handler));
}
void Recorder::onConnectionLost(std::function<void(const Error&)> handler) {
    core_->setHandler(&RecorderHandlers::connectionLost, std::move(handler));
}
void Recorder::onConnectionRestored(std::function<void()> handler) {
    core_->setHandler(&RecorderHandlers::connectionRestored, std::move(handler));
}

}  // namespace kelvokit
