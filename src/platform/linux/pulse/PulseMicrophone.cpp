#include "platform/linux/pulse/PulseMicrophone.h"

#include "base/KVLog.h"

#include <utility>

namespace kelvo::pulse {
namespace {

/// Whatever comes wakes the ticker.
constexpr std::chrono::seconds kLongestWait{1};

}  // namespace

PulseMicrophone::PulseMicrophone(std::shared_ptr<PulseServer> server, std::shared_ptr<Clock> clock,
                                 Handlers handlers)
    : server_(std::move(server)), clock_(std::move(clock)), handlers_(std::move(handlers)) {
    run_.reserve(BlockRing::kBlockSize * BlockRing::kBlockCount);
    ticker_ = std::make_unique<Ticker>("kelvo.microphone", kLongestWait, [this] { deliver(); });
    server_->add(*this);
}

PulseMicrophone::~PulseMicrophone() {
    server_->remove(*this);
    ticker_.reset();
}

void PulseMicrophone::serverCame(pa_context* context) {
    open(context);
}

void PulseMicrophone::serverWent() {
    letGo();
    setInterrupted(true);
}

void PulseMicrophone::letGo() {
    operations_.cancel();
    stream_.reset();
}

void PulseMicrophone::open(pa_context* context) {
    const RecordStream::Source source{.sinkInput = std::nullopt, .rate = kRate, .channels = 1};
    stream_ =
        std::make_unique<RecordStream>(context, source, clock_, static_cast<RecordStreamReceiver&>(*this));
}

/// The preferred source may have changed, or the first one come.
void PulseMicrophone::serverChanged(pa_context* context, pa_subscription_event_type_t event, std::uint32_t) {
    const auto facility = event & PA_SUBSCRIPTION_EVENT_FACILITY_MASK;
    if (facility != PA_SUBSCRIPTION_EVENT_SERVER && facility != PA_SUBSCRIPTION_EVENT_SOURCE) return;
    const auto answered = [](pa_context* asked, const pa_server_info* info, void* self) {
        if (info == nullptr) return;
        static_cast<PulseMicrophone*>(self)->defaultSourceIs(asked, info->default_source_name);
    };
    operations_.add(pa_context_get_server_info(context, answered, this));
}

void PulseMicrophone::defaultSourceIs(pa_context* context, const char* name) {
    if (name == nullptr) return;
    if (!stream_) {
        open(context);
        return;
    }
    const auto current = stream_->deviceName();
    if (!current || *current == name) return;
    KVLog("the microphone is %s now", name);
    open(context);
}

void PulseMicrophone::streamResumed(RecordStream&) {
    setInterrupted(false);
}

void PulseMicrophone::streamSuspended(RecordStream&) {
    setInterrupted(true);
}

/// Its source was removed, or there is none; another one's coming is an event of the server.
void PulseMicrophone::streamFailed(RecordStream&) {
    stream_.reset();
    setInterrupted(true);
}

void PulseMicrophone::setInterrupted(bool isInterrupted) {
    if (std::exchange(isInterrupted_, isInterrupted) == isInterrupted) return;
    blocks_.putEvent(isInterrupted ? BlockRing::Event::interrupted : BlockRing::Event::resumed);
    ticker_->wake();
}

void PulseMicrophone::streamRecorded(RecordStream&, std::chrono::nanoseconds moment,
                                     std::span<const std::int16_t> samples) {
    blocks_.put(moment, samples, kRate);
    ticker_->wake();
}

/// Hands on what has come since the last time, in as few pieces as its moments allow.
void PulseMicrophone::deliver() {
    while (blocks_.take(*block_)) {
        const auto end = runBegin_ + durationOf(static_cast<std::int64_t>(run_.size()), kRate);
        const bool isSound = block_->event == BlockRing::Event::sound;
        if (!isSound || !continues(end, block_->moment)) deliverRun();
        if (!isSound) handlers_.interrupted(block_->event == BlockRing::Event::interrupted);
        if (run_.empty()) runBegin_ = block_->moment;
        run_.insert(run_.end(), block_->content().begin(), block_->content().end());
    }
    deliverRun();
}

void PulseMicrophone::deliverRun() {
    if (!run_.empty()) handlers_.recorded(runBegin_, run_);
    run_.clear();
}

bool PulseMicrophone::continues(std::chrono::nanoseconds end, std::chrono::nanoseconds moment) {
    return std::chrono::abs(moment - end) < std::chrono::milliseconds(1);
}

}  // namespace kelvo::pulse
