#pragma once

#include "base/Geometry.h"
#include "base/Value.h"
#include "platform/DeviceProperties.h"

#include <cstdint>

namespace kelvo {

/// The bit rate, in bits per second, of a movie of a display of `windowSize` pixels on such a device.
std::int64_t defaultVideoBitRate(DeviceIdiom idiom, const Size& windowSize);

/// The compression properties of every movie, with the given average bit rate.
Dictionary videoCompressionProperties(std::int64_t bitRate);

/// The settings of an H.264 track that shows a display of `windowSize` pixels: its whole pixels, rounded up
/// to even sides.
Dictionary videoOutputSettings(const Size& windowSize, const Dictionary& compressionProperties);

/// The settings of a movie's audio tracks: AAC, 44100 Hz, stereo, 128000 bits per second.
Dictionary audioOutputSettings();

}  // namespace kelvo
