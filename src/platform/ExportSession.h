#pragma once

#include "base/KVError.h"
#include "base/MediaTime.h"
#include "platform/MediaFileWriter.h"

#include <cstdint>
#include <functional>
#include <optional>
#include <vector>

namespace kelvo {

/// What an export does with a movie's samples.
enum class ExportPreset {
    passThrough,     ///< copies them as they are
    highestQuality,  ///< encodes the picture without visible loss and mixes the sound into one track
};

/// A part of a timeline. Sums of a negative or zero duration are representable; an export refuses them.
struct MediaTimeRange {
    MediaTime start;
    MediaTime duration;

    friend bool operator==(const MediaTimeRange&, const MediaTimeRange&) = default;
};

/// How one audio track takes part in a mix: at unity volume.
struct AudioMixInputParameters {
    std::uint32_t trackIdentifier = 0;

    friend bool operator==(const AudioMixInputParameters&, const AudioMixInputParameters&) = default;
};

/// The audio tracks that take part in a mix; those that it does not name are left out.
struct AudioMix {
    std::vector<AudioMixInputParameters> inputParameters;

    friend bool operator==(const AudioMix&, const AudioMix&) = default;
};

/// Makes a new movie file from an asset. Implemented by the Linux media adapter and the simulated device.
/// Configured by its maker on one thread, then exported once; status, error, progress and cancelling are
/// thread-safe.
class ExportSession {
  public:
    enum class Status { unknown = 0, waiting = 1, exporting = 2, completed = 3, failed = 4, cancelled = 5 };

    virtual ~ExportSession() = default;

    /// A file URL at which nothing stands yet.
    virtual void setOutputURL(const URL& url) = 0;
    virtual void setOutputFileType(MediaFileType type) = 0;
    /// The part to export; the whole asset when it is not set. It is cut to what the asset has; one without
    /// any content fails the export.
    virtual void setTimeRange(const MediaTimeRange& range) = 0;
    /// Every audio track takes part when it is not set. Has no effect on a pass-through.
    virtual void setAudioMix(const AudioMix& mix) = 0;

    /// Returns at once. `completion` runs once, on a queue of the session's own, when the status is
    /// completed, failed or cancelled; but for the first, nothing is left at the output URL of what the
    /// export wrote there.
    virtual void exportAsynchronously(std::function<void()> completion) = 0;

    /// Ends the export soon. No effect once it has ended.
    virtual void cancelExport() = 0;

    virtual Status status() const = 0;
    /// Why the export failed; none unless it did.
    virtual OptionalError error() const = 0;
    virtual std::optional<URL> outputURL() const = 0;
    /// How much is done: 0 to 1, never falling.
    virtual double progress() const = 0;
};

}  // namespace kelvo
