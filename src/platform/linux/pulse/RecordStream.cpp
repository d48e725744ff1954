#include "platform/linux/pulse/RecordStream.h"

#include <utility>

namespace kelvo::pulse {
namespace {

/// How much sound the server collects before it sends it, and with that how late sound comes: each fragment
/// wakes a row of threads.
constexpr pa_usec_t kFragment = 40 * PA_USEC_PER_MSEC;

RecordStream* streamOf(void* data) {
    return static_cast<RecordStream*>(data);
}

}  // namespace

RecordStream::RecordStream(pa_context* context, const Source& source, std::shared_ptr<Clock> clock,
                           RecordStreamReceiver& receiver)
    : clock_(std::move(clock)), channels_(source.channels), receiver_(receiver), moments_(source.rate) {
    const pa_sample_spec spec{PA_SAMPLE_S16NE, source.rate, source.channels};
    stream_ = pa_stream_new(context, source.sinkInput ? "application tap" : "microphone", &spec, nullptr);
    if (stream_ == nullptr) return;  // the context has just failed, and its clients are told
    setCallbacks(true);
    if (source.sinkInput) pa_stream_set_monitor_stream(stream_, *source.sinkInput);
    constexpr auto kWhatever = static_cast<std::uint32_t>(-1);
    const pa_buffer_attr attributes{kWhatever, kWhatever, kWhatever, kWhatever,
                                    static_cast<std::uint32_t>(pa_usec_to_bytes(kFragment, &spec))};
    constexpr auto kFlags = static_cast<pa_stream_flags_t>(
        PA_STREAM_INTERPOLATE_TIMING | PA_STREAM_AUTO_TIMING_UPDATE | PA_STREAM_ADJUST_LATENCY);
    // It fails at once only when the context has just failed.
    pa_stream_connect_record(stream_, nullptr, &attributes, kFlags);
}

RecordStream::~RecordStream() {
    if (stream_ == nullptr) return;
    setCallbacks(false);
    pa_stream_disconnect(stream_);
    pa_stream_unref(stream_);
}

void RecordStream::setCallbacks(bool areSet) {
    const pa_stream_notify_cb_t changed = [](pa_stream*, void* self) { streamOf(self)->stateChanged(); };
    const pa_stream_notify_cb_t suspended = [](pa_stream*, void* self) {
        streamOf(self)->suspensionChanged();
    };
    const pa_stream_notify_cb_t moved = [](pa_stream*, void* self) { streamOf(self)->moments_.reset(); };
    const pa_stream_request_cb_t readable = [](pa_stream*, std::size_t, void* self) {
        streamOf(self)->readEverything();
    };
    pa_stream_set_state_callback(stream_, areSet ? changed : nullptr, this);
    pa_stream_set_suspended_callback(stream_, areSet ? suspended : nullptr, this);
    pa_stream_set_moved_callback(stream_, areSet ? moved : nullptr, this);
    pa_stream_set_read_callback(stream_, areSet ? readable : nullptr, this);
}

std::optional<std::string> RecordStream::deviceName() const {
    if (stream_ == nullptr || pa_stream_get_state(stream_) != PA_STREAM_READY) return std::nullopt;
    const char* name = pa_stream_get_device_name(stream_);
    return name == nullptr ? std::nullopt : std::optional<std::string>(name);
}

void RecordStream::stateChanged() {
    const pa_stream_state_t state = pa_stream_get_state(stream_);
    if (state == PA_STREAM_READY) suspensionChanged();
    if (state == PA_STREAM_FAILED || state == PA_STREAM_TERMINATED) receiver_.streamFailed(*this);
}

void RecordStream::suspensionChanged() {
    moments_.reset();
    if (pa_stream_is_suspended(stream_) > 0) {
        receiver_.streamSuspended(*this);
    } else {
        receiver_.streamResumed(*this);
    }
}

void RecordStream::readEverything() {
    while (pa_stream_readable_size(stream_) > 0) {
        const void* data = nullptr;
        std::size_t size = 0;
        if (pa_stream_peek(stream_, &data, &size) < 0 || size == 0) return;
        if (data != nullptr) {
            pass({static_cast<const std::int16_t*>(data), size / sizeof(std::int16_t)});
        } else {
            moments_.reset();  // a hole: the server lost something
        }
        pa_stream_drop(stream_);
    }
}

/// Sound of which the server cannot say yet when it was is dropped; that is a moment after the start.
void RecordStream::pass(std::span<const std::int16_t> samples) {
    pa_usec_t latency = 0;
    int isNegative = 0;
    if (pa_stream_get_latency(stream_, &latency, &isNegative) < 0) return;
    const std::chrono::microseconds age(static_cast<std::int64_t>(latency) * (isNegative != 0 ? -1 : 1));
    const auto frames = static_cast<std::int64_t>(samples.size() / channels_);
    receiver_.streamRecorded(*this, moments_.place(clock_->monotonicNow() - age, frames), samples);
}

}  // namespace kelvo::pulse
