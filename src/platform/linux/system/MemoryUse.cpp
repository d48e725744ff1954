#include "platform/linux/system/MemoryUse.h"

#include <malloc.h>

namespace kelvo {
namespace {

constexpr int kOwnMapping = 256 * 1024;  // bytes from which a piece of memory is mapped, and unmapped, alone
constexpr int kMostKeptAtTheEnd = 128 * 1024;
constexpr int kArenas = 2;

}  // namespace

void giveMemoryBackEarly() {
    // Set once, the bounds no longer grow with the largest pieces that were freed: frames and queues of
    // encoded samples would otherwise be kept, once for each thread that ever used them.
    ::mallopt(M_MMAP_THRESHOLD, kOwnMapping);        // NOLINT(concurrency-mt-unsafe): no other thread yet
    ::mallopt(M_TRIM_THRESHOLD, kMostKeptAtTheEnd);  // NOLINT(concurrency-mt-unsafe): no other thread yet
    ::mallopt(M_ARENA_MAX, kArenas);                 // NOLINT(concurrency-mt-unsafe): no other thread yet
}

}  // namespace kelvo
