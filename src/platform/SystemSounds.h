#pragma once

#include <cstdint>

namespace kelvo {

/// The sounds that the system makes for itself, by number.
enum SystemSoundID : std::uint32_t {
    kSystemSoundBeginRecording = 1117,
    kSystemSoundEndRecording = 1118,
};

/// Plays the system's own sounds. Implemented by the Linux adapter (sound files among the resources) and the
/// simulated device. Any thread; returns at once, and what cannot be played is only logged.
class SystemSounds {
  public:
    virtual ~SystemSounds() = default;
    virtual void playSystemSound(std::uint32_t soundID) = 0;
};

}  // namespace kelvo
