#pragma once

#include "base/Geometry.h"
#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "ipc/KVBroadcastConfiguration.h"
#include "media/MovieWriter.h"
#include "platform/DeviceProperties.h"
#include "platform/MediaService.h"
#include "platform/Preferences.h"
#include "support/KVTemporaryFileStore.h"

#include <atomic>
#include <functional>
#include <memory>
#include <optional>
#include <string>

namespace kelvo {

/// Turns the timed samples of one recording into one MPEG-4 movie: an H.264 track and two AAC tracks. Drops
/// samples whose times go backwards, begins the movie at the first video frame, may end it at the moment a
/// stop was first asked for, and exports trimmed copies.
///
/// Order of calls: `create`; `setBroadcastConfig`, `setSystemRecording`; `startWritingHandler`; in its
/// handler or later the appends; `notifyRecordingMayBeStopped` and `notifyRecordingResumed`;
/// `finishWritingWithHandler` once. A new recording needs a new writer.
///
///     created --start--> ready --first video sample--> writing --finish--> finishing (for good)
///                                   ^                     |
///                                   +--- next video ------+ the file's writer failed: the file is removed
///                                        sample             and begun again
///
/// Thread-safe; the work runs on `movieWriterQueue` but for what is said at each operation. No lock is held
/// while anything is called. No error is returned: a failure shows up as a finish handler without a URL, a
/// trim handler that is never called, or only in the log.
class KVMovieWriter : public MovieWriter, public std::enable_shared_from_this<KVMovieWriter> {
  public:
    /// What a movie writer needs of the world.
    struct Services {
        std::shared_ptr<MediaService> media;
        std::shared_ptr<KVTemporaryFileStore> store;
        std::shared_ptr<Preferences> preferences;
        std::shared_ptr<DeviceProperties> device;
    };

    /// `windowSize` is the size of the recorded display in pixels. Caller's thread.
    static std::shared_ptr<KVMovieWriter> create(const Size& windowSize, std::string outputPath,
                                                 Services services);

    /// Removes what stands at the output path and makes the file's writer. Returns at once; `handler`, which
    /// may be none, runs on the store's background queue, whether that succeeded or not.
    void startWritingHandler(StartHandler handler) override;

    /// Makes a new file writer and its inputs, with empty buffer queues. Synchronous on `movieWriterQueue`.
    void setupAssetWriter();

    /// Synchronous on `movieWriterQueue`. Always true, whatever becomes of the sample.
    bool appendVideoSampleBuffer(const SampleBufferRef& sample,
                                 const AffineTransform& windowTransform) override;

    /// Synchronous on `movieWriterQueue`. Dropped unless a video sample has started the movie.
    void appendAudio1SampleBuffer(const SampleBufferRef& sample) override;
    void appendAudio2SampleBuffer(const SampleBufferRef& sample) override;

    /// Completes the movie. Returns at once; `handler`, which may be none, gets the movie's URL, or none when
    /// there is no movie, on `movieWriterQueue` or on a queue of the file writer's. Only the first call
    /// counts: a later one's handler is never called.
    void finishWritingWithHandler(URLHandler handler) override;

    /// Exports the movie at `url` without the first `startClipDuration` and the last `endClipDuration`
    /// seconds (rounded to whole seconds), without encoding it again. Returns at once; `handler` gets the
    /// trimmed movie's URL on the export's queue, and is not called when the export fails.
    void trimMovieWithURL(const URL& url, double startClipDuration, double endClipDuration,
                          const URL& outputFileURL, URLHandler handler) override;

    /// The movie's last frame is to be shown until `captureTime` of the host's clock, when the capture ended;
    /// for a screen that stands still there is no other. A stop mark counts more. Caller's thread.
    void captureEnded(const MediaTime& captureTime) override { captureEnd_.set(captureTime); }
    /// The movie is to end at the last video frame appended so far. Caller's thread.
    void notifyRecordingMayBeStopped() override;
    /// Takes that back. Caller's thread.
    void notifyRecordingResumed() override;

    /// Begins the movie with this sample. False when the file cannot be written. On the queue of its caller;
    /// public only because a failed writer's restart calls it off `movieWriterQueue`.
    bool appendInitialSampleBuffer(const SampleBufferRef& sample, const AffineTransform& transform);

