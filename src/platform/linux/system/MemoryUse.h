#pragma once

namespace kelvo {

/// Makes the allocator give memory back to the system as soon as it is free, where it would keep what
/// recordings leave for the next ones: a daemon idles longer than it records. Before any other thread starts.
void giveMemoryBackEarly();

}  // namespace kelvo
