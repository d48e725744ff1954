#include "platform/linux/pulse/PulseTap.h"

#include <algorithm>
#include <utility>

namespace kelvo::pulse {

PulseTap::PulseTap(std::shared_ptr<PulseServer> server, std::shared_ptr<Clock> clock,
                   std::int32_t processIdentifier, RecordStream::Source format, MixTimeline& timeline,
                   std::function<void()> onSound)
    : server_(std::move(server)),
      clock_(std::move(clock)),
      processIdentifier_(std::to_string(processIdentifier)),
      format_(format),
      timeline_(timeline),
      onSound_(std::move(onSound)) {
    server_->add(*this);
}

PulseTap::~PulseTap() {
    server_->remove(*this);
}

void PulseTap::serverCame(pa_context* context) {
    context_ = context;
    operations_.add(pa_context_get_sink_input_info_list(context, &PulseTap::sinkInputAnswered, this));
}

void PulseTap::serverWent() {
    letGo();
}

void PulseTap::letGo() {
    operations_.cancel();
    while (!attachments_.empty())
        detach(attachments_.begin()->first);
    context_ = nullptr;
}

void PulseTap::serverChanged(pa_context*, pa_subscription_event_type_t event, std::uint32_t index) {
    if ((event & PA_SUBSCRIPTION_EVENT_FACILITY_MASK) != PA_SUBSCRIPTION_EVENT_SINK_INPUT) return;
    if ((event & PA_SUBSCRIPTION_EVENT_TYPE_MASK) == PA_SUBSCRIPTION_EVENT_REMOVE) {
        detach(index);
    } else if (!attachments_.contains(index)) {
        ask(index);
    }
}

void PulseTap::ask(std::uint32_t sinkInput) {
    operations_.add(pa_context_get_sink_input_info(context_, sinkInput, &PulseTap::sinkInputAnswered, this));
}

void PulseTap::sinkInputAnswered(pa_context*, const pa_sink_input_info* info, int end, void* self) {
    auto* tap = static_cast<PulseTap*>(self);
    if (end == 0 && info != nullptr && tap->isOfProcess(*info)) tap->attach(info->index);
}

bool PulseTap::isOfProcess(const pa_sink_input_info& info) const {
    const char* process = pa_proplist_gets(info.proplist, PA_PROP_APPLICATION_PROCESS_ID);
    return process != nullptr && processIdentifier_ == process;
}

void PulseTap::attach(std::uint32_t sinkInput) {
    if (attachments_.contains(sinkInput)) return;
    const MixTimeline::StreamIndex index = timeline_.addStream(clock_->monotonicNow());
    if (index == MixTimeline::kNoStream) return;
    RecordStream::Source source = format_;
    source.sinkInput = sinkInput;
    attachments_[sinkInput] = {
        std::make_unique<RecordStream>(context_, source, clock_, static_cast<RecordStreamReceiver&>(*this)),
        index};
}

void PulseTap::detach(std::uint32_t sinkInput) {
    const auto found = attachments_.find(sinkInput);
    if (found == attachments_.end()) return;
    timeline_.removeStream(found->second.index);
    attachments_.erase(found);
}

PulseTap::Attachments::iterator PulseTap::attachmentOf(const RecordStream& stream) {
    return std::ranges::find_if(attachments_,
                                [&](const auto& entry) { return entry.second.stream.get() == &stream; });
}

void PulseTap::streamRecorded(RecordStream& stream, std::chrono::nanoseconds moment,
                              std::span<const std::int16_t> samples) {
    const auto found = attachmentOf(stream);
    if (found == attachments_.end()) return;
    timeline_.write(found->second.index, moment, samples);
    onSound_();
}

void PulseTap::streamResumed(RecordStream&) {}
void PulseTap::streamSuspended(RecordStream&) {}

/// The sink input moved to another sink, or has ended; if it still exists, it is attached to again.
void PulseTap::streamFailed(RecordStream& stream) {
    const auto found = attachmentOf(stream);
    if (found == attachments_.end()) return;
    const std::uint32_t sinkInput = found->first;
    detach(sinkInput);
    if (pa_context_get_state(context_) == PA_CONTEXT_READY) ask(sinkInput);
}

}  // namespace kelvo::pulse
