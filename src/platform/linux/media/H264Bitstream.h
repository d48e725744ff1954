#pragma once

#include "base/Value.h"

#include <span>

namespace kelvo {

// H.264 comes out of encoders as units with start codes in front; movie files hold units with their sizes in
// front. All thread-safe.

/// The decoder configuration record that holds the parameter sets among `units`; empty when one is missing.
Bytes avcConfiguration(std::span<const std::byte> units);

/// Appends `units` to `output` with sizes of four bytes in front. Bytes before the first start code are
/// dropped.
void appendWithSizes(std::span<const std::byte> units, Bytes& output);

}  // namespace kelvo
