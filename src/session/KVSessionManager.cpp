#include "session/KVSessionManager.h"

#include "base/KVLog.h"

#include <array>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kBroadcastPickerBundleID = "com.quillon.KelvoKit.KVBroadcastPicker";
constexpr std::string_view kSystemShellBundleID = "com.quillon.plinth";

bool isActive(const SessionRef& session) {
    return session && session->isRecording();
}

/// Runs `tell` with the session's client, when it has one.
template <typename Tell>
void tellClient(const SessionRef& session, Tell tell) {
    if (!session) return;
    if (const ClientProxyRef client = session->clientProxy()) tell(*client);
}

}  // namespace

KVSessionManager::KVSessionManager(SessionFactory createSession, std::shared_ptr<KVUserErrors> errors)
    : createSession_(std::move(createSession)), errors_(std::move(errors)) {}

bool KVSessionManager::clientEligibleForSystemRecordingWithBundleIdentifier(
    std::string_view bundleIdentifier) {
    return bundleIdentifier == kBroadcastPickerBundleID || bundleIdentifier == kSystemShellBundleID;
}

SessionRef KVSessionManager::recordingSessionInstanceWithBundleIdentifier(
    const std::string& bundleIdentifier) {
    KVLog("KVSessionManager:recordingSessionInstanceWithBundleIdentifier");
    if (bundleIdentifier.empty()) {
        KVLog("cannot create session without bundle identifier");
        return nullptr;
    }
    if (SessionRef known = getRecordingSessionWithBundleIdentifier(bundleIdentifier)) return known;
    KVLog("no session, creating a new one");
    const bool isSystem = clientEligibleForSystemRecordingWithBundleIdentifier(bundleIdentifier);
    SessionRef created = createSession_(isSystem ? std::string(kSystemShellBundleID) : bundleIdentifier);
    // Somebody may have been faster; everyone gets the session that was stored first.
    return registry_.with([&](Registry& registry) {
        SessionRef& place = isSystem ? registry.systemRecordingSession
                                     : registry.bundleIDToRecordingSessionLookup[bundleIdentifier];
        if (!place) place = std::move(created);
        return place;
    });
}

SessionRef KVSessionManager::getRecordingSessionWithBundleIdentifier(
    const std::string& bundleIdentifier) const {
    if (clientEligibleForSystemRecordingWithBundleIdentifier(bundleIdentifier))
        return getSystemRecordingSession();
    return registry_.with([&](const Registry& registry) {
        const auto entry = registry.bundleIDToRecordingSessionLookup.find(bundleIdentifier);
        return entry == registry.bundleIDToRecordingSessionLookup.end() ? SessionRef() : entry->second;
    });
}

SessionRef KVSessionManager::getSystemRecordingSession() const {
    return registry_.with([](const Registry& registry) { return registry.systemRecordingSession; });
}

SessionRef KVSessionManager::getCurrentRecordingSession() const {
    if (SessionRef system = getSystemRecordingSession(); isActive(system)) return system;
    const auto registry = registry_.copy();
    for (const auto& [bundleIdentifier, session] : registry.bundleIDToRecordingSessionLookup) {
        if (isActive(session)) return session;
    }
    return nullptr;
}

std::vector<SessionRef> KVSessionManager::getActiveRecordingSessions() const {
    std::vector<SessionRef> active = getActiveInAppRecordingSessions();
    if (SessionRef system = getSystemRecordingSession(); isActive(system))
        active.insert(active.begin(), system);
    return active;
}

std::vector<SessionRef> KVSessionManager::getActiveInAppRecordingSessions() const {
    std::vector<SessionRef> active;
    const auto registry = registry_.copy();
    for (const auto& [bundleIdentifier, session] : registry.bundleIDToRecordingSessionLookup) {
        if (isActive(session)) active.push_back(session);
    }
    return active;
}

void KVSessionManager::removeInAppSessionWithBundleIdentifier(const std::string& bundleIdentifier) {
    SessionRef removed;  // destroyed after the lock is free
    registry_.with([&](Registry& registry) {
        const auto entry = registry.bundleIDToRecordingSessionLookup.find(bundleIdentifier);
        if (entry == registry.bundleIDToRecordingSessionLookup.end()) return;
        removed = std::move(entry->second);
        registry.bundleIDToRecordingSessionLookup.erase(entry);
    });
}

void KVSessionManager::stopRecordingSession(const SessionRef& session, double startClipDuration,
                                            double endClipDuration, MovieHandler handler) {
    const auto owner = delegate();
    if (owner) owner->prepareForStoppingSession(session);
    if (!isActive(session)) {
        if (handler) handler(std::nullopt, std::nullopt);
        return;
    }
    if (!handler && !session->isBroadcasting()) {
        discardRecording(session);
        return;
    }
    session->finishSessionWithStartClipDuration(
        startClipDuration, endClipDuration,
        [session, weakOwner = std::weak_ptr(owner), handler = std::move(handler)](const auto& movieURL,
                                                                                  const auto& error) {
            if (handler) handler(movieURL, error);
            tellClient(session, [](auto& client) { client.updateScreenRecordingState(); });
            const auto stillOwner = weakOwner.lock();
            if (!stillOwner) return;
            if (!movieURL && error) stillOwner->failedToSaveRecordingForRecordingSession(session, *error);
            reset(*stillOwner, session);
        });
}

