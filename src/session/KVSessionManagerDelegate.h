#pragma once

#include "session/RecordingSession.h"

namespace kelvo {

/// What the session manager tells the recording manager, on the queue on which its own operation runs or on
/// the one where a session finishes.
class KVSessionManagerDelegate {
  public:
    virtual ~KVSessionManagerDelegate() = default;

    /// First step of every stop, whether or not the session records.
    virtual void prepareForStoppingSession(const SessionRef& session) = 0;
    /// A stopped or interrupted session's files are finished or cleaned up.
    virtual void resetStatesForSession(const SessionRef& session) = 0;
    /// An in-app session was stopped because applications share the screen.
    virtual void recordingSessionStoppedWithError(const SessionRef& session, const OptionalError& error,
                                                  const std::optional<URL>& movieURL) = 0;
    /// Finishing gave an error and no movie.
    virtual void failedToSaveRecordingForRecordingSession(const SessionRef& session,
                                                          const KVError& error) = 0;
    /// Saves a finished movie for the user; `completion` gets the failure.
    virtual void saveVideoToCameraRoll(const std::optional<URL>& movieURL, ErrorHandler completion) = 0;
};

}  // namespace kelvo
