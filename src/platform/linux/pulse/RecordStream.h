#pragma once

#include "base/Clock.h"
#include "platform/linux/pulse/PulseServer.h"
#include "platform/linux/pulse/StreamClock.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>

namespace kelvo::pulse {

class RecordStream;

/// Receives what a record stream records and becomes. On the loop's thread, under its lock.
class RecordStreamReceiver {
  public:
    virtual ~RecordStreamReceiver() = default;

    /// `samples` (whole frames) began to sound at `moment` of the host's monotonic clock.
    virtual void streamRecorded(RecordStream& stream, std::chrono::nanoseconds moment,
                                std::span<const std::int16_t> samples) = 0;
    /// The stream delivers (again), or its device rests.
    virtual void streamResumed(RecordStream& stream) = 0;
    virtual void streamSuspended(RecordStream& stream) = 0;
    /// It will deliver nothing more, and may be destroyed.
    virtual void streamFailed(RecordStream& stream) = 0;
};

/// One stream of 16-bit samples from the server, each block with the moment at which it sounded. Everything
/// of it happens under the loop's lock.
class RecordStream {
  public:
    struct Source {
        /// The one sink input to listen to; none for the default source.
        std::optional<std::uint32_t> sinkInput;
        std::uint32_t rate = 44100;
        std::uint8_t channels = 1;
    };

    /// Tells `receiver` later what became of it; nothing, when the context fails, which its clients hear.
    RecordStream(pa_context* context, const Source& source, std::shared_ptr<Clock> clock,
                 RecordStreamReceiver& receiver);
    ~RecordStream();
    RecordStream(const RecordStream&) = delete;
    RecordStream& operator=(const RecordStream&) = delete;

    /// None until the stream is ready.
    std::optional<std::string> deviceName() const;

  private:
    void setCallbacks(bool areSet);
    void stateChanged();
    void suspensionChanged();
    void readEverything();
    void pass(std::span<const std::int16_t> samples);

    const std::shared_ptr<Clock> clock_;
    const std::uint8_t channels_;
    RecordStreamReceiver& receiver_;
    StreamClock moments_;
    pa_stream* stream_ = nullptr;
};

}  // namespace kelvo::pulse
