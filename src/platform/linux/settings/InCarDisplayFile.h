#pragma once

#include "platform/InCarDisplay.h"
#include "platform/linux/files/DeviceRoot.h"

#include <memory>

namespace kelvo {

/// The car's display as the file "/run/kelvod/in-car-display" under the device root tells of it: a decimal
/// number, 0 while it does not show this device. Without the file there is no car; a file that holds no
/// number tells nothing, which is an error. Read at each query. Thread-safe.
class InCarDisplayFile : public InCarDisplay {
  public:
    explicit InCarDisplayFile(std::shared_ptr<const DeviceRoot> root) : root_(std::move(root)) {}

    Result<bool> isActive() override;

  private:
    const std::shared_ptr<const DeviceRoot> root_;
};

}  // namespace kelvo
