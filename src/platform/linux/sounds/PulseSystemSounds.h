#pragma once

#include "base/KVError.h"
#include "base/SerialQueue.h"
#include "platform/SystemSounds.h"
#include "platform/linux/files/DeviceRoot.h"

#include <atomic>
#include <memory>

namespace kelvo {

/// The system's own sounds as "Sounds/<number>.wav": in "/System/Library" of the device root, else among the
/// installed resources. They are played on the user's sound server one after another, in the background, each
/// for three seconds at most. One that cannot be played is one line in the log and silence; so is one that
/// comes while four others wait. Thread-safe; a sound that is on is cut when this object goes.
class PulseSystemSounds : public SystemSounds {
  public:
    explicit PulseSystemSounds(std::shared_ptr<const DeviceRoot> root) : root_(std::move(root)) {}
    ~PulseSystemSounds() override { isGoing_ = true; }

    void playSystemSound(std::uint32_t soundID) override;

  private:
    OptionalError play(std::uint32_t soundID) const;

    const std::shared_ptr<const DeviceRoot> root_;
    std::atomic<bool> isGoing_{false};
    std::atomic<int> waiting_{0};
    SerialQueue queue_{"com.quillon.kelvod.sounds"};  // ends before what its tasks use
};

}  // namespace kelvo
