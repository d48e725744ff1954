#pragma once

#include "platform/Platform.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>
#include <string>

namespace kelvo {

/// Every service of this Linux system, for a daemon on that device root whose movies are in the folder
/// `storePath` of the device. But for its alerts, which clients show. Reads the environment: before other
/// threads start.
Platform linuxPlatform(const std::shared_ptr<const DeviceRoot>& root, const std::string& storePath,
                       bool savesToUsersVideos);

}  // namespace kelvo
