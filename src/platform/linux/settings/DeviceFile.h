#pragma once

#include "platform/DeviceProperties.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>

namespace kelvo {

/// Device properties from "/etc/kelvod/device.json" under the device root, read once:
///
///     { "idiom": "phone" | "tablet" | "desktop", "internalBuild": false,
///       "chipIdentifier": 0, "mainScreenOrientation": 0.0,
///       "regionalBehaviorShutterClick": false }
///
/// Without the file, or a key of it, the device is a desktop of unknown chip and orientation and not an
/// internal build. What cannot be understood is logged and read as missing. Immutable; thread-safe.
class DeviceFile : public DeviceProperties {
  public:
    explicit DeviceFile(const DeviceRoot& root);

    DeviceIdiom idiom() override { return idiom_; }
    bool isInternalBuild() override { return isInternalBuild_; }
    std::int64_t chipIdentifier() override { return chipIdentifier_; }
    std::optional<float> mainScreenOrientation() override { return orientation_; }
    std::optional<bool> regionalBehaviorShutterClick() override { return shutterClick_; }

  private:
    DeviceIdiom idiom_ = DeviceIdiom::desktop;
    bool isInternalBuild_ = false;
    std::int64_t chipIdentifier_ = 0;
    std::optional<float> orientation_;
    std::optional<bool> shutterClick_;
};

}  // namespace kelvo
