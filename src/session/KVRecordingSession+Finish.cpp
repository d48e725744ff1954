#include "base/KVLog.h"
#include "session/KVRecordingSession.h"

#include <utility>

namespace kelvo {

void KVRecordingSession::finishSessionWithHandler(MovieHandler completion) {
    finishSessionWithStartClipDuration(0, 0, std::move(completion));
}

void KVRecordingSession::finishSessionWithStartClipDuration(double startClipDuration, double endClipDuration,
                                                            MovieHandler completion) {
    if (!recording_) return;
    KVLog("KVRecordingSession: finishSessionWithHandler");
    stopRecordingWithNotification(false, std::nullopt);
    timeline_.with([](Timeline& timeline) {
        timeline.lastSampleTimestamp = MediaTime::invalid();
        timeline.sampleTimeOffset = MediaTime::zero();
    });
    if (!completion) completion = [](const auto&, const auto&) {};
    switch (broadcastProcessMode()) {
        case BroadcastProcessMode::sampleBuffers:
            finishBroadcast(std::move(completion));
            break;
        case BroadcastProcessMode::movieClips:
            finishMovie(startClipDuration, endClipDuration, std::move(completion));
            break;
    }
}

void KVRecordingSession::finishBroadcast(MovieHandler completion) {
    notifyExtensionOfAction(ExtensionAction::finish,
                            [weak = weak_from_this(), completion = std::move(completion)] {
                                completion(std::nullopt, std::nullopt);
                                const auto self = weak.lock();
                                if (!self) return;
                                if (const auto link = self->broadcastExtension())
                                    link->invalidateConnection();
                            });
}

void KVRecordingSession::finishMovie(double startClipDuration, double endClipDuration,
                                     MovieHandler completion) {
    const auto deliver = [weak = weak_from_this(), startClipDuration, endClipDuration,
                          completion = std::move(completion)](const std::optional<URL>& movieURL) {
        KVLog("KVRecordingSession: finishWritingWithHandler");
        if (const auto self = weak.lock()) {
            self->deliverMovie(movieURL, startClipDuration, endClipDuration, completion);
        } else {
            completion(movieURL, std::nullopt);  // the movie is there, whoever recorded it
        }
    };
    if (const auto writer = movieWriter()) {
        writer->finishWritingWithHandler(deliver);
    } else {
        deliver(std::nullopt);  // stopped before it was started: there is no movie
    }
}

void KVRecordingSession::deliverMovie(const std::optional<URL>& movieURL, double startClipDuration,
                                      double endClipDuration, const MovieHandler& completion) {
    if (const auto link = broadcastExtension()) {
        link->notifyBroadcastExtensionOfCompletedMovieWithURL(movieURL, true);
        completion(std::nullopt, std::nullopt);
        return;
    }
    if (!movieURL) {
        completion(std::nullopt, isCapturing()
                                     ? OptionalError()
                                     : services_.errors->kvUserErrorForCode(kRecordingErrorFailedToSave));
        return;
    }
    if (!(startClipDuration > 0 && endClipDuration > 0)) {
        completion(movieURL, std::nullopt);
        return;
    }
    KVLog("trimming");
    movieWriter()->trimMovieWithURL(*movieURL, startClipDuration, endClipDuration, trimmedOutputURL(),
                                    [completion](const std::optional<URL>& trimmedURL) {
                                        KVLog("finished trimming");
                                        completion(trimmedURL, std::nullopt);
                                    });
}

void KVRecordingSession::finishAndCleanupSessionFilesWithHandler(CompletionHandler completion) {
    KVLog("KVRecordingSession: cleanupSessionFiles");
    stopRecordingWithNotification(false, std::nullopt);
    services_.cleanUps->begin();
    services_.store->_srRemoveFile(
        outputURL(),
        [cleanUps = services_.cleanUps, completion = std::move(completion)](const OptionalError& error) {
            if (error) KVLog("error removing file with code: %i", static_cast<int>(error->code()));
            if (completion) completion();
            cleanUps->end();
        });
}

}  // namespace kelvo
