#include "base/KVLog.h"
#include "daemon/KVRecordingManager.h"

#include <utility>

namespace kelvo {

void KVRecordingManager::finishForTermination(std::function<void()> done) {
    WorkRef work = work_.exchange(nullptr);
    if (!work) return;
    work->onEnd = std::move(done);
    // Behind the request that is served now, so that what it starts is finished, too.
    KVConnectionManager::connectionManagerQueue().async(
        [weakSelf = weak_from_this(), work = std::move(work)] {
            if (const auto self = weakSelf.lock()) self->finishRecordings(work);
        });
}

void KVRecordingManager::finishRecordings(const WorkRef& work) {
    for (const SessionRef& session : sessionManager_->getActiveRecordingSessions())
        finishRecording(session, work);
}

/// The whole screen's movie is the user's and is saved; an application's is left to whoever asks for it.
void KVRecordingManager::finishRecording(const SessionRef& session, const WorkRef& work) {
    const bool isSaved = session->isSystemRecording() && !session->isBroadcasting();
    sessionManager_->stopRecordingSession(
        session, 0, 0,
        [weakSelf = weak_from_this(), session, work, isSaved](const auto& movieURL, const auto&) {
            const auto self = weakSelf.lock();
            if (!self) return;
            if (const ClientProxyRef client = session->clientProxy()) {
                client->recordingDidStopWithError(
                    self->errors_->kvUserErrorForCode(kRecordingErrorInterrupted),
                    isSaved ? std::nullopt : movieURL);
            }
            if (isSaved && movieURL) self->saveVideoToCameraRoll(movieURL, [work](const OptionalError&) {});
        });
}

}  // namespace kelvo
