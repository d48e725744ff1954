#include "base/KVLog.h"
#include "media/KVMovieWriter.h"

namespace kelvo {

bool KVMovieWriter::Track::goesBackwards(const SampleBuffer& sample) const {
    const MediaTime last = lastPresentationTime.copy();
    return last.isValid() && sample.presentationTime().value <= last.value;
}

void KVMovieWriter::Track::append(WriterInput& writerInput, const SampleBufferRef& sample) {
    lastPresentationTime.set(sample->presentationTime());
    writerInput.append(sample);
}

bool KVMovieWriter::appendInitialSampleBuffer(const SampleBufferRef& sample,
                                              const AffineTransform& transform) {
    const std::shared_ptr<WriterInput> input = videoInput();
    if (input) input->setTransform(transform);
    const std::shared_ptr<MediaFileWriter> writer = assetWriter();
    if (!writer || !writer->startWriting() || writer->status() != MediaFileWriter::Status::writing) {
        KVLog("ERROR starting asset writer");
        return false;
    }
    const MediaTime time = sample->presentationTime();
    if (!time.isValid()) return true;
    writer->startSession(time);
    writer->relateTimes(sample->captureTime(), time);
    if (input && input->isReadyForMoreMediaData()) {
        input->append(sample);
        didProcessFirstSample_ = true;
    }
    return true;
}

/// Whether the movie's timeline has begun and its file is being written.
bool KVMovieWriter::isTakingSamples() const {
    const std::shared_ptr<MediaFileWriter> writer = assetWriter();
    return writer && writer->status() == MediaFileWriter::Status::writing && didProcessFirstSample_;
}

bool KVMovieWriter::appendVideoSampleBuffer(const SampleBufferRef& sample,
                                            const AffineTransform& windowTransform) {
    bool result = true;
    movieWriterQueue_.sync([&] { result = dispatchedAppendVideoSampleBuffer(sample, windowTransform); });
    return result;
}

bool KVMovieWriter::dispatchedAppendVideoSampleBuffer(const SampleBufferRef& sample,
                                                      const AffineTransform& transform) {
    const std::shared_ptr<MediaFileWriter> writer = assetWriter();
    if (!sample || !writer || isFinishingWriting_) return true;
    if (isTakingSamples()) {
        // Told here, as a frame that is discarded may be the only one for long that knows of a pause.
        writer->relateTimes(sample->captureTime(), sample->presentationTime());
        if (video_.bufferQueue->enqueue(sample) != 0) {
            KVLog("ERROR Enqueing the Sample Video Buffer");
        } else {
            drainVideo();
        }
    } else if (writer->status() == MediaFileWriter::Status::failed) {
        restartFailedWriter(sample, transform);
    } else {
        appendInitialSampleBuffer(sample, transform);
    }
    return true;
}

void KVMovieWriter::drainVideo() {
    const std::shared_ptr<WriterInput> input = videoInput();
    while (input && input->isReadyForMoreMediaData()) {
        const SampleBufferRef sample = video_.bufferQueue->dequeue();
        if (!sample) return;
        if (video_.goesBackwards(*sample)) {
            KVLog("discarding video sample buffer due to timestamp earlier than previous");
            return;
        }
        KVLogSample("appending video sample");
        video_.append(*input, sample);
    }
}

/// The failed movie is thrown away, and a new one begins with this frame.
void KVMovieWriter::restartFailedWriter(const SampleBufferRef& sample, const AffineTransform& transform) {
    services_.store->_srRemoveFile(outputURL(),
                                   [self = shared_from_this(), sample, transform](const OptionalError&) {
                                       self->setupAssetWriter();
                                       self->appendInitialSampleBuffer(sample, transform);
                                   });
}

void KVMovieWriter::appendAudio1SampleBuffer(const SampleBufferRef& sample) {
    movieWriterQueue_.sync([&] { dispatchedAppendAudio1SampleBuffer(sample); });
}

void KVMovieWriter::appendAudio2SampleBuffer(const SampleBufferRef& sample) {
    movieWriterQueue_.sync([&] { dispatchedAppendAudio2SampleBuffer(sample); });
}

void KVMovieWriter::dispatchedAppendAudio1SampleBuffer(const SampleBufferRef& sample) {
    appendAudio(audio1_, 1, sample);
}

void KVMovieWriter::dispatchedAppendAudio2SampleBuffer(const SampleBufferRef& sample) {
    appendAudio(audio2_, 2, sample);
}

void KVMovieWriter::appendAudio(Track& track, int number, const SampleBufferRef& sample) {
    if (!sample || isFinishingWriting_ || !isTakingSamples()) return;
    if (track.bufferQueue->enqueue(sample) != 0) {
        KVLog("ERROR Enqueing the Sample Audio Buffer");
        return;
    }
    const std::shared_ptr<WriterInput> input = track.input.copy();
    while (input && input->isReadyForMoreMediaData()) {
        const SampleBufferRef next = track.bufferQueue->dequeue();
        if (!next) return;
        if (track.goesBackwards(*next)) {
            KVLog("discarding audio %d sample buffer due to timestamp earlier than previous", number);
            return;
        }
        KVLogSample("appending audio %d sample with timestamp:%lld duration:%lld", number,
                    static_cast<long long>(next->presentationTime().value),
                    static_cast<long long>(next->duration().value));
        track.append(*input, next);
    }
}

}  // namespace kelvo
