#pragma once

#include "base/KVError.h"

#include <cstdint>
#include <functional>

namespace kelvo {

/// What an interruption notification says. Anything else that a system may send means nothing to us.
enum AudioInterruptionType : std::uint64_t {
    kAudioInterruptionEnded = 0,
    kAudioInterruptionBegan = 1,
};

/// What the process means to do with sound.
enum class AudioSessionCategory { playback, record, playAndRecord };

/// Bits of the options of a category.
enum AudioSessionOption : std::uint32_t {
    kAudioMixWithOthers = 1U << 0,
    kAudioAllowHandsFreeWireless = 1U << 2,
};

/// The process's standing with the system's sound. Implemented by the PulseAudio adapter and the simulated
/// device; used by the capture manager. Thread-safe.
class AudioSession {
  public:
    /// Runs on any thread, behind the samples that came before the interruption. It must not call back into
    /// the audio service.
    using InterruptionHandler = std::function<void(std::uint64_t type)>;

    virtual ~AudioSession() = default;

    virtual OptionalError setCategory(AudioSessionCategory category, std::uint32_t options) = 0;

    /// `handler` hears of every interruption of capture from now on, in place of the handler before it: that
    /// the microphone was taken away (began) and that it is back (ended). None ends it.
    virtual void setInterruptionHandler(InterruptionHandler handler) = 0;
};

}  // namespace kelvo
