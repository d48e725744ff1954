#include "platform/linux/sounds/SoundPlayback.h"

#include <algorithm>
#include <cerrno>

namespace kelvo {
namespace {

using Clock = std::chrono::steady_clock;

/// How long a cancelled sound may still go on.
constexpr int kSliceMicroseconds = 20000;

SoundPlayback* playback(void* self) {
    return static_cast<SoundPlayback*>(self);
}

}  // namespace

SoundPlayback::SoundPlayback(const SoundFile& sound)
    : sound_(sound),
      loop_(pa_mainloop_new()),
      context_(pa_context_new(pa_mainloop_get_api(loop_), "kelvod")) {}

SoundPlayback::~SoundPlayback() {
    if (stream_ != nullptr) {
        pa_stream_set_state_callback(stream_, nullptr, nullptr);
        pa_stream_set_write_callback(stream_, nullptr, nullptr);
        pa_stream_disconnect(stream_);
        pa_stream_unref(stream_);
    }
    pa_context_set_state_callback(context_, nullptr, nullptr);
    pa_context_disconnect(context_);
    pa_context_unref(context_);
    pa_mainloop_free(loop_);
}

OptionalError SoundPlayback::run(std::chrono::milliseconds limit, const std::atomic<bool>& isCancelled) {
    const auto changed = [](pa_context*, void* self) { playback(self)->contextStateChanged(); };
    pa_context_set_state_callback(context_, changed, this);
    if (pa_context_connect(context_, nullptr, PA_CONTEXT_NOAUTOSPAWN, nullptr) < 0) fail();
    const auto deadline = Clock::now() + limit;
    while (!isFinished_ && !error_) {
        if (isCancelled) return KVError::posix(ECANCELED, "the sound");
        if (Clock::now() > deadline) return KVError::posix(ETIMEDOUT, "the sound server");
        const bool isRunning = pa_mainloop_prepare(loop_, kSliceMicroseconds) >= 0 &&
                               pa_mainloop_poll(loop_) >= 0 && pa_mainloop_dispatch(loop_) >= 0;
        if (!isRunning) fail();
    }
    return error_;
}

void SoundPlayback::contextStateChanged() {
    const pa_context_state_t state = pa_context_get_state(context_);
    if (state == PA_CONTEXT_READY) beginStream();
    if (!PA_CONTEXT_IS_GOOD(state)) fail();
}

void SoundPlayback::beginStream() {
    const pa_sample_spec spec{PA_SAMPLE_S16LE, sound_.rate, sound_.channels};
    pa_proplist* const properties = pa_proplist_new();
    pa_proplist_sets(properties, PA_PROP_MEDIA_ROLE, "event");
    stream_ = pa_stream_new_with_proplist(context_, "system sound", &spec, nullptr, properties);
    pa_proplist_free(properties);
    if (stream_ == nullptr) return fail();
    pa_stream_set_state_callback(
        stream_,
        [](pa_stream* stream, void* self) {
            if (pa_stream_get_state(stream) == PA_STREAM_FAILED) playback(self)->fail();
        },
        this);
    pa_stream_set_write_callback(
        stream_, [](pa_stream*, std::size_t wanted, void* self) { playback(self)->write(wanted); }, this);
    if (pa_stream_connect_playback(stream_, nullptr, nullptr, PA_STREAM_NOFLAGS, nullptr, nullptr) < 0)
        fail();
}

/// Hands over what the server has room for; behind the last of it, waits until it was heard.
void SoundPlayback::write(std::size_t wanted) {
    const std::size_t count = std::min(wanted, sound_.samples.size() - written_);
    if (count == 0) return;
    if (pa_stream_write(stream_, sound_.samples.data() + written_, count, nullptr, 0, PA_SEEK_RELATIVE) < 0)
        return fail();
    written_ += count;
    if (written_ < sound_.samples.size()) return;
    const auto drained = [](pa_stream*, int, void* self) { playback(self)->isFinished_ = true; };
    if (pa_operation* const operation = pa_stream_drain(stream_, drained, this))
        pa_operation_unref(operation);
}

void SoundPlayback::fail() {
    const std::string reason = pa_strerror(pa_context_errno(context_));
    error_ = KVError("KVSoundServerErrorDomain", pa_context_errno(context_),
                     {{std::string(kLocalizedDescriptionKey), reason}});
}

}  // namespace kelvo
