#pragma once

#include "base/KVError.h"
#include "base/Value.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <functional>
#include <vector>

namespace kelvo {

/// Reads back the fragments of a movie file that this process writes. Holds one fragment's header at a time.
/// Caller's thread.
class FragmentReader {
  public:
    /// The samples of one track in one fragment. Decode times stand as in the file: they include the track's
    /// lead.
    struct Run {
        std::size_t track = 0;
        std::int64_t firstDecodeTime = 0;
        std::uint64_t dataOffset = 0;  ///< in the file
        std::vector<SampleRun::Sample> samples;
    };
    using Visit = std::function<void(const Run&)>;

    /// The fragments lie from `begin` to `end` in the file.
    FragmentReader(int descriptor, std::uint64_t begin, std::uint64_t end)
        : descriptor_(descriptor), begin_(begin), end_(end) {}

    /// Calls `visit` for every run, in the file's order. Fails when the file does not hold what was written.
    OptionalError forEachRun(const Visit& visit);

  private:
    OptionalError readFragment(std::uint64_t& position, const Visit& visit);
    bool visitTrackFragment(std::span<const std::byte> content, std::uint64_t fragmentStart,
                            const Visit& visit);

    const int descriptor_;
    const std::uint64_t begin_;
    const std::uint64_t end_;
    Bytes buffer_;
    Run run_;
};

}  // namespace kelvo
