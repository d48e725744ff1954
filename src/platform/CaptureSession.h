#pragma once

#include "base/KVError.h"
#include "platform/AudioDataOutput.h"
#include "platform/CaptureDevice.h"

#include <memory>
#include <string_view>

namespace kelvo {

class CaptureSession;

/// Key path of a session's one observable property.
inline constexpr std::string_view kRunningKeyPath = "running";

/// Told on a thread of the adapter that a property of a session has changed. It may take its observation
/// away.
class CaptureSessionObserver {
  public:
    virtual ~CaptureSessionObserver() = default;
    virtual void observeValueForKeyPath(std::string_view keyPath, CaptureSession& session) = 0;
};

/// Takes what its inputs capture to its outputs while it runs. Implemented by the PulseAudio adapter and the
/// simulated device; used by the capture manager. Thread-safe.
///
/// An output yields samples while it and an input are in the session and the session runs. No delegate call
/// begins any more once `stopRunning`, `removeOutput` or the removal of the last input has returned; one that
/// is under way then may still end.
class CaptureSession {
  public:
    virtual ~CaptureSession() = default;

    virtual bool canAddInput(const CaptureInputRef& input) = 0;
    /// Nothing happens with an input that cannot be added, or with the removal of a strange one.
    virtual void addInput(const CaptureInputRef& input) = 0;
    virtual void removeInput(const CaptureInputRef& input) = 0;

    virtual bool canAddOutput(const CaptureOutputRef& output) = 0;
    /// As with inputs.
    virtual void addOutput(const CaptureOutputRef& output) = 0;
    virtual void removeOutput(const CaptureOutputRef& output) = 0;

    /// Whether it works with the process's own audio session, and whether it may set that one up by itself.
    virtual void setUsesApplicationAudioSession(bool uses) = 0;
    virtual void setAutomaticallyConfiguresApplicationAudioSession(bool configures) = 0;

    /// Asks the session to run. It runs some time later, whether its device is there or not: a device that
    /// comes back, or comes at all, is picked up.
    virtual void startRunning() = 0;
    virtual void stopRunning() = 0;
    virtual bool isRunning() = 0;

    /// `observer` hears of each change of the property `keyPath`.
    virtual void addObserver(std::weak_ptr<CaptureSessionObserver> observer, std::string_view keyPath) = 0;
    /// Fails when `observer` does not observe `keyPath`.
    virtual OptionalError removeObserver(const CaptureSessionObserver* observer,
                                         std::string_view keyPath) = 0;
};

using CaptureSessionRef = std::shared_ptr<CaptureSession>;

}  // namespace kelvo
