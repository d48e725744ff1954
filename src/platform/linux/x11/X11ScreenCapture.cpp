#include "platform/linux/x11/X11ScreenCapture.h"

#include "base/ThreadName.h"

#include <cmath>
#include <functional>
#include <mutex>
#include <thread>
#include <utility>

namespace kelvo::x11 {
namespace {

/// The source that the calling thread delivers for; only compared. Such a thread is in a delegate's call when
/// it comes back to its source, and waiting there for that call to end would be waiting for itself.
thread_local const ScreenCaptureSource* servedSource = nullptr;

}  // namespace

/// One start: its loop and the thread on which that runs.
class X11ScreenCapture::Run : public std::enable_shared_from_this<Run> {
  public:
    using FailureHandler = std::function<void(ScreenCaptureStatus)>;

    explicit Run(CaptureSettings settings) : loop_(std::move(settings)) {}
    ~Run() {
        if (!thread_.joinable()) return;
        // The last reference may go in a delegate's call.
        thread_.get_id() == std::this_thread::get_id() ? thread_.detach() : thread_.join();
    }
    Run(const Run&) = delete;
    Run& operator=(const Run&) = delete;

    /// Runs once the run before it has left its thread, so that a delegate is never called twice at once.
    void start(const ScreenCaptureSource* source, std::shared_ptr<Run> before, FailureHandler onFailure) {
        std::lock_guard lock(threadMutex_);
        thread_ = std::thread([self = shared_from_this(), source, before = std::move(before),
                               onFailure = std::move(onFailure)]() mutable {
            servedSource = source;
            nameCurrentThread("com.quillon.kelvod.screen");
            if (before) before->waitForEnd();
            before.reset();
            const auto failure = self->loop_.run();
            self->hasEnded_ = true;
            if (failure && !self->loop_.isStopped()) onFailure(*failure);
        });
    }

    void stop() { loop_.stop(); }
    void waitForEnd() {
        std::lock_guard lock(threadMutex_);
        if (thread_.joinable()) thread_.join();
    }

    bool isActive() const { return !hasEnded_ && !loop_.isStopped(); }

  private:
    CaptureLoop loop_;
    std::atomic<bool> hasEnded_{false};
    std::mutex threadMutex_;  ///< held while the thread is waited for, which is done only once
    std::thread thread_;
};

X11ScreenCapture::X11ScreenCapture(std::string display, const Size& size,
                                   const MediaTime& minimumFrameInterval,
                                   std::shared_ptr<MirroringState> mirroring)
    : display_(std::move(display)),
      size_(size),
      interval_(std::llround(minimumFrameInterval.seconds() * 1e9)),
      mirroring_(std::move(mirroring)) {}

X11ScreenCapture::~X11ScreenCapture() {
    stopCapture();
}

void X11ScreenCapture::setDelegate(std::weak_ptr<ScreenCaptureDelegate> delegate) {
    delegate_.set(std::move(delegate));
}

void X11ScreenCapture::startCapture() {
    const auto next = std::make_shared<Run>(settings());
    std::shared_ptr<Run> before;
    const bool isNew = run_.with([&](std::shared_ptr<Run>& run) {
        if (run && run->isActive()) return false;
        before = std::exchange(run, next);
        return true;
    });
    if (!isNew) return;
    next->start(this, std::move(before), [weak = weak_from_this()](ScreenCaptureStatus status) {
        if (const auto self = weak.lock()) self->reportFailure(status);
    });
}

void X11ScreenCapture::stopCapture() {
    const auto run = run_.copy();
    if (!run) return;
    run->stop();
    if (servedSource != this) run->waitForEnd();
}

CaptureSettings X11ScreenCapture::settings() {
    return {display_,
            size_,
            interval_,
            mirroring_,
            skippedFrames_,
            [weak = weak_from_this()](const SampleBufferRef& sample) {
                if (const auto self = weak.lock()) self->deliver(sample);
            }};
}

void X11ScreenCapture::deliver(const SampleBufferRef& sample) {
    // The root window stands upright however the screen is turned.
    if (const auto delegate = delegate_.copy().lock())
        delegate->screenCaptureControllerDidReceiveSampleBuffer(*this, sample, ScreenTransform());
}

void X11ScreenCapture::reportFailure(ScreenCaptureStatus status) {
    if (const auto delegate = delegate_.copy().lock())
        delegate->screenCaptureControllerDidFailWithStatus(*this, status);
}

}  // namespace kelvo::x11
