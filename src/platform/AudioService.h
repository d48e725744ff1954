#pragma once

#include "platform/AudioInputQueue.h"
#include "platform/AudioSession.h"
#include "platform/CaptureSession.h"

#include <memory>

namespace kelvo {

/// Makes what captures sound. Implemented by the PulseAudio adapter and the simulated device. Thread-safe.
/// What it made keeps working when the service is gone.
class AudioService {
  public:
    virtual ~AudioService() = default;

    /// The process's one audio session.
    virtual std::shared_ptr<AudioSession> audioSession() = 0;

    virtual CaptureSessionRef createCaptureSession() = 0;
    /// The microphone that the user prefers, whichever that is from time to time.
    virtual CaptureDeviceRef defaultAudioDevice() = 0;
    virtual Result<CaptureInputRef> createInput(const CaptureDeviceRef& device) = 0;
    virtual std::shared_ptr<AudioDataOutput> createAudioDataOutput() = 0;

    /// A queue that yields `format` (packed 16-bit linear PCM of one channel or two, either byte order).
    /// `flags` must hold `kAudioQueueTapsProcess`. Fails with `kAudioErrorDomain`.
    virtual Result<AudioInputQueueRef> createInputQueue(const AudioFormatRecord& format,
                                                        AudioInputCallback callback, std::uint32_t flags) = 0;
};

}  // namespace kelvo
