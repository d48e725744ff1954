#pragma once

#include "base/SampleBuffer.h"

#include <cstdint>
#include <functional>

namespace kelvo {

/// Captures the microphone and the sound of applications for whichever session records. One for the process.
/// Thread-safe. Outputs are called on the capture threads, one sample at a time each; once a stop has
/// returned, the outputs it ended are not called any more. A did-start handler is called once what it waits
/// for runs, or not at all.
class CaptureManager {
  public:
    using SampleHandler = std::function<void(const SampleBufferRef&)>;
    using DidStartHandler = std::function<void()>;

    virtual ~CaptureManager() = default;

    virtual bool hasAudioCaptureDevice() = 0;

    /// Nothing happens while the microphone is captured already.
    virtual void startMicrophoneCaptureWithOutput(SampleHandler output, DidStartHandler didStart) = 0;

    /// Taps what process `processIdentifier` (1 or more) plays.
    virtual void startAppAudioCaptureForProcessID(std::int32_t processIdentifier, SampleHandler output,
                                                  DidStartHandler didStart) = 0;
    virtual void stopAppAudioCapture() = 0;
    /// Taps another process after a stop, on the timeline that was begun.
    virtual void resumeAppAudioCaptureForProcessID(std::int32_t processIdentifier, SampleHandler output) = 0;

    /// Ends everything and forgets the outputs.
    virtual void stopAllCapture() = 0;

    /// Where the recording's timeline begins, or where it goes on after a pause. Application audio reaches
    /// its output from then on; `stopAllCapture` takes it back.
    virtual void setCaptureStartTime(const MediaTime& time) = 0;
};

}  // namespace kelvo
