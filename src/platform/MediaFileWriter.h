#pragma once

#include "base/KVError.h"
#include "base/MediaTime.h"
#include "platform/WriterInput.h"

#include <functional>
#include <memory>
#include <optional>

namespace kelvo {

/// The kinds of movie file that are written.
enum class MediaFileType { mpeg4 };

/// Writes one movie file from the samples given to its inputs. Implemented by the Linux media adapter and the
/// simulated device; driven by a movie writer. Thread-safe.
///
/// Order of calls: `addInput` for each track, `startWriting`, `startSession`, samples to the inputs and
/// `relateTimes`, optionally `endCapture` and `endSession`, `finishWriting`. A writer serves one file. One
/// that is destroyed before it finished leaves the file as it lies, playable up to its last fragment.
class MediaFileWriter {
  public:
    /// The numbers are the ones that logs show.
    enum class Status { unknown = 0, writing = 1, completed = 2, failed = 3, cancelled = 4 };

    virtual ~MediaFileWriter() = default;

    /// Ignored once the writer has started.
    virtual void addInput(std::shared_ptr<WriterInput> input) = 0;

    virtual Status status() const = 0;

    /// Why the writer failed; none unless it did.
    virtual OptionalError error() const = 0;

    /// Where the movie lies, or will.
    virtual std::optional<URL> outputURL() const = 0;

    /// Creates the file (nothing may stand at its path) and opens the encoders. False when that fails, which
    /// also fails the writer, and false without any effect when it was called before.
    virtual bool startWriting() = 0;

    /// The movie's timeline begins at `sourceTime`: what lies before it is not in the movie.
    virtual void startSession(const MediaTime& sourceTime) = 0;

    /// What was captured at `captureTime` of the host's clock is presented at `sourceTime`: told for each
    /// frame, in their order, whether or not it is appended. Where the two part (a pause was cut out of the
    /// frames' times), the times of sound, which are those of its capture, are moved as the frames' were:
    /// what sounded between the last frame before the change and the first one after it is not in the movie,
    /// but for what was written before the change was told; that stays, and what would lie over it is cut.
    virtual void relateTimes(const MediaTime& captureTime, const MediaTime& sourceTime) = 0;

    /// Nothing is captured after `captureTime` of the host's clock: unless frames were, the movie ends there,
    /// and its last frame is shown until then. A screen that stands still has delivered no other.
    virtual void endCapture(const MediaTime& captureTime) = 0;

    /// The movie ends at `sourceTime`, whatever `endCapture` said: what lies at or after it is not in the
    /// movie, whether it was appended already or not.
    virtual void endSession(const MediaTime& sourceTime) = 0;

    /// Takes no more samples, writes what was appended and completes the file. `completion` runs once, on a
    /// queue of the writer's own; the status is then completed or failed.
    virtual void finishWriting(std::function<void()> completion) = 0;
};

}  // namespace kelvo
