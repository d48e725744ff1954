#pragma once

#include "base/SerialQueue.h"
#include "base/VideoSurfacePool.h"
#include "platform/FramePacer.h"
#include "platform/simulated/SimulatedScreen.h"

#include <atomic>
#include <functional>
#include <optional>

namespace kelvo {

/// A source of the simulated screen, which outlives it. Whoever drives the screen plays the source's thread;
/// the queue keeps several of them apart and lets `stopCapture` wait for a delivery. So the first frame after
/// a start comes when the screen is next driven.
class SimulatedScreenSource : public ScreenCaptureSource {
  public:
    SimulatedScreenSource(SimulatedScreen& screen, const Size& size, std::chrono::nanoseconds interval);

    void setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) override;
    void startCapture() override;
    void stopCapture() override;
    std::uint64_t skippedFrameCount() const override { return skipped_; }

    /// Delivers the picture when it is due and was not delivered yet.
    void catchUp();

    /// Tells the delegate something while the source runs; stops it first when `isLast`.
    using Message = std::function<void(ScreenCaptureSource&, ScreenCaptureDelegate&)>;
    void report(const Message& message, bool isLast);

  private:
    void onQueue(const Task& task);
    void beginAnew();
    bool takeTurn(std::chrono::nanoseconds changedAt);
    VideoSurfaceRef draw(const SimulatedScreen::Picture& picture);
    void deliver(const SimulatedScreen::Picture& picture, VideoSurfaceRef surface);

    SimulatedScreen& screen_;
    const Size size_;
    const std::chrono::nanoseconds interval_;
    SerialQueue queue_{"com.quillon.kelvod.simulated.screen"};
    Guarded<std::weak_ptr<ScreenCaptureDelegate>> delegate_;
    std::atomic<bool> isRunning_{false};
    std::atomic<bool> isFresh_{false};
    std::atomic<std::uint64_t> skipped_{0};

    // On the queue.
    std::optional<FramePacer> pacer_;
    std::optional<VideoSurfacePool> pool_;
    std::uint64_t deliveredChange_ = 0;
    std::chrono::nanoseconds startedAt_{0};
    std::chrono::nanoseconds lastDelivered_{0};
};

}  // namespace kelvo
