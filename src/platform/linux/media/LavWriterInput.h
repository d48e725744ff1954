#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "platform/MediaFileWriter.h"
#include "platform/linux/media/MovieMuxer.h"
#include "platform/linux/media/SampleEncoder.h"

#include <atomic>
#include <memory>
#include <mutex>
#include <vector>

namespace kelvo {

/// What a writer and its inputs share. Thread-safe.
struct WriterSession {
    std::atomic<MediaFileWriter::Status> status{MediaFileWriter::Status::unknown};
    std::atomic<bool> takesSamples{false};  ///< the session has begun and does not finish yet
    std::atomic<bool> isAbandoned{false};   ///< nobody wants what is still queued
    Guarded<OptionalError> error;
    MovieTimeline timeline;
    /// Set once, before the session begins.
    std::unique_ptr<MovieMuxer> muxer;

    /// The first failure counts.
    void fail(const KVError& reason);
};

/// An input that encodes on a queue of its own. Its readiness is the bound of that queue. Frames are
/// converted by who appends them; a few buffers of sound are gathered before they are encoded.
class LavWriterInput : public WriterInput {
  public:
    LavWriterInput(MediaType type, Dictionary outputSettings);

    /// Opens the encoder for track number `track` of the session's movie.
    Result<TrackFormat> open(std::shared_ptr<WriterSession> session, std::size_t track);
    /// Encodes what is queued and what the encoder holds, and returns when that is done.
    void flush();

    MediaType mediaType() const override { return type_; }
    const Dictionary& outputSettings() const override { return outputSettings_; }
    bool expectsMediaDataInRealTime() const override { return expectsMediaDataInRealTime_; }
    void setExpectsMediaDataInRealTime(bool expects) override { expectsMediaDataInRealTime_ = expects; }
    AffineTransform transform() const override { return transform_.copy(); }
    void setTransform(const AffineTransform& transform) override { transform_.set(transform); }
    bool isReadyForMoreMediaData() const override;
    bool append(const SampleBufferRef& sample) override;

  private:
    bool isGathering(const SampleBuffer& sample) const;
    void queueGathered();
    void encode(const SampleEncoder::Work& work);
    bool isEncoding() const;

    const MediaType type_;
    const Dictionary outputSettings_;
    std::atomic<bool> expectsMediaDataInRealTime_{false};
    Guarded<AffineTransform> transform_;
    Guarded<std::shared_ptr<WriterSession>> session_;
    std::atomic<int> queued_{0};
    std::unique_ptr<SampleEncoder> encoder_;
    std::mutex appending_;
    std::vector<SampleEncoder::Work> gathered_;  ///< under appending_, as the next
    MediaTime gatheredSince_;
    bool isFlushed_ = false;  ///< on the queue
    SerialQueue queue_;       // last, so that its tasks end before anything else goes
};

}  // namespace kelvo
