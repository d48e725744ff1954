#pragma once

#include "base/GlobalQueue.h"
#include "ipc/KVIOSurfaceObject.h"
#include "platform/simulated/SimulatedDevice.h"
#include "session/KVRecordingSession.h"
#include "support/LogRecorder.h"

#include <algorithm>
#include <cstring>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {

inline constexpr std::int32_t kNanoseconds = 1000000000;
inline constexpr const char* kStore = "/private/var/mobile/Library/KelvoKit//";
inline constexpr std::int32_t kClientPID = 501;

inline MediaTime at(std::int64_t value) {
    return MediaTime::make(value, kNanoseconds);
}

/// Writes down what it is given; each completion waits for the test.
class FakeMovieWriter : public MovieWriter {
  public:
    FakeMovieWriter(const Size& size, std::string path) : windowSize(size), outputPath(std::move(path)) {}

    void setBroadcastConfig(std::shared_ptr<const KVBroadcastConfiguration> configuration) override {
        broadcastConfig = std::move(configuration);
    }
    void setSystemRecording(bool isSystem) override { systemRecording = isSystem; }
    URL outputURL() const override { return URL::file(outputPath); }
    void startWritingHandler(StartHandler handler) override { startHandler = std::move(handler); }
    bool appendVideoSampleBuffer(const SampleBufferRef& sample, const AffineTransform& transform) override {
        video.push_back(sample);
        transforms.push_back(transform);
        return acceptsVideo;
    }
    void appendAudio1SampleBuffer(const SampleBufferRef& sample) override { audio1.push_back(sample); }
    void appendAudio2SampleBuffer(const SampleBufferRef& sample) override { audio2.push_back(sample); }
    void finishWritingWithHandler(URLHandler handler) override { finishHandler = std::move(handler); }
    void trimMovieWithURL(const URL& url, double startClipDuration, double endClipDuration,
                          const URL& outputFileURL, URLHandler handler) override {
        trims.push_back({url, startClipDuration, endClipDuration, outputFileURL});
        handler(outputFileURL);
    }
    void captureEnded(const MediaTime& captureTime) override { captureEnds.push_back(captureTime); }
    void notifyRecordingMayBeStopped() override { ++mayBeStopped; }
    void notifyRecordingResumed() override { ++resumed; }

    std::vector<std::int64_t> videoValues() const {
        std::vector<std::int64_t> values;
        for (const auto& sample : video)
            values.push_back(sample->presentationTime().value);
        return values;
    }

    struct Trim {
        URL url;
        double start;
        double end;
        URL output;
    };

    const Size windowSize;
    const std::string outputPath;
    std::vector<MediaTime> captureEnds;
    std::shared_ptr<const KVBroadcastConfiguration> broadcastConfig;
    bool systemRecording = false;
    bool acceptsVideo = true;
    StartHandler startHandler;
    URLHandler finishHandler;
    std::vector<SampleBufferRef> video;
    std::vector<AffineTransform> transforms;
    std::vector<SampleBufferRef> audio1;
    std::vector<SampleBufferRef> audio2;
    std::vector<Trim> trims;
    int mayBeStopped = 0;
    int resumed = 0;
};

/// Writes down its calls, in order.
class FakeCaptureManager : public CaptureManager {
  public:
    bool hasAudioCaptureDevice() override { return hasDevice; }
    void startMicrophoneCaptureWithOutput(SampleHandler output, DidStartHandler didStart) override {
        calls.push_back("start microphone");
        microphone = std::move(output);
        microphoneDidStart = std::move(didStart);
    }
    void startAppAudioCaptureForProcessID(std::int32_t pid, SampleHandler output,
                                          DidStartHandler didStart) override {
        calls.push_back("start app audio " + std::to_string(pid));
        appAudio = std::move(output);
        appAudioDidStart = std::move(didStart);
    }
    void stopAppAudioCapture() override { calls.push_back("stop app audio"); }
    void resumeAppAudioCaptureForProcessID(std::int32_t pid, SampleHandler output) override {
        calls.push_back("resume app audio " + std::to_string(pid));
        appAudio = std::move(output);
    }
    void stopAllCapture() override { calls.push_back("stop all"); }
    void setCaptureStartTime(const MediaTime& time) override { startTimes.push_back(time); }

