#pragma once

#include "base/Guarded.h"
#include "ipc/KVUserErrors.h"
#include "session/KVSessionManagerDelegate.h"
#include "session/RecordingSession.h"

#include <cstdint>
#include <map>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// The registry of sessions: one for each client bundle, and apart from them the one system session, which
/// records the whole screen for the system shell and the broadcast picker.
///
/// The registry may be read from any thread; operations that change sessions belong to the recording
/// manager's queue. Nothing is called while the registry's lock is held. In-app sessions are visited in the
/// order of their identifiers. A session counts as active exactly while it is recording.
class KVSessionManager {
  public:
    KVSessionManager(SessionFactory createSession, std::shared_ptr<KVUserErrors> errors);

    std::shared_ptr<KVSessionManagerDelegate> delegate() const { return delegate_.copy().lock(); }
    /// Held weakly: the delegate is the recording manager, which owns this object.
    void setDelegate(std::weak_ptr<KVSessionManagerDelegate> delegate) { delegate_.set(std::move(delegate)); }

    /// The session of the bundle, created when there is none; the system session for the two bundles that may
    /// record the whole screen. None for an empty identifier.
    SessionRef recordingSessionInstanceWithBundleIdentifier(const std::string& bundleIdentifier);

    /// The same without ever creating one.
    SessionRef getRecordingSessionWithBundleIdentifier(const std::string& bundleIdentifier) const;

    SessionRef getSystemRecordingSession() const;
    /// The system session when it is recording, else the first in-app session that is, else none.
    SessionRef getCurrentRecordingSession() const;
    /// The system session first, then the in-app ones; each stands once.
    std::vector<SessionRef> getActiveRecordingSessions() const;
    std::vector<SessionRef> getActiveInAppRecordingSessions() const;

    static bool clientEligibleForSystemRecordingWithBundleIdentifier(std::string_view bundleIdentifier);
    void removeInAppSessionWithBundleIdentifier(const std::string& bundleIdentifier);

    /// The one stop path. Durations are seconds to cut from the movie's ends. Without a handler a plain
    /// recording is thrown away and a broadcast is finished; a session that is not recording answers (none,
    /// none).
    void stopRecordingSession(const SessionRef& session, double startClipDuration, double endClipDuration,
                              MovieHandler handler);

    /// Stops the system session, saves its movie unless it was broadcasting, and tells its client `error`.
    void stopSystemRecordingWithError(const OptionalError& error);

    /// Discards every in-app recording and stops the system one, whose outcome `handler` (may be none) gets.
    /// With no system recording it gets (none, none) at once, without waiting for the discards.
    void stopCurrentRecordingSessionWithHandler(MovieHandler handler);

    /// Finishes every in-app recording because applications share the screen.
    void stopInAppRecordingSessionsBecauseOfMultitasking();

    /// Finishes every recording but that of `session`, which is about to start.
    void interruptOtherRecordingSessionAgainstSession(const SessionRef& session);

    /// Recording was forbidden: stops everything.
    void profileConnectionDidReceiveEffectiveSettingsChangedNotification();

    /// A client went away: its in-app session ends; the system session goes on without that client.
    void applicationDisconnectedWithBundleID(const std::string& bundleIdentifier,
                                             std::int32_t processIdentifier);

    void notifySystemRecordingMayBeStopped();
    void notifySystemRecordingResumed();

  private:
    struct Registry {
        SessionRef systemRecordingSession;
        std::map<std::string, SessionRef> bundleIDToRecordingSessionLookup;
    };

    static void reset(KVSessionManagerDelegate& owner, const SessionRef& session);
    void discardRecording(const SessionRef& session);
    void saveVideo(const std::optional<URL>& movieURL);

    const SessionFactory createSession_;
    const std::shared_ptr<KVUserErrors> errors_;
    Guarded<std::weak_ptr<KVSessionManagerDelegate>> delegate_;
    Guarded<Registry> registry_;
};

}  // namespace kelvo
