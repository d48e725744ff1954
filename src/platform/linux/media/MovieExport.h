#pragma once

#include "base/KVError.h"
#include "platform/ExportSession.h"

#include <atomic>
#include <optional>
#include <string>

namespace kelvo {

/// What an export session tells the export that runs for it, and the other way round. Thread-safe.
struct ExportControl {
    std::atomic<bool> isCancelled{false};
    std::atomic<double> progress{0};

    void advanceTo(double part) {
        if (part > progress) progress = part < 1 ? part : 1;
    }
};

/// One export, from file to file.
struct ExportRequest {
    std::string sourcePath;
    std::string outputPath;  ///< nothing stands there yet
    std::optional<MediaTimeRange> range;
    std::optional<AudioMix> mix;
};

// Each blocks until its export is done; what it leaves at the output path on failure is for the caller to
// remove. A cancelled export returns early without an error. Thread-safe.

/// Copies the samples of a range as they are. The picture begins with the key frame at or before the range's
/// start, and an edit list hides what lies before it.
OptionalError exportPassThrough(const ExportRequest& request, ExportControl& control);

/// Encodes the picture again without visible loss, and the mix's audio tracks, added up and limited to the
/// full scale, as one track.
OptionalError exportMix(const ExportRequest& request, ExportControl& control);

/// The part of `whole` that `range` names; none when nothing of it is there.
std::optional<MediaTimeRange> clippedRange(const std::optional<MediaTimeRange>& range,
                                           const MediaTime& whole);

}  // namespace kelvo
