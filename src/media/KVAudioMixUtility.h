#pragma once

#include "base/Clock.h"
#include "base/KVError.h"
#include "ipc/KVUserErrors.h"
#include "platform/MediaService.h"
#include "support/KVTemporaryFileStore.h"

#include <memory>
#include <optional>

namespace kelvo {

/// Makes one new movie file from a finished movie, with all of its audio tracks mixed into one. Holds no
/// state; thread-safe.
class KVAudioMixUtility {
  public:
    KVAudioMixUtility(std::shared_ptr<MediaService> media, std::shared_ptr<Clock> clock,
                      std::shared_ptr<KVUserErrors> errors)
        : media_(std::move(media)), clock_(std::move(clock)), errors_(std::move(errors)) {}

    /// Returns at once. `completion` gets the mixed movie's URL, or an error: -5818 without `movieURL` (on
    /// the caller's thread), -5812 when the export fails or is cancelled (on the export's queue, as is
    /// success). The movie at `movieURL` stays; the caller owns both files.
    void mixAudioForMovie(const std::optional<URL>& movieURL, MovieHandler completion) const;

    /// A new file's URL in the temporary-file store, named after the current second: two calls within one
    /// second give the same URL.
    URL tempFileURL() const;

  private:
    std::shared_ptr<MediaService> media_;
    std::shared_ptr<Clock> clock_;
    std::shared_ptr<KVUserErrors> errors_;
};

}  // namespace kelvo
