#pragma once

#include "base/Result.h"

namespace kelvo {

/// The display of the car that the device is connected to. Implemented by the Linux adapter (a state file)
/// and by the simulated device. Any thread.
class InCarDisplay {
  public:
    virtual ~InCarDisplay() = default;
    /// Whether the car's display shows this device now; an error when that cannot be found out.
    virtual Result<bool> isActive() = 0;
};

}  // namespace kelvo
