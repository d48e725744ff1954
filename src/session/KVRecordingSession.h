#pragma once

#include "base/Geometry.h"
#include "base/Guarded.h"
#include "base/ScreenTransform.h"
#include "base/SerialQueue.h"
#include "ipc/KVBroadcastConfiguration.h"
#include "ipc/KVUserErrors.h"
#include "media/CaptureManager.h"
#include "media/MovieWriter.h"
#include "platform/Platform.h"
#include "session/BroadcastExtensionLink.h"
#include "session/KVRecordingSessionDelegate.h"
#include "session/RecordingSession.h"
#include "session/RunningCleanUps.h"
#include "session/ShouldStopLock.h"
#include "support/KVLocalization.h"
#include "support/KVReportingAgent.h"
#include "support/KVTemporaryFileStore.h"

#include <atomic>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// One recording, in-app capture or broadcast of one client bundle, or the one recording of the whole screen.
/// Owns the screen source, the movie writer and the taps, and moves them together:
///
///     idle --start--> starting --writer or extension ready--> running --pause--> paused --resume--> running
///      ^                 |                                       |                  |
///      +-----------------+-------- finish, clean-up, stop -------+------------------+
///
/// `recording` is set by the recording manager when it starts the session and cleared by every stop. A
/// finished session can be started again.
///
/// Samples take one path each: into the movie, to the in-app capture's client, or to the broadcast extension.
///
/// Fields may be read from any thread. Configuration, start, pause, resume, finish and the environment's
/// callbacks belong to the recording manager's queue; completions run on the queues of the writer, the
/// capture manager or the extension link. Frames arrive on the screen source's thread, sound on the capture
/// threads.
class KVRecordingSession : public RecordingSession,
                           public ScreenCaptureDelegate,
                           public std::enable_shared_from_this<KVRecordingSession> {
  public:
    /// What a session needs of the world.
    struct Services {
        Platform platform;
        std::shared_ptr<KVTemporaryFileStore> store;
        std::shared_ptr<KVLocalization> localization;
        std::shared_ptr<KVUserErrors> errors;
        std::shared_ptr<CaptureManager> captureManager;
        MovieWriterFactory createMovieWriter;
        /// Shared by the sessions whose movies can get the same name.
        std::shared_ptr<RunningCleanUps> cleanUps = std::make_shared<RunningCleanUps>();
    };
    using CompletionHandler = std::function<void()>;

    static std::shared_ptr<KVRecordingSession> create(std::string bundleID, Services services);

    // Configuration, before the start.
    std::vector<std::uint32_t> contextIDs() const { return contextIDs_.copy(); }
    void setContextIDs(std::vector<std::uint32_t> contextIDs) override {
        contextIDs_.set(std::move(contextIDs));
    }
    /// The capture size: the size last set, limited so that its longer side is no longer than the device
    /// records, unless the preference "KVFullResCapture" lifts that.
    Size windowSize() const { return windowSize_.copy(); }
    Size originalWindowSize() const { return originalWindowSize_.copy(); }
    void setWindowSize(const Size& size) override;
    bool microphoneEnabled() const override { return microphoneEnabled_; }
    /// Switches the microphone, also while recording. Off means silence, the tap goes on.
    void setMicrophoneEnabled(bool enabled) override;
    bool microphoneEnabledPersistent() const override { return microphoneEnabledPersistent_; }
    void setMicrophoneEnabledPersistent(bool enabled) override { microphoneEnabledPersistent_ = enabled; }
    void setSystemRecording(bool systemRecording) override { systemRecording_ = systemRecording; }
    bool isCapturing() const override { return captureRecording_; }
    void setCaptureRecording(bool captureRecording) override { captureRecording_ = captureRecording; }
    void setBroadcasting(bool broadcasting) override { isBroadcasting_ = broadcasting; }
    bool hasUserConsentForCamera() const override { return hasUserConsentForCamera_; }
    void setHasUserConsentForCamera(bool consent) override { hasUserConsentForCamera_ = consent; }
    bool hasUserConsentForMicrophone() const override { return hasUserConsentForMicrophone_; }
    void setHasUserConsentForMicrophone(bool consent) override { hasUserConsentForMicrophone_ = consent; }
    /// An in-app session taps the microphone only with the daemon's own consent.
    bool daemonUserConsentForMicrophone() const { return daemonUserConsentForMicrophone_; }
    void setDaemonUserConsentForMicrophone(bool consent) override {
        daemonUserConsentForMicrophone_ = consent;
    }
    void setClientProxy(ClientProxyRef proxy) override { clientProxy_.set(std::move(proxy)); }
    void setDelegate(std::weak_ptr<KVRecordingSessionDelegate> delegate) override {
        delegate_.set(std::move(delegate));
    }
    /// A session with a link broadcasts through it; none ends that.
    std::shared_ptr<BroadcastExtensionLink> broadcastExtension() const override {
        return broadcastExtension_.copy();
    }
    void setBroadcastExtension(std::shared_ptr<BroadcastExtensionLink> link) {
        broadcastExtension_.set(std::move(link));
    }
    BroadcastProcessMode broadcastProcessMode() const { return broadcastProcessMode_; }
    void setBroadcastProcessMode(BroadcastProcessMode mode) { broadcastProcessMode_ = mode; }
    std::shared_ptr<const KVBroadcastConfiguration> broadcastConfiguration() const {
        return broadcastConfiguration_.copy();
    }
    void setBroadcastConfiguration(std::shared_ptr<const KVBroadcastConfiguration> configuration) override {
        broadcastConfiguration_.set(std::move(configuration));
    }
    long broadcastFragmentIndex() const { return broadcastFragmentIndex_; }
    void setBroadcastFragmentIndex(long index) { broadcastFragmentIndex_ = index; }
    SerialQueue& broadcastServiceInfoQueue() { return broadcastServiceInfoQueue_; }
    /// The process whose sound is recorded; below 1 means none.
    std::int32_t frontmostPIDForAudioTap() const { return frontmostPIDForAudioTap_; }
    void setFrontmostPIDForAudioTap(std::int32_t processIdentifier) override {
        frontmostPIDForAudioTap_ = processIdentifier;
    }
    std::optional<Dictionary> extensionInfo() const override { return extensionInfo_.copy(); }
    std::optional<URL> interruptedMovieURL() const override { return interruptedMovieURL_.copy(); }
    bool ownsMovie(const URL& movieURL) const override;
    bool isWritingMovie(const URL& movieURL) const override;

    /// What the client wants its extension to know.
    std::optional<Dictionary> broadcastUserInfo() const { return broadcastUserInfo_.copy(); }
    /// Takes the settings over and fails: there is no link to extensions.
    OptionalError enableBroadcastWithExtension(const Value& extension, BroadcastProcessMode processMode,
                                               const Dictionary& userInfo,
                                               const std::shared_ptr<IPCEndpoint>& listenerEndpoint) override;
    void disableBroadcast() override;

    // State.
    bool isPaused() const override { return paused_; }
    bool haveMicTap() const { return haveMicTap_; }
    bool sessionWasResumed() const;
    MediaTime firstSampleTimestamp() const;
    MediaTime lastSampleTimestamp() const;
    MediaTime sampleTimeOffset() const;
    std::optional<Date> captureStartTime() const { return captureStartTime_.copy(); }
    std::optional<std::string> bundleIDOfFirstForegroundApp() const {
        return bundleIDOfFirstForegroundApp_.copy();
    }
    std::shared_ptr<MovieWriter> movieWriter() const { return movieWriter_.copy(); }
    /// Replaces the writer between two fragments of a broadcast.
    void setMovieWriter(std::shared_ptr<MovieWriter> writer) { movieWriter_.set(std::move(writer)); }
    std::shared_ptr<KVReportingAgent> reportingAgent() const { return reportingAgent_.copy(); }

    // Names, made anew at every call: they carry the time.
    std::string outputPath() const;
    URL outputURL() const { return URL::file(outputPath()); }
    /// Kept, but no name is ever taken from it.
    void setOutputURL(URL url) { storedOutputURL_.set(std::move(url)); }
    std::string trimmedOutputPath() const;
    URL trimmedOutputURL() const { return URL::file(trimmedOutputPath()); }

    // Life cycle.
    /// Begins a recording. `completion`, which may be none, runs when capturing has begun.
    void startSessionWithHandler(CompletionHandler completion) override;
    void pauseSession() override;
    /// Goes on with a window of the client's. Nothing unless paused. The time of the pause is cut out.
    void resumeSessionWithContextID(std::uint32_t contextID) override;
    /// Stops a running recording; with `notify` the delegate hears of it.
    void stopRecordingWithNotification(bool notify, const OptionalError& error);
    void stopAllCapture();
    void noteCaptureEnd();

    // Environment.
    void frontmostApplicationDidChange(std::int32_t processIdentifier) override;
    void frontmostApplicationWasTerminated(std::int32_t processIdentifier) override;
    void frontmostApplicationDidEnterBackground(std::int32_t processIdentifier) override;
    void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) override;
    void updateBundleIdForFirstForegroundApp();
    void clientApplicationDidEnterBackground() override;
    void clientApplicationDidEnterForeground() override;

    /// Notes which camera was used: 1 is the back one, 2 the front one.
    void sessionReportCameraUsage(std::uint32_t cameraPosition);
    void setupMicTap();
    bool isNativeScreenOrientationPortrait() const;
    Size _maximumSizeWithSize(const Size& size) const;
    std::int64_t chipId() const;
    std::string _serviceNameForReporting() const;
    /// The orientation value, 1 to 8, that an extension gets with a frame.
    static std::uint32_t orientationFromVelaTransform(const ScreenTransform& transformFlags) {
        return imageOrientation(transformFlags);
    }

    // `RecordingSession`.
    std::string bundleID() const override { return bundleID_; }
    bool isRecording() const override { return recording_; }
    bool isBroadcasting() const override { return isBroadcasting_; }
    bool isSystemRecording() const override { return systemRecording_; }
    ClientProxyRef clientProxy() const override { return clientProxy_.copy(); }
    void setRecording(bool recording) override { recording_ = recording; }
    void setPaused(bool paused) override { paused_ = paused; }
    void setExtensionInfo(std::optional<Dictionary> info) override { extensionInfo_.set(std::move(info)); }
    void setInterruptedMovieURL(std::optional<URL> url) override { interruptedMovieURL_.set(std::move(url)); }
    void finishSessionWithHandler(MovieHandler completion) override;
    void finishSessionWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler completion) override;
    void finishAndCleanupSessionFilesWithHandler(CompletionHandler completion) override;
    void notifyRecordingMayBeStopped() override;
    void notifyRecordingResumed() override;

    // `ScreenCaptureDelegate`.
    void screenCaptureControllerDidReceiveSampleBuffer(ScreenCaptureSource& source,
                                                       const SampleBufferRef& sample,
                                                       const ScreenTransform& transformFlags) override;
    void screenCaptureControllerDidFailWithStatus(ScreenCaptureSource& source,
                                                  ScreenCaptureStatus status) override;
    void screenCaptureControllerWasPreempted(ScreenCaptureSource& source) override;
    void screenCaptureControllerMediaServicesWereReset(ScreenCaptureSource& source) override;

    // The capture manager's samples.
    void processMicrophoneSample(const SampleBufferRef& sample);
    void processAppAudioSample(const SampleBufferRef& sample);

  protected:
    KVRecordingSession(std::string bundleID, Services services);

    /// `source` presented at `updatedTimeStamp`, sharing its content; none when it cannot be copied.
    virtual SampleBufferRef _copySampleBufferFromSourceBuffer(const SampleBufferRef& source,
                                                              const MediaTime& updatedTimeStamp) const;

  private:
    using SampleHandler = CaptureManager::SampleHandler;

    /// Where the recording stands on the samples' clock. Raw values, all at the source's timescale.
    struct Timeline {
        MediaTime firstSampleTimestamp = MediaTime::zero();
        MediaTime lastSampleTimestamp = MediaTime::invalid();
        MediaTime sampleTimeOffset = MediaTime::zero();
        bool sessionWasResumed = false;
        bool hasBegun = false;  ///< a frame has come since the start
    };

    /// Tells one run of capturing from the next: whoever starts it late sees that it was stopped meanwhile.
    using CaptureRun = std::uint64_t;

    // Life cycle.
    void resetForStart();
    std::shared_ptr<MovieWriter> makeMovieWriter();
    Size sizeForScreen() const;
    void _resumeOrStartSession(CaptureRun run);
    void setupMirroring();
    void prepareScreenSource(int frameRate);
    bool wantsMicTap() const;
    void startScreenSource(CaptureRun run);
    CaptureRun currentRun() const;
    void finishBroadcast(MovieHandler completion);
    void finishMovie(double startClipDuration, double endClipDuration, MovieHandler completion);
    void deliverMovie(const std::optional<URL>& movieURL, double startClipDuration, double endClipDuration,
                      const MovieHandler& completion);
    void notifyExtensionOfAction(ExtensionAction action, CompletionHandler completion);
    std::string localizedAppName() const;
    SampleHandler microphoneOutput();
    SampleHandler appAudioOutput();
    int frameRate() const;

    // Pipeline.
    void _processSampleBufferForStreaming(const SampleBufferRef& sample, const ScreenTransform& flags);
    void _processSampleBuffer(const SampleBufferRef& sample, const ScreenTransform& flags);
    void beginTimeline(const MediaTime& presentationTime);
    void moveTimeline(const MediaTime& presentationTime);
    void _updateSampleBufferWithOffset(const SampleBufferRef& sample, const SampleHandler& handler);
    void routeVideo(const SampleBufferRef& sample, const ScreenTransform& flags);
    void updateDuartionWithSample(const SampleBuffer& sample);
    void packageVideoSampleBufferForCapture(const SampleBufferRef& sample);
    void packageAudioSampleBufferForCapture(const SampleBufferRef& sample, SampleBuffer::Type type);
    void failWith(KVRecordingErrorCode code);

    // Reporting.
    void reportSummaryEvent(std::int64_t endReason);
    std::uint64_t getRecordedFileSize() const;

    const std::string bundleID_;
    const Services services_;

    Guarded<ClientProxyRef> clientProxy_;
    Guarded<std::weak_ptr<KVRecordingSessionDelegate>> delegate_;
    Guarded<std::vector<std::uint32_t>> contextIDs_;
    Guarded<Size> windowSize_;
    Guarded<Size> originalWindowSize_;
    std::atomic<bool> microphoneEnabled_{false};
    std::atomic<bool> microphoneEnabledPersistent_{false};
    std::atomic<bool> systemRecording_{false};
    std::atomic<bool> captureRecording_{false};
    std::atomic<bool> hasUserConsentForCamera_{false};
    std::atomic<bool> hasUserConsentForMicrophone_{false};
    std::atomic<bool> daemonUserConsentForMicrophone_{false};
    mutable std::atomic<std::int64_t> chipId_{0};

    std::atomic<bool> recording_{false};
    std::atomic<bool> paused_{false};
    std::atomic<bool> isBroadcasting_{false};
    std::atomic<bool> haveMicTap_{false};
    ShouldStopLock shouldStopLock_;
    bool shouldStop_ = false;  ///< only under its lock
    std::atomic<std::int32_t> frontmostPIDForAudioTap_{0};
    Guarded<std::optional<std::string>> bundleIDOfFirstForegroundApp_;
    Guarded<std::optional<URL>> interruptedMovieURL_;
    Guarded<URL> storedOutputURL_;
    Guarded<std::optional<Date>> captureStartTime_;
    Guarded<Timeline> timeline_;

    Guarded<std::optional<Dictionary>> extensionInfo_;
    Guarded<std::shared_ptr<BroadcastExtensionLink>> broadcastExtension_;
    Guarded<std::optional<Dictionary>> broadcastUserInfo_;
    std::atomic<BroadcastProcessMode> broadcastProcessMode_{BroadcastProcessMode::movieClips};
    Guarded<std::shared_ptr<const KVBroadcastConfiguration>> broadcastConfiguration_;
    std::atomic<long> broadcastFragmentIndex_{0};
    SerialQueue broadcastServiceInfoQueue_{"com.quillon.kelvod.ServiceInfoQueue"};

    Guarded<std::shared_ptr<MovieWriter>> movieWriter_;
    Guarded<std::shared_ptr<KVReportingAgent>> reportingAgent_;

    /// Orders the start of the source, which may come late and on another thread, against stops. Never held
    /// while the source is stopped: that waits for a frame, which may itself be stopping the session.
    mutable std::mutex screenMutex_;
    std::shared_ptr<ScreenCaptureSource> screenCaptureController_;
    CaptureRun captureRun_ = 0;
};

/// Makes sessions that record with the services of `platform`.
SessionFactory recordingSessionFactory(const Platform& platform);

}  // namespace kelvo
