#pragma once

#include "platform/linux/media/BoxWriter.h"
#include "platform/linux/media/MovieTrack.h"

#include <cstdint>
#include <vector>

namespace kelvo {

/// Units a second of the movie's own times, those of its edit lists.
inline constexpr std::uint32_t kMovieTimescale = 90000;

/// A movie file's beginning: its type.
void writeFileType(BoxWriter& writer);

/// How long a track lasts and which part of it is shown. Times of the movie are in `kMovieTimescale`.
struct TrackExtent {
    std::uint64_t mediaDuration = 0;  ///< in the track's timescale
    std::uint64_t presentationStart = 0;
    std::uint64_t presentationDuration = 0;
};

// The parts of which both headers of a movie are made.
void writeMovieHeader(BoxWriter& writer, std::int64_t creationTime, std::uint64_t duration,
                      std::size_t trackCount);
void writeTrackHeader(BoxWriter& writer, const TrackFormat& track, std::uint32_t identifier,
                      std::int64_t creationTime, std::uint64_t duration);
void writeMediaHeader(BoxWriter& writer, const TrackFormat& track, std::uint64_t duration);
void writeHandler(BoxWriter& writer, const TrackFormat& track);
void writeMediaInformation(BoxWriter& writer, const TrackFormat& track);
void writeSampleDescription(BoxWriter& writer, const TrackFormat& track);

/// The header of a movie whose samples follow in fragments. `creationTime` counts seconds since 1970.
void writeFragmentedHeader(BoxWriter& writer, const std::vector<TrackFormat>& tracks,
                           std::int64_t creationTime);

}  // namespace kelvo