    SerialQueue& movieWriterQueue() { return movieWriterQueue_; }
    std::shared_ptr<MediaFileWriter> assetWriter() const { return assetWriter_.copy(); }
    std::shared_ptr<WriterInput> videoInput() const { return video_.input.copy(); }
    std::shared_ptr<WriterInput> audioInput1() const { return audio1_.input.copy(); }
    std::shared_ptr<WriterInput> audioInput2() const { return audio2_.input.copy(); }
    const std::shared_ptr<BufferQueue>& videoBufferQueue() const { return video_.bufferQueue; }
    const std::shared_ptr<BufferQueue>& audioBufferQueue1() const { return audio1_.bufferQueue; }
    const std::shared_ptr<BufferQueue>& audioBufferQueue2() const { return audio2_.bufferQueue; }
    MediaTime lastVideoPresentationTime() const { return video_.lastPresentationTime.copy(); }
    MediaTime lastAudio1PresentationTime() const { return audio1_.lastPresentationTime.copy(); }
    MediaTime lastAudio2PresentationTime() const { return audio2_.lastPresentationTime.copy(); }
    MediaTime trimVideoPresentationTime() const { return trimVideoPresentationTime_.copy(); }
    const std::string& outputPath() const { return outputPath_; }
    URL outputURL() const override { return URL::file(outputPath_); }
    const Size& windowSize() const { return windowSize_; }
    bool didProcessFirstSample() const { return didProcessFirstSample_; }
    bool isFinishingWriting() const { return isFinishingWriting_; }

    std::shared_ptr<const KVBroadcastConfiguration> broadcastConfig() const {
        return broadcastConfig_.copy();
    }
    void setBroadcastConfig(std::shared_ptr<const KVBroadcastConfiguration> configuration) override {
        broadcastConfig_.set(std::move(configuration));
    }
    bool systemRecording() const { return systemRecording_; }
    void setSystemRecording(bool isSystemRecording) override { systemRecording_ = isSystemRecording; }

  private:
    /// One track of the movie: its input, what waits for it, and the last sample that it got.
    struct Track {
        explicit Track(std::shared_ptr<BufferQueue> queue) : bufferQueue(std::move(queue)) {}

        /// Drops what waits and forgets the times.
        void reset();
        /// Whether `sample` does not lie after the last one appended, by the raw values of their times.
        bool goesBackwards(const SampleBuffer& sample) const;
        void append(WriterInput& writerInput, const SampleBufferRef& sample);

        const std::shared_ptr<BufferQueue> bufferQueue;
        Guarded<std::shared_ptr<WriterInput>> input;
        Guarded<MediaTime> lastPresentationTime;
    };

    KVMovieWriter(const Size& windowSize, std::string outputPath, Services services);

    void dispatchedStartWritingHandler(StartHandler handler);
    void dispatchedSetupAssetWriter();
    bool dispatchedAppendVideoSampleBuffer(const SampleBufferRef& sample, const AffineTransform& transform);
    void dispatchedAppendAudio1SampleBuffer(const SampleBufferRef& sample);
    void dispatchedAppendAudio2SampleBuffer(const SampleBufferRef& sample);
    void dispatchedFinishWritingWithHandler(URLHandler handler);
    void dispatchedTrimMovieWithURL(const URL& url, double startClipDuration, double endClipDuration,
                                    const URL& outputFileURL, URLHandler handler);

    Dictionary compressionProperties() const;
    std::int64_t videoBitRate() const;
    void addInput(Track& track, MediaType type, const Dictionary& settings);
    bool isTakingSamples() const;
    void drainVideo();
    void restartFailedWriter(const SampleBufferRef& sample, const AffineTransform& transform);
    void appendAudio(Track& track, int number, const SampleBufferRef& sample);
    void reportMissingMovie(const URLHandler& handler);
    void completeMovie(const std::shared_ptr<MediaFileWriter>& writer, URLHandler handler);
    void exportTrimmed(const URL& url, double startClipDuration, double endClipDuration,
                       const URL& outputFileURL, URLHandler handler);

    const Size windowSize_;
    const std::string outputPath_;
    const Services services_;
    Track video_;
    Track audio1_;
    Track audio2_;
    Guarded<std::shared_ptr<MediaFileWriter>> assetWriter_;
    Guarded<MediaTime> trimVideoPresentationTime_;
    Guarded<MediaTime> captureEnd_;
    Guarded<std::shared_ptr<const KVBroadcastConfiguration>> broadcastConfig_;
    std::atomic<bool> didProcessFirstSample_ = false;
    std::atomic<bool> isFinishingWriting_ = false;
    std::atomic<bool> systemRecording_ = false;
    SerialQueue movieWriterQueue_;  // last, so that its tasks end before anything else goes
};

}  // namespace kelvo
