#pragma once

#include <cstdint>
#include <optional>

namespace kelvo {

/// What kind of device this is. The user-interface idiom and the device family are one on Linux.
enum class DeviceIdiom { phone, tablet, desktop };

/// Facts about the device that do not change while the daemon runs. Implemented by the Linux adapter (a small
/// device file) and the simulated device. Any thread.
class DeviceProperties {
  public:
    virtual ~DeviceProperties() = default;

    virtual DeviceIdiom idiom() = 0;

    /// Whether this is an internal build of the platform, on which internal security policies are allowed and
    /// the engineers' preferences are read.
    virtual bool isInternalBuild() = 0;

    /// A number that tells chips apart; 0 when unknown.
    virtual std::int64_t chipIdentifier() = 0;

    /// The main screen's native orientation; 0 is portrait, none is unknown.
    virtual std::optional<float> mainScreenOrientation() = 0;

    /// Whether the law of the region where the device is sold wants recordings to be heard
    /// ("RegionalBehaviorShutterClick"); none when nothing is said about it.
    virtual std::optional<bool> regionalBehaviorShutterClick() = 0;
};

}  // namespace kelvo
