#pragma once

#include "base/Result.h"
#include "platform/linux/media/LavPointers.h"

#include <functional>

namespace kelvo {

/// Decodes one track of a movie, on as many threads as there are cores. Caller's thread.
class Decoder {
  public:
    using FrameHandler = std::function<OptionalError(AVFrame&)>;

    static Result<Decoder> open(const AVStream& stream);

    /// Decodes a packet (none: what is still inside) and hands over the frames that come out, whose times
    /// count in the stream's units. Fails on damaged content and with what `handler` fails with.
    OptionalError decode(const AVPacket* packet, const FrameHandler& handler);

  private:
    explicit Decoder(CodecContextPointer context);

    CodecContextPointer context_;
    FramePointer frame_;
};

}  // namespace kelvo
