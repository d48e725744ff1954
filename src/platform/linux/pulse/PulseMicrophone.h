#pragma once

#include "platform/linux/pulse/BlockRing.h"
#include "platform/linux/pulse/RecordStream.h"
#include "platform/linux/pulse/Ticker.h"

#include <functional>
#include <memory>

namespace kelvo::pulse {

/// Records the user's default source from construction until destruction, and follows it when the user
/// prefers another. Must not be destroyed on the threads that it calls.
class PulseMicrophone : private PulseClient, private RecordStreamReceiver {
  public:
    static constexpr std::uint32_t kRate = 44100;

    struct Handlers {
        /// Mono sound that began at `moment` of the host's monotonic clock, on a thread of the microphone's
        /// own, some 25 times a second.
        std::function<void(std::chrono::nanoseconds moment, std::span<const std::int16_t> samples)> recorded;
        /// The source went away or rests (true), or delivers again. On the same thread, in its place between
        /// what was recorded.
        std::function<void(bool isInterrupted)> interrupted;
    };

    PulseMicrophone(std::shared_ptr<PulseServer> server, std::shared_ptr<Clock> clock, Handlers handlers);
    ~PulseMicrophone() override;
    PulseMicrophone(const PulseMicrophone&) = delete;
    PulseMicrophone& operator=(const PulseMicrophone&) = delete;

  private:
    void serverCame(pa_context* context) override;
    void serverWent() override;
    void letGo() override;
    void serverChanged(pa_context* context, pa_subscription_event_type_t event, std::uint32_t index) override;
    void streamRecorded(RecordStream& stream, std::chrono::nanoseconds moment,
                        std::span<const std::int16_t> samples) override;
    void streamResumed(RecordStream& stream) override;
    void streamSuspended(RecordStream& stream) override;
    void streamFailed(RecordStream& stream) override;

    void open(pa_context* context);
    void defaultSourceIs(pa_context* context, const char* name);
    void setInterrupted(bool isInterrupted);
    void deliver();
    void deliverRun();
    static bool continues(std::chrono::nanoseconds end, std::chrono::nanoseconds moment);

    const std::shared_ptr<PulseServer> server_;
    const std::shared_ptr<Clock> clock_;
    const Handlers handlers_;

    /// Under the loop's lock.
    std::unique_ptr<RecordStream> stream_;
    Operations operations_;
    bool isInterrupted_ = false;

    BlockRing blocks_;

    /// The ticker's thread's own.
    std::unique_ptr<BlockRing::Block> block_ = std::make_unique<BlockRing::Block>();
    std::vector<std::int16_t> run_;
    std::chrono::nanoseconds runBegin_{};
    std::unique_ptr<Ticker> ticker_;
};

}  // namespace kelvo::pulse
