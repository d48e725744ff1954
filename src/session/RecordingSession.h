#pragma once

#include "base/KVError.h"
#include "ipc/KVClientProxyBase.h"

#include <functional>
#include <memory>
#include <optional>
#include <string>

namespace kelvo {

/// One recording, capture or broadcast of one client bundle, as its managers drive it. Implemented by
/// `KVRecordingSession` and by a fake in tests. The flags may be read from any thread; everything else
/// belongs to the recording manager's queue, and completions run wherever the session finishes its work.
class RecordingSession {
  public:
    virtual ~RecordingSession() = default;

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
    /// Pauses a recording that runs.
    virtual void pauseSession() = 0;

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
