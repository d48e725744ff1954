#pragma once

#include <memory>
#include <string>

namespace kelvo {

/// Something that captures, such as a microphone. Implemented by the PulseAudio adapter and the simulated
/// device. Immutable, so thread-safe.
class CaptureDevice {
  public:
    virtual ~CaptureDevice() = default;

    /// For people and logs.
    virtual std::string name() const = 0;
};

/// A device as a session's input. Only a token: what it captures leaves the session through its outputs.
class CaptureInput {
  public:
    virtual ~CaptureInput() = default;
};

using CaptureDeviceRef = std::shared_ptr<CaptureDevice>;
using CaptureInputRef = std::shared_ptr<CaptureInput>;

}  // namespace kelvo
