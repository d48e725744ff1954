#include "platform/linux/sounds/PulseSystemSounds.h"

#include "base/KVLog.h"
#include "platform/linux/files/ReadFile.h"
#include "platform/linux/sounds/SoundPlayback.h"

#include <cerrno>
#include <chrono>
#include <filesystem>
#include <string>

namespace kelvo {
namespace {

constexpr int kMostWaiting = 4;
constexpr std::chrono::seconds kLongestSound{3};

std::string fileOf(std::uint32_t soundID, const DeviceRoot& root) {
    const std::string name = "/Sounds/" + std::to_string(soundID) + ".wav";
    std::string own = root.hostPath("/System/Library" + name);
    std::error_code ignored;
    return std::filesystem::exists(own, ignored) ? own : root.resourceFolder() + name;
}

void logFailure(std::uint32_t soundID, const KVError& error) {
    KVLogError("cannot play system sound %u: %s", soundID, error.localizedDescription().c_str());
}

}  // namespace

void PulseSystemSounds::playSystemSound(std::uint32_t soundID) {
    if (++waiting_ > kMostWaiting) {
        --waiting_;
        return logFailure(soundID, KVError::posix(EAGAIN, "other sounds"));
    }
    queue_.async([this, soundID] {
        const OptionalError error = play(soundID);
        --waiting_;
        if (error && !isGoing_) logFailure(soundID, *error);
    });
}

OptionalError PulseSystemSounds::play(std::uint32_t soundID) const {
    if (isGoing_) return std::nullopt;
    const auto bytes = readFile(fileOf(soundID, *root_), SoundFile::kMostBytes);
    if (!bytes) return bytes.error();
    const auto sound = SoundFile::parse(*bytes);
    if (!sound) return sound.error();
    return SoundPlayback(*sound).run(kLongestSound, isGoing_);
}

}  // namespace kelvo
