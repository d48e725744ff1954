#pragma once

#include "base/Guarded.h"
#include "platform/DeviceProperties.h"
#include "platform/linux/files/DeviceRoot.h"

#include <functional>
#include <memory>

namespace kelvo {

/// Device properties from "/etc/kelvod/device.json" under the device root, read once:
///
///     { "idiom": "phone" | "tablet" | "desktop", "internalBuild": false,
///       "chipIdentifier": 0, "mainScreenOrientation": 0.0,
///       "regionalBehaviorShutterClick": false }
///
/// Without the file, or a key of it, the device is a desktop of unknown chip and not an internal build, and
/// its screen is asked how it was built. What cannot be understood is logged and read as missing.
/// Thread-safe.
class DeviceFile : public DeviceProperties {
  public:
    using AskScreen = std::function<std::optional<float>()>;

    /// `askScreen` tells the main screen's orientation when the file does not, on whichever thread wants to
    /// know; it is asked until it has answered once, since a display may come up later than the daemon.
    explicit DeviceFile(const DeviceRoot& root, AskScreen askScreen = nullptr);

    DeviceIdiom idiom() override { return idiom_; }
    bool isInternalBuild() override { return isInternalBuild_; }
    std::int64_t chipIdentifier() override { return chipIdentifier_; }
    std::optional<float> mainScreenOrientation() override;
    std::optional<bool> regionalBehaviorShutterClick() override { return shutterClick_; }

  private:
    DeviceIdiom idiom_ = DeviceIdiom::desktop;
    bool isInternalBuild_ = false;
    std::int64_t chipIdentifier_ = 0;
    const AskScreen askScreen_;
    Guarded<std::optional<float>> orientation_;
    std::optional<bool> shutterClick_;
};

}  // namespace kelvo
