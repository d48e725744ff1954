#pragma once

#include "base/Guarded.h"
#include "base/MovieTimeline.h"
#include "platform/BufferQueue.h"
#include "platform/MediaFileWriter.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedFileSystem.h"

#include <atomic>
#include <deque>
#include <memory>
#include <vector>

namespace kelvo {

/// A buffer queue whose enqueueing fails when "BufferQueue.enqueue" was ordered to. Thread-safe.
class SimulatedBufferQueue : public BufferQueue {
  public:
    explicit SimulatedBufferQueue(std::shared_ptr<SimulatedFaults> faults) : faults_(std::move(faults)) {}

    int enqueue(SampleBufferRef sample) override;
    SampleBufferRef dequeue() override;
    bool isEmpty() const override;
    void reset() override;

  private:
    std::shared_ptr<SimulatedFaults> faults_;
    Guarded<std::deque<SampleBufferRef>> samples_;
};

/// What a simulated writer and its inputs share.
struct SimulatedWriterState {
    std::atomic<MediaFileWriter::Status> status{MediaFileWriter::Status::unknown};
    std::atomic<bool> isInSession{false};
};

/// An input that keeps what it is given. It is ready while its writer's session runs, unless a test makes it
/// busy. Thread-safe.
class SimulatedWriterInput : public WriterInput {
  public:
    SimulatedWriterInput(MediaType type, Dictionary settings)
        : type_(type), outputSettings_(std::move(settings)) {}

    /// Whether the input pretends to have fallen behind.
    void setBusy(bool isBusy) { isBusy_ = isBusy; }
    /// How often it still says that it is ready before it turns busy; less than 0 is without end.
    void setReadyCount(int count) { readyCount_ = count; }

    /// The samples so far, in order.
    std::vector<SampleBufferRef> samples() const { return samples_.copy(); }
    /// Their presentation times' values.
    std::vector<std::int64_t> presentationValues() const;

    MediaType mediaType() const override { return type_; }
    const Dictionary& outputSettings() const override { return outputSettings_; }
    bool expectsMediaDataInRealTime() const override { return expectsMediaDataInRealTime_; }
    void setExpectsMediaDataInRealTime(bool expects) override { expectsMediaDataInRealTime_ = expects; }
    AffineTransform transform() const override { return transform_.copy(); }
    void setTransform(const AffineTransform& transform) override { transform_.set(transform); }
    bool isReadyForMoreMediaData() const override;
    bool append(const SampleBufferRef& sample) override;

  private:
    friend class SimulatedFileWriter;

    const MediaType type_;
    const Dictionary outputSettings_;
    std::atomic<bool> expectsMediaDataInRealTime_{false};
    std::atomic<bool> isBusy_{false};
    mutable std::atomic<int> readyCount_{-1};
    Guarded<AffineTransform> transform_;
    Guarded<std::vector<SampleBufferRef>> samples_;
    Guarded<std::shared_ptr<SimulatedWriterState>> writer_;
};

/// A movie file as a simulated writer leaves it.
struct SimulatedMovie {
    MediaTime duration;
    std::vector<MediaType> tracks;
};

/// A writer whose file appears in the simulated file system when it starts. Fails when
/// "MediaFileWriter.startWriting" or "MediaFileWriter.finishWriting" was ordered to, or when `fail` is
/// called. Thread-safe.
class SimulatedFileWriter : public MediaFileWriter, public std::enable_shared_from_this<SimulatedFileWriter> {
  public:
    using FinishedMovie = std::function<void(const URL&, const SimulatedMovie&)>;

    SimulatedFileWriter(const URL& url, std::shared_ptr<SimulatedFileSystem> fileSystem,
                        std::shared_ptr<SimulatedFaults> faults, FinishedMovie onFinished);

    /// The writer fails now, as one does whose volume is full.
    void fail(const KVError& error);

    std::vector<std::shared_ptr<SimulatedWriterInput>> inputs() const { return inputs_.copy(); }
    /// Invalid until the session begins or is ended.
    MediaTime sessionStart() const { return sessionStart_.copy(); }
    MediaTime sessionEnd() const { return sessionEnd_.copy(); }
    /// What `endCapture` was told; it changes nothing here.
    MediaTime captureEnd() const { return captureEnd_.copy(); }
    /// What `relateTimes` was told.
    const MovieTimeline& timeline() const { return timeline_; }

    void addInput(std::shared_ptr<WriterInput> input) override;
    Status status() const override { return state_->status; }
    OptionalError error() const override { return error_.copy(); }
    std::optional<URL> outputURL() const override { return url_; }
    bool startWriting() override;
    void startSession(const MediaTime& sourceTime) override;
    void relateTimes(const MediaTime& captureTime, const MediaTime& sourceTime) override {
        timeline_.relate(captureTime, sourceTime);
    }
    void endCapture(const MediaTime& captureTime) override { captureEnd_.set(captureTime); }
    void endSession(const MediaTime& sourceTime) override { sessionEnd_.set(sourceTime); }
    void finishWriting(std::function<void()> completion) override;

  private:
    SimulatedMovie movie() const;

    const URL url_;
    std::shared_ptr<SimulatedFileSystem> fileSystem_;
    std::shared_ptr<SimulatedFaults> faults_;
    const FinishedMovie onFinished_;
    const std::shared_ptr<SimulatedWriterState> state_ = std::make_shared<SimulatedWriterState>();
    Guarded<std::vector<std::shared_ptr<SimulatedWriterInput>>> inputs_;
    Guarded<OptionalError> error_;
    Guarded<MediaTime> sessionStart_;
    Guarded<MediaTime> sessionEnd_;
    Guarded<MediaTime> captureEnd_;
    MovieTimeline timeline_;
};

}  // namespace kelvo