/// A handler may have started the session's next recording, which would go on unseen and unstoppable if it
/// were reset.
void KVSessionManager::reset(KVSessionManagerDelegate& owner, const SessionRef& session) {
    if (!session->isRecording()) owner.resetStatesForSession(session);
}

void KVSessionManager::discardRecording(const SessionRef& session) {
    KVLog("recording stopped without handler!");
    session->finishAndCleanupSessionFilesWithHandler([session, weakOwner = std::weak_ptr(delegate())] {
        tellClient(session, [](auto& client) { client.updateScreenRecordingState(); });
        if (const auto owner = weakOwner.lock()) reset(*owner, session);
    });
}

void KVSessionManager::saveVideo(const std::optional<URL>& movieURL) {
    const auto owner = delegate();
    if (!owner) return;
    owner->saveVideoToCameraRoll(movieURL, [](const OptionalError& error) {
        KVLog("error saving file with code: %i", error ? static_cast<int>(error->code()) : 0);
    });
}

void KVSessionManager::stopSystemRecordingWithError(const OptionalError& error) {
    const SessionRef session = getSystemRecordingSession();
    if (!isActive(session)) return;
    const bool wasBroadcasting = session->isBroadcasting();
    stopRecordingSession(
        session, 0, 0, [this, session, wasBroadcasting, error](const auto& movieURL, const auto&) {
            if (!wasBroadcasting) saveVideo(movieURL);
            tellClient(session, [&](auto& client) { client.recordingDidStopWithError(error, std::nullopt); });
        });
}

void KVSessionManager::stopCurrentRecordingSessionWithHandler(MovieHandler handler) {
    for (const SessionRef& session : getActiveInAppRecordingSessions()) {
        session->finishAndCleanupSessionFilesWithHandler([session, errors = errors_] {
            const KVError interrupted = errors->kvUserErrorForCode(kRecordingErrorInterrupted);
            tellClient(session,
                       [&](auto& client) { client.recordingDidStopWithError(interrupted, std::nullopt); });
        });
    }
    const SessionRef system = getSystemRecordingSession();
    if (!isActive(system)) {
        if (handler) handler(std::nullopt, std::nullopt);
        return;
    }
    stopRecordingSession(system, 0, 0,
                         [handler = std::move(handler)](const auto& movieURL, const auto& error) {
                             if (handler) handler(movieURL, error);
                         });
}

void KVSessionManager::stopInAppRecordingSessionsBecauseOfMultitasking() {
    for (const SessionRef& session : getActiveInAppRecordingSessions()) {
        session->finishSessionWithHandler([this, session](const auto& movieURL, const auto&) {
            const KVError resized = errors_->kvUserErrorForCode(kRecordingErrorContentResize);
            if (const auto owner = delegate())
                owner->recordingSessionStoppedWithError(session, resized, movieURL);
        });
    }
}

void KVSessionManager::interruptOtherRecordingSessionAgainstSession(const SessionRef& session) {
    // The text names the recording manager although the work is done here; readers of logs know it so.
    KVLog("KVRecordingManager:interruptRecordingSessions");
    std::vector<SessionRef> others = getActiveRecordingSessions();
    std::erase(others, session);
    for (const SessionRef& other : others) {
        other->finishSessionWithHandler([this, other](const auto& movieURL, const auto& error) {
            KVLog("interrupted session");
            tellClient(other, [&](auto& client) { client.recordingDidStopWithError(error, movieURL); });
            other->setInterruptedMovieURL(movieURL);
            if (const auto owner = delegate()) reset(*owner, other);
        });
    }
}

void KVSessionManager::profileConnectionDidReceiveEffectiveSettingsChangedNotification() {
    for (const SessionRef& session : getActiveRecordingSessions()) {
        stopRecordingSession(session, 0, 0, [this, session](const auto& movieURL, const auto&) {
            if (session->isSystemRecording()) saveVideo(movieURL);
            const KVError dormant = errors_->kvUserErrorForCode(kRecordingErrorSystemDormancy, Dictionary());
            tellClient(session, [&](auto& client) { client.recordingLockInterrupted(dormant); });
        });
    }
}

void KVSessionManager::applicationDisconnectedWithBundleID(const std::string& bundleIdentifier,
                                                           std::int32_t processIdentifier) {
    KVLog("KVRecordingManager: applicationDisconnected");
    const SessionRef session = getRecordingSessionWithBundleIdentifier(bundleIdentifier);
    const SessionRef system = getSystemRecordingSession();
    if (!session || session != system) stopRecordingSession(session, 0, 0, nullptr);
    if (clientEligibleForSystemRecordingWithBundleIdentifier(bundleIdentifier)) {
        tellClient(system,
                   [&](auto& client) { client.resetConnectionWithProcessIdentifier(processIdentifier); });
    } else {
        removeInAppSessionWithBundleIdentifier(bundleIdentifier);
    }
}

void KVSessionManager::notifySystemRecordingMayBeStopped() {
    if (const SessionRef system = getSystemRecordingSession(); isActive(system))
        system->notifyRecordingMayBeStopped();
}

void KVSessionManager::notifySystemRecordingResumed() {
    if (const SessionRef system = getSystemRecordingSession(); isActive(system))
        system->notifyRecordingResumed();
}

}  // namespace kelvo
