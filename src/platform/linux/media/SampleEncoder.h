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

/// Turns the samples of one input into the encoded samples of one track. Queue-bound: one thread at a time.
/// Order of calls: `open`, `encode` for each sample, `flush`.
class SampleEncoder {
  public:
    using SampleHandler = std::function<void(const SampleTiming&, std::span<const std::byte>)>;

    virtual ~SampleEncoder() = default;

    /// Opens the encoder; `handler` then gets what comes out, within `encode` and `flush`.
    virtual Result<TrackFormat> open(const Dictionary& outputSettings, SampleHandler handler) = 0;

    /// Encodes a sample, whose place in the movie `timeline` tells. A sample that cannot be used is dropped,
    /// which is no failure.
    virtual OptionalError encode(const SampleBuffer& sample, const MovieTimeline& timeline) = 0;

    virtual OptionalError flush(const MovieTimeline& timeline) = 0;
};

/// The encoder for tracks of `type`.
std::unique_ptr<SampleEncoder> makeSampleEncoder(MediaType type);

}  // namespace kelvo
