#include "base/KVLog.h"
#include "media/KVMovieWriter.h"

namespace kelvo {
namespace {

int codeOf(const OptionalError& error) {
    return error ? static_cast<int>(error->code()) : 0;
}

}  // namespace

void KVMovieWriter::notifyRecordingMayBeStopped() {
    trimVideoPresentationTime_.set(lastVideoPresentationTime());
}

void KVMovieWriter::notifyRecordingResumed() {
    trimVideoPresentationTime_.set(MediaTime::invalid());
}

void KVMovieWriter::finishWritingWithHandler(URLHandler handler) {
    movieWriterQueue_.async([self = shared_from_this(), handler = std::move(handler)] {
        self->dispatchedFinishWritingWithHandler(handler);
    });
}

void KVMovieWriter::dispatchedFinishWritingWithHandler(URLHandler handler) {
    if (isFinishingWriting_.exchange(true)) return;
    for (const Track* track : {&video_, &audio1_, &audio2_})
        track->bufferQueue->reset();
    const std::shared_ptr<MediaFileWriter> writer = assetWriter();
    const auto status = writer ? writer->status() : MediaFileWriter::Status::unknown;
    KVLog("KVMovieWriter: finishWritingWithHandler: status = %i", static_cast<int>(status));
    if (!didProcessFirstSample_) {
        KVLog("KVMovieWriter: finishWritingWithHandler: first sample buffer was not processed or appended");
        if (handler) handler(std::nullopt);
    } else if (status != MediaFileWriter::Status::writing) {
        reportMissingMovie(handler);
        didProcessFirstSample_ = false;
    } else {
        completeMovie(writer, std::move(handler));
    }
}

void KVMovieWriter::reportMissingMovie(const URLHandler& handler) {
    const std::shared_ptr<MediaFileWriter> writer = assetWriter();
    if (writer) {
        KVLog("not writing, returning video url set on assetwriter (most likely nil)");
        KVLogError("asset writer error = %i", codeOf(writer->error()));
    }
    if (handler) handler(writer ? writer->outputURL() : std::nullopt);
}

void KVMovieWriter::completeMovie(const std::shared_ptr<MediaFileWriter>& writer, URLHandler handler) {
    const MediaTime end = trimVideoPresentationTime_.exchange(MediaTime::invalid());
    if (end.isValid()) writer->endSession(end);
    if (const MediaTime captureEnd = captureEnd_.copy(); captureEnd.isValid()) writer->endCapture(captureEnd);
    writer->finishWriting([self = shared_from_this(), writer, handler = std::move(handler)] {
        if (handler) handler(writer->outputURL());
        self->didProcessFirstSample_ = false;
    });
}

void KVMovieWriter::trimMovieWithURL(const URL& url, double startClipDuration, double endClipDuration,
                                     const URL& outputFileURL, URLHandler handler) {
    movieWriterQueue_.async([=, self = shared_from_this(), handler = std::move(handler)] {
        self->dispatchedTrimMovieWithURL(url, startClipDuration, endClipDuration, outputFileURL, handler);
    });
}

void KVMovieWriter::dispatchedTrimMovieWithURL(const URL& url, double startClipDuration,
                                               double endClipDuration, const URL& outputFileURL,
                                               URLHandler handler) {
    services_.store->_srRemoveFile(
        outputFileURL, [=, self = shared_from_this(), handler = std::move(handler)](const OptionalError&) {
            self->exportTrimmed(url, startClipDuration, endClipDuration, outputFileURL, handler);
        });
}

void KVMovieWriter::exportTrimmed(const URL& url, double startClipDuration, double endClipDuration,
                                  const URL& outputFileURL, URLHandler handler) {
    const std::shared_ptr<Asset> asset = services_.media->openAsset(url);
    const auto session = services_.media->createExportSession(asset, ExportPreset::passThrough);
    session->setOutputURL(outputFileURL);
    session->setOutputFileType(MediaFileType::mpeg4);
    const MediaTime start = MediaTime::fromSeconds(startClipDuration, 1);
    const MediaTime whole = asset ? asset->duration() : MediaTime::zero();
    session->setTimeRange({start, whole - MediaTime::fromSeconds(endClipDuration, 1) - start});
    session->exportAsynchronously([session, handler = std::move(handler)] {
        switch (session->status()) {
            case ExportSession::Status::failed:
                KVLog("KVMovieWriter: Export Trim Video Failed, due to error: %i", codeOf(session->error()));
                break;
            case ExportSession::Status::cancelled:
                KVLog("KVMovieWriter: Export Trim Video Cancelled");
                break;
            default:
                KVLog("KVMovieWriter: Export Trim succeeded");
                if (handler) handler(session->outputURL());
        }
    });
}

}  // namespace kelvo
