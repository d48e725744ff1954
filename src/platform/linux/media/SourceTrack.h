#pragma once

#include "base/Result.h"
#include "platform/linux/media/LavPointers.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>

namespace kelvo {

/// Whether a track of a source movie has sound or a picture, rather than texts or other data. Thread-safe.
bool isSoundOrPicture(const AVStream& stream);

/// What a copy of a source movie's track says about itself. Fails on anything but H.264 and AAC. Thread-safe.
Result<TrackFormat> trackFormatOf(const AVStream& stream);

/// How the picture of a source movie's track is turned. Thread-safe.
TrackFormat::Matrix matrixOf(const AVStream& stream);

/// How much of what `packet` decodes to is not shown, in samples. Thread-safe.
std::int64_t skippedSamples(const AVPacket& packet);

}  // namespace kelvo
