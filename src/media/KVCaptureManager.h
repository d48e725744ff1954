#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "media/AppAudioTap.h"
#include "media/CaptureManager.h"
#include "platform/Platform.h"

#include <atomic>
#include <memory>
#include <optional>
#include <string_view>

namespace kelvo {

/// A place on the screen that shows what a camera sees.
class PreviewLayer;

/// Captures audio (and, through the same path, camera video) for recording sessions: the microphone through a
/// capture session, and one application's own sound through a tap. One for the process. Thread-safe.
///
///     idle --startMicrophone...--> starting --session runs--> running --stopMicrophoneCapture--> idle
///     no tap --startAppAudio... or resumeAppAudio...--> running --stopAppAudioCapture--> no tap
///
/// Starts and stops run one after the other on `audioDispatchQueue`: starts later, stops before they return,
/// so that a stop waits for the starts before it. Microphone samples reach their handler on
/// `sessionSampleBufferQueue`, application audio and the tap's did-start handler on `audioDispatchQueue`.
/// Once a stop has returned its handlers do not run. A handler may itself stop capture: that stop returns
/// without waiting for the other handlers.
///
/// Nothing here reports an error: what cannot be captured yields no samples.
class KVCaptureManager : public CaptureManager,
                         public CaptureOutputDelegate,
                         public CaptureSessionObserver,
                         public std::enable_shared_from_this<KVCaptureManager> {
  public:
    /// The process's one manager, made on first use on the services of `platform`.
    static std::shared_ptr<KVCaptureManager> sharedManager(const Platform& platform);
    static std::shared_ptr<KVCaptureManager> create(const Platform& platform);

    /// The process's one queue for the starts and stops of capture and for the tap's buffers.
    static SerialQueue& audioDispatchQueue();

    /// True, always: whether there is one shows in whether samples come.
    bool hasAudioCaptureDevice() override { return true; }

    /// Nothing happens while the microphone is recorded already: neither handler is kept or called. Without
    /// `output` the handler before stays. `didStart` (may be none) is called once, when the capture session
    /// runs.
    void startMicrophoneCaptureWithOutput(SampleHandler output, DidStartHandler didStart) override;
    /// The capture session runs on, without its input and output.
    void stopMicrophoneCapture();

    /// Taps `processIdentifier`; a tap that runs already is let go. `didStart` (may be none) is called once
    /// the tap runs.
    void startAppAudioCaptureForProcessID(std::int32_t processIdentifier, SampleHandler output,
                                          DidStartHandler didStart) override;
    /// The same without a did-start handler; the first buffer is preceded by one silent sample, as long as
    /// the time since the last one ended, presented at time zero.
    void resumeAppAudioCaptureForProcessID(std::int32_t processIdentifier, SampleHandler output) override;
    void stopAppAudioCapture() override;

    void startCaptureSession();
    void stopCaptureSession();

    /// Stops everything and forgets the output handlers and times.
    void stopAllCapture() override;

    /// The platform's callbacks: samples on `sessionSampleBufferQueue`, the others on any thread.
    void captureOutputDidOutputSampleBuffer(const CaptureOutputRef& output, const SampleBufferRef& sample,
                                            const CaptureConnection& connection) override;
    void observeValueForKeyPath(std::string_view keyPath, CaptureSession& session) override;
    void handleAudioSessionInterruption(std::uint64_t type);

    /// Where the recording's timeline starts. While it is not set no recording is in progress: buffers of the
    /// tap are dropped then and do not return to their queue.
    void setCaptureStartTime(const MediaTime& time) override { captureStartTime_.set(time); }
    MediaTime captureStartTime() const { return captureStartTime_.copy(); }

    CaptureSessionRef captureSession() const { return captureSession_.copy(); }
    /// Takes the observation of the session before away.
    void setCaptureSession(CaptureSessionRef session);
    const std::shared_ptr<SerialQueue>& sessionSampleBufferQueue() const { return sampleQueue_; }
    CaptureInputRef captureDeviceAudioInput() const { return captureDeviceAudioInput_.copy(); }
    CaptureOutputRef captureSessionAudioDataOutput() const { return captureSessionAudioDataOutput_.copy(); }
    bool isRecordingMicrophone() const { return recordingMicrophone_; }
    bool isSessionInProgress() const { return sessionInProgress_; }
    bool isMicInterrupted() const { return micInterrupted_; }
    std::optional<Date> lastMicAudioDate() const { return lastMicAudioDate_.copy(); }
    std::optional<Date> lastAudioDate() const { return lastAudioDate_.copy(); }
    MediaTime micInterruptionPresentationTimeStamp() const {
        return micInterruptionPresentationTimeStamp_.copy();
    }
    /// The running tap; none without one. On `audioDispatchQueue`.
    std::shared_ptr<const AppAudioTap> audioRecorderQueue() const { return audioRecorderQueue_; }
    const AudioFormatRecord& audioBasicDescription() const { return audioBasicDescription_; }
    const AudioTimeStamp& initialTimestamp() const { return initialTimestamp_; }
    bool isRecordingAppAudio() const { return recordingAppAudio_; }

    /// The camera's part, which the daemon holds and never sets up.
    CaptureInputRef captureDeviceVideoInput() const { return captureDeviceVideoInput_.copy(); }
    void setCaptureDeviceVideoInput(CaptureInputRef input) { captureDeviceVideoInput_.set(std::move(input)); }
    CaptureOutputRef captureSessionVideoDataOutput() const { return captureSessionVideoDataOutput_.copy(); }
    void setCaptureSessionVideoDataOutput(CaptureOutputRef output) {
        captureSessionVideoDataOutput_.set(std::move(output));
    }
    void setCameraOutputHandler(SampleHandler handler) { cameraOutputHandler_.set(std::move(handler)); }
    std::shared_ptr<PreviewLayer> avPreviewLayer() const { return avPreviewLayer_.copy(); }
    void setAvPreviewLayer(std::shared_ptr<PreviewLayer> layer) { avPreviewLayer_.set(std::move(layer)); }
    std::int64_t cameraPosition() const { return cameraPosition_; }
    void setCameraPosition(std::int64_t position) { cameraPosition_ = position; }
    bool isRecordingCamera() const { return recordingCamera_; }

  private:
    using TapRef = std::shared_ptr<AppAudioTap>;
    /// One filled buffer, as the queue handed it over.
    struct FilledBuffer {
        AudioQueueBufferRef buffer;
        AudioTimeStamp start;
        std::uint32_t packetCount = 0;
        std::vector<AudioPacketDescription> packetDescriptions;
    };

    explicit KVCaptureManager(const Platform& platform);
    void setUpAudioSession();

    /// Runs `task` on `audioDispatchQueue`, or in place when the caller is a task of it.
    static void onDispatchQueue(const Task& task);
    void waitForRunningMicrophoneHandler() const;

    void startMicrophone(SampleHandler output, DidStartHandler didStart);
    void addMicrophoneToSession(CaptureSession& session);
    void runSession(const CaptureSessionRef& session);
    void removeRunningObservation(const CaptureSessionRef& session) const;
    void callMicDidStartHandler();
    void removeMicrophone();
    void deliverMicrophoneSample(const SampleBufferRef& sample);
    void checkAndHandleMicInterruption(const SampleHandler& output);

    void startTap(std::int32_t processIdentifier, SampleHandler output, DidStartHandler didStart);
    Result<AudioInputQueueRef> createInputQueue(const TapRef& tap);
    static void allocateBuffers(AppAudioTap& tap);
    void listenToTap(const TapRef& tap);
    void tapRunningStateChanged(const TapRef& tap);
    void inputBufferFilled(const std::weak_ptr<AppAudioTap>& tap, FilledBuffer filled);
    void handleInputBuffer(const TapRef& tap, const FilledBuffer& filled);
    void fillGapAfterResume();
    void stopTap();

    const std::shared_ptr<AudioService> audio_;
    const std::shared_ptr<Clock> clock_;
    const std::shared_ptr<AudioSession> audioSession_;
    const std::shared_ptr<SerialQueue> sampleQueue_;
    const AudioFormatRecord audioBasicDescription_;
    const AudioTimeStamp initialTimestamp_;

    Guarded<CaptureSessionRef> captureSession_;
    Guarded<CaptureInputRef> captureDeviceAudioInput_;
    Guarded<CaptureInputRef> captureDeviceVideoInput_;
    Guarded<CaptureOutputRef> captureSessionAudioDataOutput_;
    Guarded<CaptureOutputRef> captureSessionVideoDataOutput_;
    Guarded<std::shared_ptr<PreviewLayer>> avPreviewLayer_;
    std::atomic<std::int64_t> cameraPosition_{0};

    Guarded<SampleHandler> microphoneOutputHandler_;
    Guarded<SampleHandler> cameraOutputHandler_;
    Guarded<SampleHandler> appAudioOutputHandler_;
    Guarded<DidStartHandler> micDidStartHandler_;
    Guarded<DidStartHandler> appTapDidStartHandler_;

    std::atomic<bool> recordingMicrophone_{false};
    std::atomic<bool> recordingCamera_{false};
    std::atomic<bool> recordingAppAudio_{false};
    std::atomic<bool> sessionInProgress_{false};
    std::atomic<bool> micInterrupted_{false};
    std::atomic<bool> resumed_{false};
    Guarded<MediaTime> captureStartTime_{MediaTime::invalid()};
    Guarded<MediaTime> micInterruptionPresentationTimeStamp_{MediaTime::zero()};
    Guarded<std::optional<Date>> lastMicAudioDate_;
    Guarded<std::optional<Date>> lastAudioDate_;
    TapRef audioRecorderQueue_;
};

}  // namespace kelvo
