#pragma once

#include "base/KVError.h"
#include "session/RecordingSession.h"

namespace kelvo {

/// What a recording session tells the recording manager. Called on the thread where it happened: the screen
/// source's, a capture thread's, or the one that drives the session. Implementations do not wait there for
/// the manager's queue, which may itself be waiting for that thread.
class KVRecordingSessionDelegate {
  public:
    virtual ~KVRecordingSessionDelegate() = default;

    /// The recording ended by itself.
    virtual void recordingSessionStoppedWithError(const SessionRef& session, const OptionalError& error) = 0;
    virtual void broadcastSessionDidUpdateServiceInfo(const SessionRef& session,
                                                      const Dictionary& serviceInfo) = 0;
    /// With every sample: seconds since the session's first frame, pauses included.
    virtual void broadcastSessionDidUpdateDuration(const SessionRef& session, double seconds) = 0;
    virtual void recordingSessionClientDidEnterBackground(const SessionRef& session) = 0;
    virtual void recordingSessionClientDidEnterForeground(const SessionRef& session) = 0;
};

}  // namespace kelvo
