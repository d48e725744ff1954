#pragma once

#include "base/Result.h"
#include "platform/linux/media/LavPointers.h"

#include <functional>

namespace kelvo {

/// Decodes one track of a movie. Caller's thread.
class Decoder {
  public:
    using FrameHandler = std::function<OptionalError(AVFrame&)>;

    /// Decodes on that many threads.
    static Result<Decoder> open(const AVStream& stream, int threadCount);

    /// Decodes a packet (none: what is still inside) and hands over the frames that come out, whose times
    /// count in the stream's units. Fails on damaged content and with what `handler` fails with.
    OptionalError decode(const AVPacket* packet, const FrameHandler& handler);

  private:
    explicit Decoder(CodecContextPointer context);

    CodecContextPointer context_;
    FramePointer frame_;
};

}  // namespace kelvo
