#pragma once

#include "base/Guarded.h"
#include "base/Result.h"
#include "ipc/KVClientProxyBase.h"
#include "ipc/KVRemoteDaemon.h"
#include "ipc/KVUserErrors.h"
#include "platform/IPC.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <kelvokit/Recorder.h>
#include <memory>
#include <mutex>
#include <type_traits>

namespace kelvokit {

/// What a recorder needs of the world.
struct RecorderEnvironment {
    /// A connection to the daemon, not resumed. Any thread.
    std::function<kelvo::Result<kelvo::IPCConnectionRef>()> connect;
    /// Runs a task later, on a thread of its own.
    std::function<void(std::chrono::milliseconds, std::function<void()>)> after;
    Executor executor;
    std::shared_ptr<kelvo::KVUserErrors> errors;
};

/// The first and the longest pause between two attempts to find the daemon again; each is twice the one
/// before.
inline constexpr std::chrono::milliseconds kFirstPause{100};
inline constexpr std::chrono::milliseconds kLongestPause{5000};
/// Sound that waits for the executor: about three seconds.
inline constexpr int kMostWaitingAudioBuffers = 256;

/// A handler, or none. Held by whoever calls it, as it may be replaced meanwhile.
template <typename Handler>
using HeldHandler = std::shared_ptr<const Handler>;

/// The handlers that a program has set.
struct RecorderHandlers {
    HeldHandler<std::function<void(const RecorderState&)>> state;
    HeldHandler<Recorder::MovieHandler> stop;
    HeldHandler<std::function<void(const Error&)>> lock;
    HeldHandler<std::function<void()>> shouldResume;
    HeldHandler<std::function<void(const std::string&)>> timer;
    HeldHandler<std::function<void(const Frame&)>> frame;
    HeldHandler<std::function<void(const AudioBuffer&)>> audio;
    HeldHandler<std::function<void(const Dictionary&)>> broadcastInfo;
    HeldHandler<std::function<void(const std::string&)>> broadcastURL;
    HeldHandler<std::function<void(const Error&)>> connectionLost;
    HeldHandler<std::function<void()>> connectionRestored;
};

/// What outlives a recorder for as long as the library's threads use it: the connection, the state and the
/// way to the handlers. Thread-safe.
class Recorder::Core : public kelvo::KVClientProtocol, public std::enable_shared_from_this<Recorder::Core> {
  public:
    explicit Core(RecorderEnvironment environment) : environment_(std::move(environment)) {}

    /// No handler runs afterwards, but for one that calls this.
    void shutDown();

    enum class Kind { recording, capture, broadcast };
    void start(Kind kind, const RecordingOptions& options, StartHandler handler);
    void stop(double startClipDuration, double endClipDuration, MovieHandler handler);
    void pause();
    void resume(std::uint32_t window);
    void setMicrophoneEnabled(bool isEnabled);
    void discard(DoneHandler handler);
    void save(const std::string& movie, DoneHandler handler);
    void setUpBroadcast(const BroadcastOptions& options, DoneHandler handler);
    void getBroadcastImages(ImagesHandler handler);
    void getBroadcastExtensions(ExtensionsHandler handler);
    void isBroadcasting(const std::string& extensionBundleID, BooleanHandler handler);
    void setBroadcastURL(const std::string& url);
    void refreshState();
    RecorderState state() const { return state_.copy(); }
    std::uint64_t droppedAudioBuffers() const { return droppedAudioBuffers_; }

    /// An empty handler removes.
    template <typename Handler>
    void setHandler(HeldHandler<Handler> RecorderHandlers::*place, std::type_identity_t<Handler> handler) {
        auto held = handler ? std::make_shared<const Handler>(std::move(handler)) : nullptr;
        handlers_.with([&](RecorderHandlers& all) { (all.*place).swap(held); });
    }

    void updateScreenRecordingState() override;
    void updateBroadcastServiceInfo(const kelvo::Dictionary& serviceInfo) override;
    void updateBroadcastURL(const kelvo::URL& broadcastURL) override;
    void recordingDidStopWithError(const kelvo::OptionalError& error,
                                   const std::optional<kelvo::URL>& movieURL) override;
    void recordingLockInterrupted(const kelvo::KVError& error) override;
    void recordingShouldResume() override;
    void recordingDidPause() override;
    void recordingTimerDidUpdate(const std::string& timerText) override;
    void captureHandlerWithSample(const std::shared_ptr<kelvo::KVIOSurfaceObject>& surface,
                                  const kelvo::RecordBytes<kelvo::TimingRecord>& timingData) override;
    void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                       const kelvo::RecordBytes<kelvo::AudioFormatRecord>& absdData,
                                       std::int64_t itemCount, kelvo::SampleBuffer::Type bufferType,
                                       const kelvo::RecordBytes<kelvo::TimingRecord>& timingData) override;

  private:
    using FailureHandler = std::function<void(const Error&)>;

    /// Makes a request, or says why not; the failure handler runs on the executor.
    void request(const std::function<void(kelvo::KVRemoteDaemon&)>& send, FailureHandler failed);
    void tell(const std::function<void(kelvo::KVRemoteDaemon&)>& send);
    kelvo::Result<kelvo::IPCConnectionRef> connection();
    kelvo::Result<kelvo::IPCConnectionRef> presentConnection(bool& isNew);
    void setUp(const kelvo::IPCConnectionRef& connection);
    void lost(const std::weak_ptr<kelvo::IPCConnection>& connection);
    void lookAgain(std::chrono::milliseconds pause);

    /// Runs a task on the executor, unless the recorder has gone by then.
    template <typename Work>
    void post(Work work);
    /// Calls one of the handlers, as it is then, on the executor.
    template <typename Handler, typename... Arguments>
    void notify(HeldHandler<Handler> RecorderHandlers::*place, Arguments... arguments);
    void changeState(const std::function<void(RecorderState&)>& change);
    void ended();
    Error localError(ErrorCode code, std::string detail) const;

    const RecorderEnvironment environment_;
    kelvo::Guarded<RecorderHandlers> handlers_;
    std::mutex connecting_;  ///< so that two requests at once make one connection
    kelvo::Guarded<kelvo::IPCConnectionRef> connection_;
    kelvo::Guarded<RecorderState> state_;
    std::atomic<bool> isLooking_{false};
    std::atomic<int> waitingAudioBuffers_{0};
    std::atomic<std::uint64_t> droppedAudioBuffers_{0};
    std::recursive_mutex running_;  ///< held while a handler runs: whoever shuts down waits for it
    std::atomic<bool> isShutDown_{false};
};

template <typename Work>
void Recorder::Core::post(Work work) {
    environment_.executor([weakSelf = weak_from_this(), work = std::move(work)]() mutable {
        const Work task = std::move(work);  // what it holds, a frame perhaps, goes on the executor
        const auto self = weakSelf.lock();
        if (!self) return;
        const std::lock_guard lock(self->running_);
        if (!self->isShutDown_) task();
    });
}

/// Gives tests a recorder in an environment of theirs.
struct RecorderTestAccess {
    static std::unique_ptr<Recorder> make(RecorderEnvironment environment);
};

}  // namespace kelvokit
