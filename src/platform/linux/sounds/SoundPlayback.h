#pragma once

#include "platform/linux/sounds/SoundFile.h"

#include <atomic>
#include <chrono>
#include <pulse/pulseaudio.h>

namespace kelvo {

/// Plays one sound on the user's sound server, over a connection of its own. One thread.
class SoundPlayback {
  public:
    explicit SoundPlayback(const SoundFile& sound);
    ~SoundPlayback();
    SoundPlayback(const SoundPlayback&) = delete;
    SoundPlayback& operator=(const SoundPlayback&) = delete;

    /// Returns when the sound has been heard or cannot be; with an error, too, when that takes longer than
    /// `limit`, and soon after `isCancelled` is set.
    OptionalError run(std::chrono::milliseconds limit, const std::atomic<bool>& isCancelled);

  private:
    void contextStateChanged();
    void beginStream();
    void write(std::size_t wanted);
    void fail();

    const SoundFile& sound_;
    pa_mainloop* const loop_;
    pa_context* const context_;
    pa_stream* stream_ = nullptr;
    std::size_t written_ = 0;
    bool isFinished_ = false;
    OptionalError error_;
};

}  // namespace kelvo
