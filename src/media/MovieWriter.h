#pragma once

#include "base/Geometry.h"
#include "base/SampleBuffer.h"
#include "base/URL.h"
#include "ipc/KVBroadcastConfiguration.h"

#include <functional>
#include <memory>
#include <optional>
#include <string>

namespace kelvo {

/// What a recording session needs of whatever writes its movie. Implemented by `KVMovieWriter`, whose header
/// says when which operation is called and where handlers run, and by fakes in tests. Thread-safe.
class MovieWriter {
  public:
    using StartHandler = std::function<void()>;
    using URLHandler = std::function<void(const std::optional<URL>& movieURL)>;

    virtual ~MovieWriter() = default;

    virtual void setBroadcastConfig(std::shared_ptr<const KVBroadcastConfiguration> configuration) = 0;
    virtual void setSystemRecording(bool isSystemRecording) = 0;
    virtual URL outputURL() const = 0;

    virtual void startWritingHandler(StartHandler handler) = 0;
    /// False when the movie can no longer be written.
    virtual bool appendVideoSampleBuffer(const SampleBufferRef& sample,
                                         const AffineTransform& windowTransform) = 0;
    virtual void appendAudio1SampleBuffer(const SampleBufferRef& sample) = 0;
    virtual void appendAudio2SampleBuffer(const SampleBufferRef& sample) = 0;
    virtual void finishWritingWithHandler(URLHandler handler) = 0;
    virtual void trimMovieWithURL(const URL& url, double startClipDuration, double endClipDuration,
                                  const URL& outputFileURL, URLHandler handler) = 0;

    /// Nothing is captured after this moment of the host's clock.
    virtual void captureEnded(const MediaTime& captureTime) = 0;
    virtual void notifyRecordingMayBeStopped() = 0;
    virtual void notifyRecordingResumed() = 0;
};

/// Makes the writer of a movie of `windowSize` at `outputPath`.
using MovieWriterFactory =
    std::function<std::shared_ptr<MovieWriter>(const Size& windowSize, const std::string& outputPath)>;

}  // namespace kelvo
