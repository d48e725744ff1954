#pragma once

#include "base/SampleBuffer.h"
#include "base/SerialQueue.h"

#include <memory>

namespace kelvo {

/// An end of a capture session at which samples come out.
class CaptureOutput {
  public:
    virtual ~CaptureOutput() = default;
};

using CaptureOutputRef = std::shared_ptr<CaptureOutput>;

/// Which input of the session a sample came through.
struct CaptureConnection {
    std::string deviceName;
};

/// Receives what leaves the outputs of a capture session, on the queue that was set with it.
class CaptureOutputDelegate {
  public:
    virtual ~CaptureOutputDelegate() = default;
    virtual void captureOutputDidOutputSampleBuffer(const CaptureOutputRef& output,
                                                    const SampleBufferRef& sample,
                                                    const CaptureConnection& connection) = 0;
};

/// The output of a session's audio. Implemented by the PulseAudio adapter and the simulated device.
/// Thread-safe.
///
/// Samples are packed 16-bit linear PCM; each carries the moment at which its first frame reached the
/// microphone, on the host's monotonic clock in nanoseconds, and its duration.
class AudioDataOutput : public CaptureOutput {
  public:
    /// Samples go to `delegate` in tasks of `queue` from now on. Either may be none: samples are dropped
    /// then.
    virtual void setSampleBufferDelegate(std::weak_ptr<CaptureOutputDelegate> delegate,
                                         std::shared_ptr<SerialQueue> queue) = 0;
};

}  // namespace kelvo
