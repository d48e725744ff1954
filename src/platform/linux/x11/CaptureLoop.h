#pragma once

#include "base/Geometry.h"
#include "base/SampleBuffer.h"
#include "platform/FramePacer.h"
#include "platform/ScreenCapture.h"
#include "platform/linux/x11/MirroringState.h"
#include "platform/linux/x11/ShmSurfacePool.h"
#include "platform/linux/x11/XConnection.h"
#include "platform/linux/x11/XPicture.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <memory>
#include <optional>
#include <string>

namespace kelvo::x11 {

/// What a capture loop is made with. `deliver` is called on the loop's thread.
struct CaptureSettings {
    std::string display;
    Size size;
    std::chrono::nanoseconds interval{0};
    std::shared_ptr<MirroringState> mirroring;
    std::shared_ptr<std::atomic<std::uint64_t>> skippedFrames;
    std::function<void(const SampleBufferRef&)> deliver;
};

/// Captures one display from a start to a stop: sleeps until the picture changes, waits until a frame is
/// due, lets the server write it and delivers it. `stop` is thread-safe; `run` has a thread to itself.
class CaptureLoop {
  public:
    explicit CaptureLoop(CaptureSettings settings);

    /// Returns when it is stopped, or why it gave up.
    std::optional<ScreenCaptureStatus> run();

    /// Ends `run` soon, whatever it waits for; no delivery begins any more.
    void stop();
    bool isStopped() const { return stopped_.load(); }

  private:
    using Time = std::chrono::nanoseconds;

    bool begin();
    bool hasExtensions();
    bool cannotCapture(const std::string& reason) const;
    std::unique_ptr<XPicture> makePicture(const Mirroring& mirroring);
    std::optional<ScreenCaptureStatus> watchPicture();
    void takeEvents(Time now, unsigned subtracted = 0);
    void rearmWhenDue(Time now);
    std::optional<ScreenCaptureStatus> captureFrame(Time due, Time now);
    void preparePool();
    ScreenCaptureStatus failure() const;
    void deliver(VideoSurfaceRef surface);
    bool sleep(std::optional<Time> until);

    const CaptureSettings settings_;
    FramePacer pacer_;
    std::atomic<bool> stopped_{false};
    WakeEvent stopEvent_;
    const std::shared_ptr<WakeEvent> mirroringEvent_ = std::make_shared<WakeEvent>();

    // Those that follow live from one change of the mirroring to the next; the order is that of dependence.
    std::unique_ptr<XConnection> connection_;
    std::unique_ptr<XPicture> picture_;
    std::unique_ptr<ShmSurfacePool> pool_;
    std::optional<Time> firstChange_;  ///< of the changes that are not captured yet
    Time lastChange_{0};
    Time frameTime_{0};  ///< when the last change came that the newest frame shows
    bool isArmed_ = false;
    Time nextArming_{0};
    Time lastDelivered_{0};
};

}  // namespace kelvo::x11
