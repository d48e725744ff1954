#pragma once

#include "base/KVError.h"
#include "base/MediaRecords.h"
#include "base/SampleBuffer.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>

namespace kelvo {

class KVIOSurfaceObject;

/// What the daemon tells a client application. Every message is one-way; one that cannot be delivered is
/// logged and dropped. Called on whatever thread has the news; implementations are thread-safe and do not
/// wait for the client.
class KVClientProtocol {
  public:
    virtual ~KVClientProtocol() = default;

    /// The daemon's recording or broadcast state changed.
    virtual void updateScreenRecordingState() = 0;
    /// The broadcast extension published new service information.
    virtual void updateBroadcastServiceInfo(const Dictionary& serviceInfo) = 0;
    /// The broadcast extension published the address at which the broadcast can be watched.
    virtual void updateBroadcastURL(const URL& broadcastURL) = 0;
    /// A recording or broadcast stopped: why, and where the movie is that is kept for the client.
    virtual void recordingDidStopWithError(const OptionalError& error,
                                           const std::optional<URL>& movieURL) = 0;
    /// The recording was interrupted by the system (the device locked, recording was forbidden).
    virtual void recordingLockInterrupted(const KVError& error) = 0;
    /// The client may resume a paused recording.
    virtual void recordingShouldResume() = 0;
    virtual void recordingDidPause() = 0;
    /// The recording timer's text, at each tick.
    virtual void recordingTimerDidUpdate(const std::string& timerText) = 0;
    /// A captured video frame, by handle.
    virtual void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                          const RecordBytes<TimingRecord>& timingData) = 0;
    /// Captured sound: `itemCount` audio frames laid out as the format record says.
    virtual void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                               const RecordBytes<AudioFormatRecord>& absdData,
                                               std::int64_t itemCount, SampleBuffer::Type bufferType,
                                               const RecordBytes<TimingRecord>& timingData) = 0;
};

/// The type through which sessions hold their client, be it one application or all privileged ones at once.
class KVClientProxyBase : public KVClientProtocol {
  public:
    /// The client's process; 0 when it is not one alone, or gone.
    virtual std::int32_t processIdentifier() const { return 0; }

    /// Ends the connections of one process. A proxy of a single client has nothing to do here.
    virtual void resetConnectionWithProcessIdentifier(std::int32_t processIdentifier) {
        static_cast<void>(processIdentifier);
    }
};

using ClientProxyRef = std::shared_ptr<KVClientProxyBase>;

}  // namespace kelvo
