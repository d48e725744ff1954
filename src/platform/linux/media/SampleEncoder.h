#pragma once

#include "base/MovieTimeline.h"
#include "base/Result.h"
#include "base/SampleBuffer.h"
#include "base/Value.h"
#include "platform/WriterInput.h"
#include "platform/linux/media/MovieTrack.h"

#include <functional>
#include <memory>
#include <span>

namespace kelvo {

/// Turns the samples of one input into the encoded samples of one track. Order of calls: `open`; for each
/// sample `take`, and the work that it returns in the same order; `flush`. One thread at a time calls `take`;
/// another may do the work meanwhile.
class SampleEncoder {
  public:
    using SampleHandler = std::function<void(const SampleTiming&, std::span<const std::byte>)>;
    /// Encodes what was taken.
    using Work = std::function<OptionalError()>;

    virtual ~SampleEncoder() = default;

    /// Opens the encoder; `handler` then gets what comes out, within the work and `flush`.
    virtual Result<TrackFormat> open(const Dictionary& outputSettings, SampleHandler handler) = 0;

    /// Takes over a sample, whose place in the movie `timeline` tells, and says what is to be done with it:
    /// no work for a sample that cannot be used, which is no failure. `timeline` outlives the work.
    virtual Work take(const SampleBufferRef& sample, const MovieTimeline& timeline) = 0;

    virtual OptionalError flush(const MovieTimeline& timeline) = 0;
};

/// The encoder for tracks of `type`.
std::unique_ptr<SampleEncoder> makeSampleEncoder(MediaType type);

}  // namespace kelvo
