#pragma once

#include "base/Geometry.h"
#include "base/KVError.h"
#include "ipc/KVBroadcastConfiguration.h"
#include "ipc/KVClientProxyBase.h"
#include "platform/IPC.h"
#include "session/BroadcastExtensionLink.h"
#include "support/KVApplicationStateMonitor.h"

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace kelvo {

class KVRecordingSessionDelegate;

/// One recording, capture or broadcast of one client bundle, as its managers drive it. Implemented by
/// `KVRecordingSession` and by a fake in tests. The flags may be read from any thread; everything else
/// belongs to the recording manager's queue, and completions run wherever the session finishes its work.
class RecordingSession : public KVApplicationStateObserver, public KVSystemStateObserver {
  public:
    virtual std::string bundleID() const = 0;
    virtual bool isRecording() const = 0;
    virtual bool isBroadcasting() const = 0;
    virtual bool isSystemRecording() const = 0;
    /// None until a client has connected.
    virtual ClientProxyRef clientProxy() const = 0;
    virtual void setClientProxy(ClientProxyRef proxy) = 0;

    virtual bool isPaused() const = 0;
    virtual bool microphoneEnabled() const = 0;
    virtual void setMicrophoneEnabled(bool enabled) = 0;
    virtual bool microphoneEnabledPersistent() const = 0;
    virtual void setMicrophoneEnabledPersistent(bool enabled) = 0;
    virtual bool hasUserConsentForCamera() const = 0;
    virtual void setHasUserConsentForCamera(bool consent) = 0;
    virtual bool hasUserConsentForMicrophone() const = 0;
    virtual void setHasUserConsentForMicrophone(bool consent) = 0;
    /// Whether the samples go to the client instead of a movie.
    virtual bool isCapturing() const = 0;
    virtual std::optional<Dictionary> extensionInfo() const = 0;
    virtual std::optional<URL> interruptedMovieURL() const = 0;
    /// Whether a movie of the store has the name of this client's own.
    virtual bool ownsMovie(const URL& movieURL) const = 0;
    /// Whether that movie is being recorded now.
    virtual bool isWritingMovie(const URL& movieURL) const = 0;
    /// None unless the session broadcasts.
    virtual std::shared_ptr<BroadcastExtensionLink> broadcastExtension() const = 0;

    // What a start sets.
    virtual void setBroadcasting(bool broadcasting) = 0;
    virtual void setSystemRecording(bool systemRecording) = 0;
    virtual void setContextIDs(std::vector<std::uint32_t> contextIDs) = 0;
    virtual void setWindowSize(const Size& size) = 0;
    virtual void setDelegate(std::weak_ptr<KVRecordingSessionDelegate> delegate) = 0;
    virtual void setCaptureRecording(bool captureRecording) = 0;
    /// An in-app session taps the microphone only with the daemon's own consent.
    virtual void setDaemonUserConsentForMicrophone(bool consent) = 0;
    /// The process whose sound is recorded; below 1 means none.
    virtual void setFrontmostPIDForAudioTap(std::int32_t processIdentifier) = 0;
    virtual void setBroadcastConfiguration(std::shared_ptr<const KVBroadcastConfiguration> configuration) = 0;
    /// Broadcasts from now on: to the extension that broadcast set-up found, or to the one that listens at
    /// the endpoint (may be none). May block until the extension is reached. An error leaves it to the caller
    /// whether to start.
    virtual OptionalError enableBroadcastWithExtension(
        const Value& extension, BroadcastProcessMode processMode, const Dictionary& userInfo,
        const std::shared_ptr<IPCEndpoint>& listenerEndpoint) = 0;
    /// Records plainly from now on.
    virtual void disableBroadcast() = 0;

    /// Begins a recording. `completion`, which may be none, runs when capturing has begun.
    virtual void startSessionWithHandler(std::function<void()> completion) = 0;
    /// Pauses a recording that runs.
    virtual void pauseSession() = 0;
    /// Goes on with a window of the client's. Nothing unless paused.
    virtual void resumeSessionWithContextID(std::uint32_t contextID) = 0;
    /// The sound of another process is recorded from now on.
    virtual void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) = 0;

    virtual void setRecording(bool recording) = 0;
    virtual void setPaused(bool paused) = 0;
    /// What broadcast set-up left for the start; none clears it.
    virtual void setExtensionInfo(std::optional<Dictionary> extensionInfo) = 0;
    /// The movie that an interruption left behind.
    virtual void setInterruptedMovieURL(std::optional<URL> movieURL) = 0;

    /// Finishes the recording: the completion gets the movie, or none where there is no file to hand on, or
    /// an error. A session that is not recording never calls it.
    virtual void finishSessionWithHandler(MovieHandler completion) = 0;
    /// The same, with seconds cut from the movie's start and end when both are positive.
    virtual void finishSessionWithStartClipDuration(double startClipDuration, double endClipDuration,
                                                    MovieHandler completion) = 0;
    /// Stops, throws the recording's files away and then calls `completion`.
    virtual void finishAndCleanupSessionFilesWithHandler(std::function<void()> completion) = 0;

    /// The user is being asked whether to stop: a stop ends the movie here. Resumed: the user went on.
    virtual void notifyRecordingMayBeStopped() = 0;
    virtual void notifyRecordingResumed() = 0;
};

using SessionRef = std::shared_ptr<RecordingSession>;

/// Makes the session of a bundle identifier.
using SessionFactory = std::function<SessionRef(const std::string& bundleID)>;

}  // namespace kelvo
