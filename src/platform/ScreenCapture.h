#pragma once

#include "base/Geometry.h"
#include "base/SampleBuffer.h"
#include "base/ScreenTransform.h"

#include <cstdint>
#include <memory>
#include <set>

namespace kelvo {

class ScreenCaptureSource;

/// Why a screen source gave up.
enum class ScreenCaptureStatus : std::int32_t {
    unreachable = 1,  ///< the display could not be reached or lacks what capturing needs
    lost = 2,         ///< the display went away
    exhausted = 3,    ///< memory or descriptors ran out
};

/// Receives a screen source's frames and its end. Called on the source's own thread, one call at a time; a
/// call that takes long delays the frames after it. A call may stop the source.
class ScreenCaptureDelegate {
  public:
    virtual ~ScreenCaptureDelegate() = default;

    /// A frame: a video sample whose presentation time, at timescale 1000000000 on the host's monotonic
    /// clock, is when the picture came to look like this. Times only increase. The surface goes back to the
    /// source when its last reference goes.
    virtual void screenCaptureControllerDidReceiveSampleBuffer(ScreenCaptureSource& source,
                                                               const SampleBufferRef& sample,
                                                               const ScreenTransform& transformFlags) = 0;
    /// The last call after a start: no frame follows.
    virtual void screenCaptureControllerDidFailWithStatus(ScreenCaptureSource& source,
                                                          ScreenCaptureStatus status) = 0;
    /// Somebody more important took the screen. Frames may follow.
    virtual void screenCaptureControllerWasPreempted(ScreenCaptureSource& source) = 0;
    /// The service behind the source started anew. Frames may follow.
    virtual void screenCaptureControllerMediaServicesWereReset(ScreenCaptureSource& source) = 0;
};

/// One consumer's view of the screen: whatever the mirroring control shows. Operations belong to the owner's
/// queue, or to the delegate's calls.
///
/// Between start and stop it delivers a first frame at once and then one whenever the picture has changed:
/// at the latest one minimum interval after the change, and over any time never more frames than one an
/// interval, plus two. What stands on the screen when it stops changing is always delivered. Nothing is
/// delivered while nothing changes. Frames come from a bounded pool of sealed surfaces; while all of them
/// are held, frames are skipped and counted, and the newest picture follows once a surface comes back.
class ScreenCaptureSource {
  public:
    virtual ~ScreenCaptureSource() = default;

    /// Held weakly; none receives nothing.
    virtual void setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) = 0;

    /// Failure shows as `didFailWithStatus`. Nothing happens when it already runs.
    virtual void startCapture() = 0;

    /// Once it returns, the delegate is not called any more; when called from a delegate's call, that call
    /// is the last. It can be started again.
    virtual void stopCapture() = 0;

    /// How many frames were skipped since the source was made, because every surface was in use. Any thread.
    virtual std::uint64_t skippedFrameCount() const = 0;
};

/// Makes screen sources. Implemented by the X11 adapter and the simulated device. Any thread.
class ScreenCaptureService {
  public:
    virtual ~ScreenCaptureService() = default;

    /// A source of frames of at most `size` pixels. Larger pictures are scaled down to fit, smaller ones are
    /// not enlarged; a whole screen that lies across (landscape for a portrait `size`) is fitted into the
    /// size turned likewise. `minimumFrameInterval` is a valid, positive time.
    virtual std::shared_ptr<ScreenCaptureSource> createSource(const Size& size,
                                                              const MediaTime& minimumFrameInterval) = 0;
};

/// What a screen source sees, with the numbers by which the modes are known.
enum class MirroringMode : int {
    off = 0,            ///< nothing
    wholeScreen = 1,    ///< the whole screen, with its cursor
    cloneContexts = 3,  ///< a set of window contexts alone, whatever covers them
};

/// The device's display mirroring. It holds for all sources, those that run included. Implemented by the X11
/// adapter and the simulated device. Any thread.
class DisplayMirroring {
  public:
    virtual ~DisplayMirroring() = default;

    virtual void setMode(MirroringMode mode) = 0;

    /// The contexts that `cloneContexts` shows. The largest of them that is on the screen fills the frame
    /// from its top left corner (scaled down to fit when it is larger than the frame); the others lie where
    /// they lie relative to it, in their stacking order. Contexts that do not exist are not shown.
    virtual void setCloneContexts(std::set<std::uint32_t> contextIDs) = 0;
};

}  // namespace kelvo
