#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "platform/MediaFileWriter.h"
#include "platform/linux/media/LavWriterInput.h"

#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// Writes a movie file with the libav encoders. Completions run on its own queue.
class LavFileWriter : public MediaFileWriter, public std::enable_shared_from_this<LavFileWriter> {
  public:
    /// `path` is where this process finds what `url` names.
    LavFileWriter(const URL& url, std::string path);
    ~LavFileWriter() override;

    void addInput(std::shared_ptr<WriterInput> input) override;
    Status status() const override { return session_->status; }
    OptionalError error() const override { return session_->error.copy(); }
    std::optional<URL> outputURL() const override { return url_; }
    bool startWriting() override;
    void startSession(const MediaTime& sourceTime) override;
    void relateTimes(const MediaTime& captureTime, const MediaTime& sourceTime) override {
        session_->timeline.relate(captureTime, sourceTime);
    }
    void endCapture(const MediaTime& captureTime) override { captureEnd_.set(captureTime); }
    void endSession(const MediaTime& sourceTime) override { end_.set(sourceTime); }
    void finishWriting(std::function<void()> completion) override;

  private:
    OptionalError openMovie();
    void finish();
    MediaTime end() const;

    const URL url_;
    const std::string path_;
    const std::shared_ptr<WriterSession> session_ = std::make_shared<WriterSession>();
    Guarded<std::vector<std::shared_ptr<LavWriterInput>>> inputs_;
    Guarded<MediaTime> captureEnd_;
    Guarded<MediaTime> end_;
    std::atomic<bool> hasStarted_{false};
    SerialQueue queue_;
};

}  // namespace kelvo
