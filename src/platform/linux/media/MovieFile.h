#pragma once

#include "base/MediaTime.h"
#include "base/Result.h"
#include "base/UniqueFd.h"
#include "platform/linux/media/FileWriting.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <memory>
#include <span>
#include <string>
#include <vector>

namespace kelvo {

/// A movie file while it is written: a header and fragments, and in the end an ordinary indexed movie in the
/// same place. Whoever opens the file at any moment, even after this process was killed between two writes,
/// finds a movie that plays up to its last complete fragment. docs/life-of-a-movie-file.md draws the steps.
/// Caller's thread.
class MovieFile {
  public:
    /// Whether what is written must outlast a failure of the power too, as far as the disk allows: a
    /// recording cannot be had again, an export can.
    enum class Durability { synced, cached };

    /// Makes the file at `path`, where nothing stands yet, and writes its header.
    static Result<std::unique_ptr<MovieFile>> create(const std::string& path, std::vector<TrackFormat> tracks,
                                                     Durability durability);

    /// Adds one fragment: a run for each track, some of them empty. On failure the file ends with the
    /// fragment before, as far as that can be had.
    OptionalError appendFragment(std::span<const SampleRun> runs);

    /// Turns the file into an indexed movie that ends at `end` (counted from its beginning; invalid is the
    /// end of its last sample). On failure the file stays as it was, playable.
    OptionalError finish(const MediaTime& end);

  private:
    MovieFile(UniqueFd file, std::vector<TrackFormat> tracks, Durability durability);

    OptionalError writeHeader();
    OptionalError sync() const;
    OptionalError commit(std::span<const std::byte> head, Pieces rest);
    OptionalError appendIndex(const MediaTime& end);
    OptionalError turnIntoIndexedMovie();

    const UniqueFd file_;
    const std::vector<TrackFormat> tracks_;
    const Durability durability_;
    const std::int64_t creationTime_;  ///< seconds since 1970
    std::uint64_t headerEnd_ = 0;
    std::uint64_t end_ = 0;  ///< of what is complete
    std::uint32_t sequenceNumber_ = 0;
};

}  // namespace kelvo
