#pragma once

#include "base/Guarded.h"
#include "platform/ScreenCapture.h"
#include "platform/linux/x11/CaptureLoop.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <string>

namespace kelvo::x11 {

/// A screen source on an X display. Each start has a thread and a connection of its own, which are gone when
/// it is stopped: a display that was replaced in between is simply found again.
class X11ScreenCapture : public ScreenCaptureSource, public std::enable_shared_from_this<X11ScreenCapture> {
  public:
    X11ScreenCapture(std::string display, const Size& size, const MediaTime& minimumFrameInterval,
                     std::shared_ptr<MirroringState> mirroring);
    ~X11ScreenCapture() override;

    void setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) override;
    void startCapture() override;
    void stopCapture() override;
    std::uint64_t skippedFrameCount() const override { return skippedFrames_->load(); }

  private:
    class Run;

    CaptureSettings settings();
    void deliver(const SampleBufferRef& sample);
    void reportFailure(ScreenCaptureStatus status);

    const std::string display_;
    const Size size_;
    const std::chrono::nanoseconds interval_;
    const std::shared_ptr<MirroringState> mirroring_;
    const std::shared_ptr<std::atomic<std::uint64_t>> skippedFrames_ =
        std::make_shared<std::atomic<std::uint64_t>>(0);
    Guarded<std::weak_ptr<ScreenCaptureDelegate>> delegate_;
    Guarded<std::shared_ptr<Run>> run_;
};

}  // namespace kelvo::x11
