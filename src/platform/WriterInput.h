#pragma once

#include "base/Geometry.h"
#include "base/SampleBuffer.h"
#include "base/Value.h"

namespace kelvo {

enum class MediaType { video, audio };

/// One track of a movie that is being written: takes uncompressed samples and encodes them. Implemented by
/// the Linux media adapter and the simulated device; fed by a movie writer. Thread-safe.
///
/// Order of calls: made by `MediaService::createWriterInput`, configured, added to a `MediaFileWriter` that
/// has not started; then samples, from the start of the writer's session until it finishes.
class WriterInput {
  public:
    virtual ~WriterInput() = default;

    virtual MediaType mediaType() const = 0;

    /// What it was made with; see MediaSettings.h.
    virtual const Dictionary& outputSettings() const = 0;

    /// Whether samples arrive at the pace at which they are captured. Then an input that falls behind says so
    /// through its readiness instead of holding samples.
    virtual bool expectsMediaDataInRealTime() const = 0;
    virtual void setExpectsMediaDataInRealTime(bool expects) = 0;

    /// How players are to turn the picture. Counts until the writer starts.
    virtual AffineTransform transform() const = 0;
    virtual void setTransform(const AffineTransform& transform) = 0;

    /// Whether another sample is welcome now. Only ever turns false because of an append, and true again by
    /// itself; false until the writer has started and once it finishes or fails.
    virtual bool isReadyForMoreMediaData() const = 0;

    /// Takes one sample and returns without waiting for its encoding. An input that is not ready takes it
    /// nevertheless. False, and the sample is dropped, when the writer's session has not begun or no longer
    /// takes samples, or when the sample is not of this input's media type.
    virtual bool append(const SampleBufferRef& sample) = 0;
};

}  // namespace kelvo
