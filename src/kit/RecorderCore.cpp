#include "kit/RecorderCore.h"

#include "ipc/KVClientProtocolTable.h"
#include "kit/Conversions.h"

#include <algorithm>
#include <utility>

namespace kelvokit {

using kelvo::IPCConnectionRef;
using kelvo::KVRemoteDaemon;

void Recorder::Core::shutDown() {
    const std::lock_guard lock(running_);
    isShutDown_ = true;
    handlers_.set({});
    if (const IPCConnectionRef connection = connection_.exchange(nullptr)) connection->invalidate();
}

void Recorder::Core::request(const std::function<void(KVRemoteDaemon&)>& send, FailureHandler failed) {
    const auto connected = connection();
    if (!connected) {
        if (!failed) return;
        const Error error =
            localError(ErrorCode::connectionInvalid, connected.error().localizedDescription());
        return post([failed = std::move(failed), error] { failed(error); });
    }
    KVRemoteDaemon daemon(
        **connected, [weakSelf = weak_from_this(), failed = std::move(failed)](const auto& error) {
            const auto self = weakSelf.lock();
            if (!self || !failed) return;
            self->post([failed, error = self->localError(ErrorCode::connectionInterrupted,
                                                         error.localizedDescription())] { failed(error); });
        });
    send(daemon);
}

void Recorder::Core::tell(const std::function<void(KVRemoteDaemon&)>& send) {
    request(send, nullptr);
}

kelvo::Result<IPCConnectionRef> Recorder::Core::connection() {
    bool isNew = false;
    auto found = presentConnection(isNew);
    if (!isNew) return found;
    // Outside of the lock: an executor may run the handler in here, and that may make requests.
    changeState([](RecorderState& state) { state.isConnected = true; });
    (*found)->resume();
    // The recorder may have gone before this connection was there to be ended.
    if (isShutDown_) (*found)->invalidate();
    return found;
}

/// A new one is not resumed yet.
kelvo::Result<IPCConnectionRef> Recorder::Core::presentConnection(bool& isNew) {
    const std::lock_guard lock(connecting_);
    if (IPCConnectionRef present = connection_.copy()) return present;
    if (isShutDown_) return kelvo::KVError::posix(ESHUTDOWN, "recorder");
    auto made = environment_.connect();
    if (!made) return made;
    setUp(*made);
    connection_.set(*made);
    isNew = true;
    return made;
}

void Recorder::Core::setUp(const IPCConnectionRef& connection) {
    connection->setRemoteInterface(kelvo::interfaceOf<kelvo::KVDaemonProtocol>());
    connection->setExported(
        kelvo::interfaceOf<kelvo::KVClientProtocol>(),
        std::make_shared<kelvo::ProtocolDispatcher<kelvo::KVClientProtocol>>(weak_from_this()));
    connection->setInvalidationHandler([weakSelf = weak_from_this(), weak = std::weak_ptr(connection)] {
        if (const auto self = weakSelf.lock()) self->lost(weak);
    });
}

/// However the connection ended, it was not this side that wanted it: then nobody listens any more.
void Recorder::Core::lost(const std::weak_ptr<kelvo::IPCConnection>& connection) {
    const IPCConnectionRef which = connection.lock();
    const bool isCurrent = connection_.with([&](IPCConnectionRef& current) {
        return which == current && std::exchange(current, nullptr) != nullptr;
    });
    if (!isCurrent || isShutDown_) return;
    changeState([](RecorderState& state) { state = {}; });
    notify(&RecorderHandlers::connectionLost,
           localError(ErrorCode::connectionInterrupted, "the daemon was lost"));
    if (!isLooking_.exchange(true)) lookAgain(kFirstPause);
}

void Recorder::Core::lookAgain(std::chrono::milliseconds pause) {
    environment_.after(pause, [weakSelf = weak_from_this(), pause] {
        const auto self = weakSelf.lock();
        if (!self || self->isShutDown_) return;
        if (!self->connection()) return self->lookAgain(std::min(pause * 2, kLongestPause));
        self->isLooking_ = false;
        self->notify(&RecorderHandlers::connectionRestored);
        self->refreshState();
    });
}

template <typename Handler, typename... Arguments>
void Recorder::Core::notify(HeldHandler<Handler> RecorderHandlers::*place, Arguments... arguments) {
    post([this, place, ... arguments = std::move(arguments)] {
        const auto present = handlers_.with([&](const RecorderHandlers& all) { return all.*place; });
        if (present) (*present)(arguments...);
    });
}

void Recorder::Core::changeState(const std::function<void(RecorderState&)>& change) {
    const auto changed = state_.with([&](RecorderState& state) {
        const RecorderState before = state;
        change(state);
        return before == state ? std::nullopt : std::optional(state);
    });
    if (changed) notify(&RecorderHandlers::state, *changed);
}

void Recorder::Core::ended() {
    changeState([](RecorderState& state) { state = {.isConnected = state.isConnected}; });
}

Error Recorder::Core::localError(ErrorCode code, std::string detail) const {
    Error error = publicError(environment_.errors->kvUserErrorForCode(static_cast<std::int64_t>(code)));
    error.detail = std::move(detail);
    return error;
}

void Recorder::Core::updateScreenRecordingState() {
    refreshState();
}
void Recorder::Core::updateBroadcastServiceInfo(const kelvo::Dictionary& serviceInfo) {
    notify(&RecorderHandlers::broadcastInfo, publicDictionary(serviceInfo));
}
void Recorder::Core::updateBroadcastURL(const kelvo::URL& broadcastURL) {
    notify(&RecorderHandlers::broadcastURL, broadcastURL.absoluteString());
}
void Recorder::Core::recordingDidStopWithError(const kelvo::OptionalError& error,
                                               const std::optional<kelvo::URL>& movieURL) {
    ended();
    notify(&RecorderHandlers::stop, publicPath(movieURL), publicError(error));
}
void Recorder::Core::recordingLockInterrupted(const kelvo::KVError& error) {
    notify(&RecorderHandlers::lock, publicError(error));
}
void Recorder::Core::recordingShouldResume() {
    notify(&RecorderHandlers::shouldResume);
}
void Recorder::Core::recordingDidPause() {
    changeState([](RecorderState& state) { state.isPaused = true; });
}
void Recorder::Core::recordingTimerDidUpdate(const std::string& timerText) {
    notify(&RecorderHandlers::timer, timerText);
}

void Recorder::Core::captureHandlerWithSample(const std::shared_ptr<kelvo::KVIOSurfaceObject>& surface,
                                              const kelvo::RecordBytes<kelvo::TimingRecord>& timingData) {
    if (!surface->ioSurface()) return;
    const auto timing = kelvo::recordFromBytes<kelvo::TimingRecord>(timingData);
    notify(&RecorderHandlers::frame, Frame(std::make_shared<const Frame::Content>(
                                         Frame::Content{surface->ioSurface(), timing.presentationTime})));
}

/// Frames are bounded by the daemon's pool; sound is bounded here.
void Recorder::Core::captureHandlerWithAudioSample(
    std::span<const std::byte> audioData, const kelvo::RecordBytes<kelvo::AudioFormatRecord>& absdData,
    std::int64_t itemCount, kelvo::SampleBuffer::Type bufferType,
    const kelvo::RecordBytes<kelvo::TimingRecord>& timingData) {
    if (waitingAudioBuffers_ >= kMostWaitingAudioBuffers) {
        ++droppedAudioBuffers_;
        return;
    }
    ++waitingAudioBuffers_;
    const bool isMicrophone = bufferType == kelvo::SampleBuffer::Type::microphone;
    AudioBuffer::Content content{
        kelvo::Bytes(audioData.begin(), audioData.end()),
        kelvo::recordFromBytes<kelvo::AudioFormatRecord>(absdData), itemCount,
        isMicrophone ? AudioBuffer::Source::microphone : AudioBuffer::Source::application,
        kelvo::recordFromBytes<kelvo::TimingRecord>(timingData).presentationTime};
    const AudioBuffer buffer(std::make_shared<const AudioBuffer::Content>(std::move(content)));
    post([this, buffer] {
        --waitingAudioBuffers_;
        const auto present = handlers_.with([](const RecorderHandlers& all) { return all.audio; });
        if (present) (*present)(buffer);
    });
}

}  // namespace kelvokit
