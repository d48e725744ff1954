#pragma once

#include "base/Geometry.h"
#include "base/Guarded.h"
#include "platform/AnalyticsSink.h"

#include <atomic>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace kelvo {

/// Gathers the usage figures of one recording and sends them as one summary when it ends. Knows nothing of
/// recording. Thread-safe; the counters may be increased by several threads at once. Nothing fails towards
/// the caller: a report that cannot be sent is logged.
class KVReportingAgent {
  public:
    static constexpr std::int32_t kSummaryEvent = 1;

    KVReportingAgent(std::string serviceName, std::shared_ptr<AnalyticsSink> analytics)
        : serviceName_(std::move(serviceName)), analytics_(std::move(analytics)) {}

    const std::string& serviceName() const { return serviceName_; }

    /// Seconds of capturing.
    double activeDuration() const { return activeDuration_; }
    void setActiveDuration(double seconds) { activeDuration_ = seconds; }
    Size videoCaptureSize() const { return videoCaptureSize_.copy(); }
    void setVideoCaptureSize(const Size& size) { videoCaptureSize_.set(size); }
    /// Frames a second.
    std::int64_t videoCaptureRate() const { return videoCaptureRate_; }
    void setVideoCaptureRate(std::int64_t rate) { videoCaptureRate_ = rate; }

    std::int64_t videoFrameCount() const { return videoFrameCount_; }
    void setVideoFrameCount(std::int64_t count) { videoFrameCount_ = count; }
    void countVideoFrame() { ++videoFrameCount_; }
    std::int64_t micFrameCount() const { return micFrameCount_; }
    void setMicFrameCount(std::int64_t count) { micFrameCount_ = count; }
    void countMicFrame() { ++micFrameCount_; }
    std::int64_t appAudioFrameCount() const { return appAudioFrameCount_; }
    void setAppAudioFrameCount(std::int64_t count) { appAudioFrameCount_ = count; }
    void countAppAudioFrame() { ++appAudioFrameCount_; }

    bool frontCameraUsed() const { return frontCameraUsed_; }
    void setFrontCameraUsed(bool used) { frontCameraUsed_ = used; }
    bool backCameraUsed() const { return backCameraUsed_; }
    void setBackCameraUsed(bool used) { backCameraUsed_ = used; }
    /// Bytes.
    std::uint64_t recordedFileSize() const { return recordedFileSize_; }
    void setRecordedFileSize(std::uint64_t bytes) { recordedFileSize_ = bytes; }
    std::int64_t endReason() const { return endReason_; }
    void setEndReason(std::int64_t code) { endReason_ = code; }

    /// The summary of what was gathered so far, always with the same 15 entries.
    Dictionary collectSummaryEventMetrics() const;

    /// Sends one message of category `eventType`; nothing without a payload.
    void reportEventWithType(std::int32_t eventType, const std::optional<Dictionary>& payload);

  private:
    const std::string serviceName_;
    const std::shared_ptr<AnalyticsSink> analytics_;
    std::atomic<double> activeDuration_{0};
    Guarded<Size> videoCaptureSize_;
    std::atomic<std::int64_t> videoCaptureRate_{0};
    std::atomic<std::int64_t> videoFrameCount_{0};
    std::atomic<std::int64_t> micFrameCount_{0};
    std::atomic<std::int64_t> appAudioFrameCount_{0};
    std::atomic<bool> frontCameraUsed_{false};
    std::atomic<bool> backCameraUsed_{false};
    std::atomic<std::uint64_t> recordedFileSize_{0};
    std::atomic<std::int64_t> endReason_{0};
};

}  // namespace kelvo
