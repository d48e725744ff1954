#pragma once

namespace kelvo {

/// What helps the user to use the device. Implemented by a Linux adapter and the simulated device. Any
/// thread.
class Accessibility {
  public:
    virtual ~Accessibility() = default;
    /// Whether a screen reader speaks now.
    virtual bool isScreenReaderRunning() = 0;
};

}  // namespace kelvo