    bool called(const std::string& call) const {
        return std::find(calls.begin(), calls.end(), call) != calls.end();
    }

    bool hasDevice = true;
    std::vector<std::string> calls;
    std::vector<MediaTime> startTimes;
    SampleHandler microphone;
    SampleHandler appAudio;
    DidStartHandler microphoneDidStart;
    DidStartHandler appAudioDidStart;
};

/// Writes down what a broadcast extension would be sent; action completions wait for the test.
class FakeExtensionLink : public BroadcastExtensionLink {
  public:
    void notifyExtensionOfAction(ExtensionAction action, std::function<void()> completion) override {
        actions.push_back(action);
        completions.push_back(std::move(completion));
    }
    void notifyExtensionOfVideoSampleBuffer(const SampleBufferRef& sample, SampleBuffer::Type type,
                                            std::uint32_t sampleOrientation) override {
        samples.emplace_back(type, sample);
        orientations.push_back(sampleOrientation);
    }
    void notifyExtensionOfAudioSampleBuffer(const SampleBufferRef& sample, SampleBuffer::Type type) override {
        samples.emplace_back(type, sample);
    }
    void notifyExtensionOfFrontmostProcessBundleID(const std::string& bundleID) override {
        frontmostBundleIDs.push_back(bundleID);
    }
    void processAudioSampleBufferForMP4ClipHandler(const SampleBufferRef& sample) override {
        clipAudio.push_back(sample);
    }
    void notifyBroadcastExtensionOfCompletedMovieWithURL(const std::optional<URL>& url,
                                                         bool finished) override {
        movies.emplace_back(url, finished);
    }
    void invalidateConnection() override { ++invalidations; }

    std::vector<ExtensionAction> actions;
    std::vector<std::function<void()>> completions;
    std::vector<std::pair<SampleBuffer::Type, SampleBufferRef>> samples;
    std::vector<std::uint32_t> orientations;
    std::vector<std::string> frontmostBundleIDs;
    std::vector<SampleBufferRef> clipAudio;
    std::vector<std::pair<std::optional<URL>, bool>> movies;
    int invalidations = 0;
};

/// A client that writes down what it is told.
class FakeClient : public KVClientProxyBase {
  public:
    struct AudioMessage {
        Bytes audio;
        AudioFormatRecord format;
        std::int64_t itemCount;
        SampleBuffer::Type type;
        TimingRecord timing;
    };

    void updateScreenRecordingState() override {}
    void updateBroadcastServiceInfo(const Dictionary&) override {}
    void updateBroadcastURL(const URL&) override {}
    void recordingDidStopWithError(const OptionalError&, const std::optional<URL>&) override {}
    void recordingLockInterrupted(const KVError&) override {}
    void recordingShouldResume() override { ++shouldResume; }
    void recordingDidPause() override { ++didPause; }
    void recordingTimerDidUpdate(const std::string&) override {}
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                  const RecordBytes<TimingRecord>& timingData) override {
        frames.emplace_back(surface->ioSurface(), recordFromBytes<TimingRecord>(timingData));
    }
    void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                       const RecordBytes<AudioFormatRecord>& absdData, std::int64_t itemCount,
                                       SampleBuffer::Type bufferType,
                                       const RecordBytes<TimingRecord>& timingData) override {
        sounds.push_back({Bytes(audioData.begin(), audioData.end()),
                          recordFromBytes<AudioFormatRecord>(absdData), itemCount, bufferType,
                          recordFromBytes<TimingRecord>(timingData)});
    }

    int shouldResume = 0;
    int didPause = 0;
    std::vector<std::pair<VideoSurfaceRef, TimingRecord>> frames;
    std::vector<AudioMessage> sounds;
};

/// The recording manager's side.
class FakeSessionDelegate : public KVRecordingSessionDelegate {
  public:
    void recordingSessionStoppedWithError(const SessionRef&, const OptionalError& error) override {
        stops.push_back(error ? error->code() : 0);
    }
    void broadcastSessionDidUpdateServiceInfo(const SessionRef&, const Dictionary&) override {}
    void broadcastSessionDidUpdateDuration(const SessionRef&, double seconds) override {
        durations.push_back(seconds);
    }
    void recordingSessionClientDidEnterBackground(const SessionRef&) override { ++background; }
    void recordingSessionClientDidEnterForeground(const SessionRef&) override { ++foreground; }

