#pragma once

#include "platform/linux/pulse/MixTimeline.h"
#include "platform/linux/pulse/RecordStream.h"

#include <functional>
#include <map>
#include <memory>

namespace kelvo::pulse {

/// Mixes everything that one process plays onto a time line, from construction until destruction: it attaches
/// to each of the process's sink inputs, as they come, move to other sinks and go. What a stream says of its
/// process is its client's word. Calls `onSound`, on the sound server's thread, after it has mixed something.
/// Must not be destroyed on that thread.
class PulseTap : private PulseClient, private RecordStreamReceiver {
  public:
    PulseTap(std::shared_ptr<PulseServer> server, std::shared_ptr<Clock> clock,
             std::int32_t processIdentifier, RecordStream::Source format, MixTimeline& timeline,
             std::function<void()> onSound);
    ~PulseTap() override;
    PulseTap(const PulseTap&) = delete;
    PulseTap& operator=(const PulseTap&) = delete;

  private:
    struct Attachment {
        std::unique_ptr<RecordStream> stream;
        MixTimeline::StreamIndex index = MixTimeline::kNoStream;
    };
    using Attachments = std::map<std::uint32_t, Attachment>;

    void serverCame(pa_context* context) override;
    void serverWent() override;
    void letGo() override;
    void serverChanged(pa_context* context, pa_subscription_event_type_t event, std::uint32_t index) override;
    void streamRecorded(RecordStream& stream, std::chrono::nanoseconds moment,
                        std::span<const std::int16_t> samples) override;
    void streamResumed(RecordStream& stream) override;
    void streamSuspended(RecordStream& stream) override;
    void streamFailed(RecordStream& stream) override;

    static void sinkInputAnswered(pa_context* context, const pa_sink_input_info* info, int end, void* self);
    bool isOfProcess(const pa_sink_input_info& info) const;
    void attach(std::uint32_t sinkInput);
    void detach(std::uint32_t sinkInput);
    void ask(std::uint32_t sinkInput);
    Attachments::iterator attachmentOf(const RecordStream& stream);

    const std::shared_ptr<PulseServer> server_;
    const std::shared_ptr<Clock> clock_;
    const std::string processIdentifier_;
    const RecordStream::Source format_;
    MixTimeline& timeline_;
    const std::function<void()> onSound_;

    /// Under the loop's lock.
    pa_context* context_ = nullptr;
    Attachments attachments_;
    Operations operations_;
};

}  // namespace kelvo::pulse
