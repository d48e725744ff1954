#pragma once

#include "base/Guarded.h"
#include "platform/ScreenCapture.h"
#include "platform/simulated/NumberedPicture.h"

#include <algorithm>
#include <chrono>
#include <cstdint>
#include <functional>
#include <optional>
#include <thread>
#include <vector>

namespace kelvo::test {

/// Writes down what a screen source delivers. Keeps the numbers and times of the frames but not the frames
/// themselves, unless it is told to hold them. Thread-safe.
class FrameRecorder : public ScreenCaptureDelegate {
  public:
    struct Frame {
        std::optional<std::uint32_t> number;
        std::uint32_t width;
        std::uint32_t height;
        MediaTime time;
        ScreenTransform transform;
        std::chrono::nanoseconds arrived;  ///< on the host's monotonic clock
        std::thread::id thread;
    };

    std::vector<Frame> frames() const { return frames_.copy(); }
    std::size_t count() const { return frames().size(); }
    bool hasNumber(std::uint32_t number) const {
        return std::ranges::count(frames(), std::optional(number), &Frame::number) > 0;
    }
    std::optional<Frame> last() const {
        const auto all = frames();
        return all.empty() ? std::nullopt : std::optional(all.back());
    }
    VideoSurfaceRef lastSurface() const { return lastSurface_.copy(); }
    std::vector<ScreenCaptureStatus> failures() const { return failures_.copy(); }

    /// From now on the newest surface, or every one, is kept.
    void keepLast() { keepsLast_ = true; }
    void holdAll() { holdsAll_ = true; }
    void letGo() {
        holdsAll_ = false;
        held_.set({});
        lastSurface_.set(nullptr);
    }

    /// Called with each frame, on its thread, after it was written down.
    void onFrame(std::function<void(ScreenCaptureSource&, const SampleBufferRef&)> action) {
        action_.set(std::move(action));
    }
    void onFailure(std::function<void(ScreenCaptureSource&)> action) {
        failureAction_.set(std::move(action));
    }

    void screenCaptureControllerDidReceiveSampleBuffer(ScreenCaptureSource& source,
                                                       const SampleBufferRef& sample,
                                                       const ScreenTransform& transformFlags) override {
        const auto arrived = std::chrono::steady_clock::now().time_since_epoch();
        const VideoSurfaceRef& surface = sample->surface();
        const Frame frame{NumberedPicture::read(*surface), surface->width(), surface->height(),
                          sample->presentationTime(),      transformFlags,   arrived,
                          std::this_thread::get_id()};
        if (holdsAll_) held_.with([&](auto& held) { held.push_back(surface); });
        if (keepsLast_) lastSurface_.set(surface);
        frames_.with([&](auto& frames) { frames.push_back(frame); });
        if (const auto action = action_.copy()) action(source, sample);
    }
    void screenCaptureControllerDidFailWithStatus(ScreenCaptureSource& source,
                                                  ScreenCaptureStatus status) override {
        failures_.with([&](auto& failures) { failures.push_back(status); });
        if (const auto action = failureAction_.copy()) action(source);
    }
    void screenCaptureControllerWasPreempted(ScreenCaptureSource&) override { ++preemptions; }
    void screenCaptureControllerMediaServicesWereReset(ScreenCaptureSource&) override { ++resets; }

    std::atomic<int> preemptions{0};
    std::atomic<int> resets{0};

  private:
    Guarded<std::vector<Frame>> frames_;
    Guarded<std::vector<VideoSurfaceRef>> held_;
    Guarded<VideoSurfaceRef> lastSurface_;
    Guarded<std::vector<ScreenCaptureStatus>> failures_;
    Guarded<std::function<void(ScreenCaptureSource&, const SampleBufferRef&)>> action_;
    Guarded<std::function<void(ScreenCaptureSource&)>> failureAction_;
    std::atomic<bool> holdsAll_{false};
    std::atomic<bool> keepsLast_{false};
};

}  // namespace kelvo::test