    std::vector<std::int64_t> stops;
    std::vector<double> durations;
    int background = 0;
    int foreground = 0;
};

/// What a movie completion was called with.
struct Outcome {
    std::optional<URL> movieURL;
    std::int64_t errorCode = 0;
};

/// A session of the application "com.example.paint" ("Paint") on the simulated device, with fakes around it.
class SessionFixture : public testing::Test {
  protected:
    SessionFixture() {
        SimulatedBundleContent paint;
        paint.bundleIdentifier = "com.example.paint";
        paint.name = "Paint";
        device.bundles->addBundle("/Applications/Paint.app", paint);
        device.bundles->addProcess(kClientPID, "/Applications/Paint.app/paint");
        makeSession("com.example.paint");
    }

    KVRecordingSession::Services services() {
        const auto localization = std::make_shared<KVLocalization>(device.bundles, device.languages);
        return {device.platform(),
                std::make_shared<KVTemporaryFileStore>(device.fileSystem, device.textFolding, device.clock),
                localization,
                std::make_shared<KVUserErrors>(localization),
                captureManager,
                [this](const Size& size, const std::string& path) {
                    writer = std::make_shared<FakeMovieWriter>(size, path);
                    return writer;
                }};
    }
    void makeSession(const std::string& bundleID) {
        session = KVRecordingSession::create(bundleID, services());
        configure();
    }
    void configure() {
        session->setDelegate(delegate);
        session->setClientProxy(client);
        session->setContextIDs({11, 12});
        session->setWindowSize({108, 192});
    }
    void makeSystemSession() {
        makeSession("com.quillon.plinth");
        session->setSystemRecording(true);
    }
    std::shared_ptr<FakeExtensionLink> broadcast(BroadcastProcessMode mode) {
        auto link = std::make_shared<FakeExtensionLink>();
        session->setBroadcastExtension(link);
        session->setBroadcastProcessMode(mode);
        session->setBroadcasting(true);
        return link;
    }

    /// Starts, as the recording manager does, and lets the writer get ready.
    void start() {
        session->setRecording(true);
        session->startSessionWithHandler([this] { ++startCompletions; });
        if (writer && writer->startHandler) std::exchange(writer->startHandler, nullptr)();
        device.screen->catchUp();
    }
    /// Lets the recorded screen show another picture, at least an interval later.
    void showFrame() {
        device.advance(std::chrono::milliseconds(50));
        device.screen->show(++shown);
    }
    /// Delivers a frame of this time as the screen source would.
    void frame(std::int64_t value, const ScreenTransform& transform = {}) {
        session->screenCaptureControllerDidReceiveSampleBuffer(*source, videoSample(value), transform);
    }
    SampleBufferRef videoSample(std::int64_t value) const {
        return SampleBuffer::video(surface, {at(5), at(value), at(value)});
    }
    static SampleBufferRef audioSample(std::int64_t value) {
        return SampleBuffer::audio(AudioFormatRecord::signed16(44100, 1), Bytes(8, std::byte{7}), 4,
                                   {at(4), at(value), at(value)});
    }
    std::vector<Outcome> finish(double startClip = 0, double endClip = 0) {
        session->finishSessionWithStartClipDuration(startClip, endClip,
                                                    [this](const auto& url, const auto& error) {
                                                        outcomes.push_back({url, error ? error->code() : 0});
                                                    });
        return outcomes;
    }
    void completeMovie(const std::optional<URL>& url) { std::exchange(writer->finishHandler, nullptr)(url); }

    LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<FakeCaptureManager> captureManager = std::make_shared<FakeCaptureManager>();
    std::shared_ptr<FakeMovieWriter> writer;
    std::shared_ptr<FakeSessionDelegate> delegate = std::make_shared<FakeSessionDelegate>();
    std::shared_ptr<FakeClient> client = std::make_shared<FakeClient>();
    std::shared_ptr<KVRecordingSession> session;
    std::shared_ptr<ScreenCaptureSource> source =
        device.screen->createSource({108, 192}, MediaTime::make(1, 60));
    VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(108, 192));
    int startCompletions = 0;
    std::uint32_t shown = 0;
    std::vector<Outcome> outcomes;
};

}  // namespace kelvo::test
