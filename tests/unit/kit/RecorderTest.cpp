#include "ipc/KVBroadcastConfigurationCoding.h"
#include "ipc/KVClientProtocolTable.h"
#include "kit/LocalDaemon.h"
#include "kit/RecorderCore.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeDaemon.h"

#include <cmath>
#include <deque>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvokit {
namespace {

using kelvo::Guarded;
using testing::ElementsAre;

/// A daemon that says yes.
struct WillingDaemon : kelvo::test::FakeDaemon {
    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windows,
                                             const kelvo::Size& size, bool microphone, bool camera,
                                             bool broadcast, bool system, bool capture,
                                             const std::shared_ptr<kelvo::IPCEndpoint>& listener,
                                             StartHandler handler) override {
        const StartHandler answer = [&](const kelvo::OptionalError& error, bool, bool) {
            handler(isWilling ? std::nullopt : error, isWilling && microphone, false);
        };
        FakeDaemon::startRecordingWindowLayerContextIDs(windows, size, microphone, camera, broadcast, system,
                                                        capture, listener, answer);
    }
    void connectionManagerDidAcceptNewConnection(const kelvo::IPCConnectionRef& connection,
                                                 const std::optional<std::string>& bundle) override {
        FakeDaemon::connectionManagerDidAcceptNewConnection(connection, bundle);
        client.set(connection);
    }
    std::atomic<bool> isWilling{true};
    Guarded<kelvo::IPCConnectionRef> client;
};

/// A recorder before a fake daemon on a simulated device; its executor and its timer run when the test says
/// so.
class RecorderTest : public testing::Test {
  protected:
    using Task = std::function<void()>;

    RecorderTest() {
        startDaemon();
        recorder->onState([this](const RecorderState& state) { states.push_back(state); });
        recorder->onConnectionLost([this](const Error& error) { losses.push_back(error.code); });
        recorder->onConnectionRestored([this] { ++restorations; });
        recorder->onStop([this](const auto& movie, const auto& error) {
            stops.emplace_back(movie.value_or(""), error ? error->code : 0);
        });
    }

    void startDaemon() {
        listener = device.ipc->createListener("com.quillon.kelvod");
        isDaemonUp = true;
        manager->setDelegate(daemon);
        listener->setDelegate(manager);
        listener->resume();
    }
    /// Every connection of the daemon ends, and nobody listens any more.
    void killDaemon() {
        isDaemonUp = false;
        if (const auto client = daemon->client.exchange(nullptr)) client->invalidate();
        settle();
    }
    kelvo::Result<kelvo::IPCConnectionRef> connect() {
        ++attempts;
        if (!isDaemonUp) return kelvo::KVError::posix(ECONNREFUSED, "/run/socket");
        auto connection = device.ipc->connectToService("com.quillon.kelvod");
        if (afterConnecting) afterConnecting();
        return connection;
    }

    /// Everything that follows from what was done has happened, on the executor too.
    void settle() {
        do {
            device.settle();
        } while (runExecutor() > 0);
    }
    int runExecutor() {
        int ran = 0;
        for (auto next = nextTask(); next; next = nextTask(), ++ran)
            next();
        return ran;
    }
    Task nextTask() {
        return tasks.with([](auto& all) {
            if (all.empty()) return Task();
            Task first = std::move(all.front());
            all.pop_front();
            return first;
        });
    }
    /// The pause that the timer waits for; its task runs now.
    std::chrono::milliseconds fireTimer() {
        auto [pause, task] = timers.with([](auto& all) {
            auto first = std::move(all.front());
            all.pop_front();
            return first;
        });
        task();
        settle();
        return pause;
    }

    template <typename Use>
    void asDaemon(Use use) {
        const auto connection = daemon->client.copy();
        kelvo::RemoteClient client = kelvo::remoteClient(*connection, "client");
        use(client);
        settle();
    }
    Recorder::StartHandler noteStart() {
        return [this](const std::optional<Error>& error, bool microphone, bool) {
            answers.emplace_back((error ? std::to_string(error->code) : "started") +
                                 (microphone ? "+mic" : ""));
        };
    }
    Recorder::DoneHandler noteDone() {
        return [this](const std::optional<Error>& error) {
            answers.push_back(error ? std::to_string(error->code) : "done");
        };
    }
    Recorder::MovieHandler noteMovie() {
        return [this](const std::optional<std::string>& movie, const std::optional<Error>& error) {
            answers.push_back(movie.value_or("") + (error ? std::to_string(error->code) : ""));
        };
    }
    void startRecording() {
        recorder->start({{7}, 100, 200, true, false});
        settle();
    }

    kelvo::SimulatedDevice device;
    std::shared_ptr<WillingDaemon> daemon = std::make_shared<WillingDaemon>();
    std::shared_ptr<kelvo::KVLocalization> localization =
        std::make_shared<kelvo::KVLocalization>(device.bundles, device.languages);
    std::shared_ptr<kelvo::KVConnectionManager> manager =
        std::make_shared<kelvo::KVConnectionManager>(device.ipc, localization);
    std::shared_ptr<kelvo::IPCListener> listener;
    bool isDaemonUp = false;
    int attempts = 0;
    std::function<void()> afterConnecting;
    Guarded<std::deque<Task>> tasks;
    Guarded<std::deque<std::pair<std::chrono::milliseconds, Task>>> timers;
    std::vector<RecorderState> states;
    std::vector<std::int64_t> losses;
    int restorations = 0;
    std::vector<std::pair<std::string, std::int64_t>> stops;
    std::vector<std::string> answers;
    std::unique_ptr<Recorder> recorder = RecorderTestAccess::make(
        {[this] { return connect(); },
         [this](auto pause, auto task) {
             timers.with([&](auto& all) { all.emplace_back(pause, std::move(task)); });
         },
         [this](auto task) { tasks.with([&](auto& all) { all.push_back(std::move(task)); }); },
         std::make_shared<kelvo::KVUserErrors>(localization)});
};

TEST_F(RecorderTest, StartSendsWhatIsToBeRecorded) {
    recorder->start({{7, 9}, 100, 200.5, true, true}, noteStart());
    settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs"));
    EXPECT_EQ(daemon->arguments().front(),
              (kelvo::Array{kelvo::Array{7, 9}, 100.0, 200.5, true, true, false, false, false, false}));
    EXPECT_THAT(answers, ElementsAre("started+mic"));
}

TEST_F(RecorderTest, CaptureAndBroadcastAreStartsOfTheirOwnKind) {
    recorder->startCapture({});
    recorder->startBroadcast({});
    settle();
    const auto arguments = daemon->arguments();
    EXPECT_EQ(arguments[0][5], false);
    EXPECT_EQ(arguments[0][7], true);
    EXPECT_EQ(arguments[1][5], true);
    EXPECT_EQ(arguments[1][7], false);
    EXPECT_TRUE(recorder->state().isBroadcasting);
}

TEST_F(RecorderTest, RefusedStartGivesTheDaemonsErrorAndChangesNothing) {
    daemon->isWilling = false;
    recorder->start({}, noteStart());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5"));
    EXPECT_FALSE(recorder->state().isRecording);
}

TEST_F(RecorderTest, StateFollowsWhatIsDone) {
    startRecording();
    recorder->pause();
    settle();
    recorder->resume(7);
    recorder->setMicrophoneEnabled(false);
    recorder->stop();
    settle();
    EXPECT_THAT(
        states,
        ElementsAre(
            RecorderState{.isConnected = true},
            RecorderState{.isConnected = true, .isRecording = true, .isMicrophoneEnabled = true},
            RecorderState{
                .isConnected = true, .isRecording = true, .isPaused = true, .isMicrophoneEnabled = true},
            RecorderState{.isConnected = true, .isRecording = true, .isMicrophoneEnabled = true},
            RecorderState{.isConnected = true, .isRecording = true}, RecorderState{.isConnected = true}));
    EXPECT_THAT(daemon->requests(),
                ElementsAre("startRecordingWindowLayerContextIDs", "pauseRecording",
                            "resumeRecordingWithWindowLayerContextID", "setMicrophoneEnabled",
                            "stopRecordingWithStartClipDuration"));
}

TEST_F(RecorderTest, PauseAndMicrophoneWithoutARecordingChangeNoState) {
    recorder->pause();
    recorder->setMicrophoneEnabled(true);
    settle();
    EXPECT_EQ(recorder->state(), RecorderState{.isConnected = true});
}

TEST_F(RecorderTest, StopWithTrimSendsBothDurations) {
    recorder->stop(1.5, 2.5, noteMovie());
    settle();
    EXPECT_EQ(daemon->arguments().front(), (kelvo::Array{1.5, 2.5}));
    EXPECT_THAT(answers, ElementsAre("-5"));
}

TEST_F(RecorderTest, SaveSendsThePathAsAURLAndGivesTheError) {
    recorder->save("/movies/a b.mp4", noteDone());
    settle();
    EXPECT_EQ(daemon->arguments().front(), kelvo::Array{kelvo::URL::file("/movies/a b.mp4")});
    EXPECT_THAT(answers, ElementsAre("-5"));
}

TEST_F(RecorderTest, DiscardIsAnswered) {
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
}

TEST_F(RecorderTest, DiscardWhileRecordingFailsWithoutAskingADaemonThatWouldBeSilent) {
    startRecording();
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5804"));
    EXPECT_THAT(daemon->requests(), ElementsAre("startRecordingWindowLayerContextIDs"));
}

TEST_F(RecorderTest, BroadcastIsSetUpWithItsArchivedConfiguration) {
    device.ipc->setIdentity(5, {{"com.quillon.private.kelvo-kit.can-setup-broadcast", true}});
    recorder->setUpBroadcast(
        {"host", "extension", 2.5, {{"rate", std::int64_t{3}}}, {{"key", std::string("text")}}}, noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
    const kelvo::Array sent = daemon->arguments().front();
    EXPECT_EQ(sent[0], "host");
    EXPECT_EQ(sent[1], "extension");
    EXPECT_EQ(sent[3], (kelvo::Dictionary{{"key", "text"}}));
    const auto archived =
        kelvo::unarchived<kelvo::KVBroadcastConfigurationCoding>(*sent[2].as<kelvo::Bytes>());
    ASSERT_TRUE(archived);
    EXPECT_EQ(archived->clipDuration(), 2.5);
    EXPECT_EQ(archived->videoCompressionProperties(), (kelvo::Dictionary{{"rate", 3}}));
}

TEST_F(RecorderTest, BroadcastSetUpWithoutTheRightIsRefused) {
    recorder->setUpBroadcast({}, [this](const std::optional<Error>& error) {
        ASSERT_TRUE(error);
        EXPECT_TRUE(error->is(ErrorCode::broadcastSetupRefused));
        answers.emplace_back("refused");
    });
    settle();
    EXPECT_THAT(answers, ElementsAre("refused"));
}

TEST_F(RecorderTest, BroadcastQueriesGiveWhatTheDaemonKnows) {
    std::vector<std::byte> host;
    std::vector<Dictionary> extensions;
    bool isOn = false;
    recorder->getBroadcastImages([&](const auto& image, const auto&, const auto&) { host = image; });
    recorder->getBroadcastExtensions([&](const auto& found, const auto&) { extensions = found; });
    recorder->isBroadcasting("preferred", [&](bool value, const auto&) { isOn = value; });
    recorder->setBroadcastURL("https://example.com/live");
    settle();
    EXPECT_EQ(host, (std::vector{std::byte{1}, std::byte{2}}));
    EXPECT_THAT(extensions, ElementsAre(Dictionary{{"displayName", std::string("One")}},
                                        Dictionary{{"displayName", std::string("Two")}}));
    EXPECT_TRUE(isOn);
    EXPECT_EQ(daemon->arguments().back(), kelvo::Array{kelvo::URL("https://example.com/live")});
}

TEST_F(RecorderTest, CallbacksReachTheirHandlers) {
    startRecording();
    std::vector<std::string> heard;
    recorder->onLock([&](const Error& error) { heard.push_back("lock " + error.description); });
    recorder->onShouldResume([&] { heard.emplace_back("resume"); });
    recorder->onTimer([&](const std::string& text) { heard.push_back(text); });
    recorder->onBroadcastURL([&](const std::string& url) { heard.push_back(url); });
    recorder->onBroadcastInfo(
        [&](const Dictionary& info) { heard.push_back(std::get<std::string>(info.at("a"))); });
    asDaemon([](auto& client) {
        client.recordingLockInterrupted(
            {"d", -5809, {{std::string(kelvo::kLocalizedDescriptionKey), "locked"}}});
        client.recordingDidPause();
        client.recordingShouldResume();
        client.recordingTimerDidUpdate("0:07");
        client.updateBroadcastURL(kelvo::URL("https://x"));
        client.updateBroadcastServiceInfo({{"a", "b"}, {"left out", kelvo::Array{1}}});
    });
    EXPECT_THAT(heard, ElementsAre("lock locked", "resume", "0:07", "https://x", "b"));
    EXPECT_TRUE(recorder->state().isPaused);
}

TEST_F(RecorderTest, RecordingThatEndsByItselfIsReportedWithItsMovie) {
    startRecording();
    asDaemon([](auto& client) {
        client.recordingDidStopWithError(kelvo::KVError("d", -5806, {}), kelvo::URL("file:///m.mp4"));
    });
    EXPECT_THAT(stops, ElementsAre(std::pair("/m.mp4", -5806)));
    EXPECT_FALSE(recorder->state().isRecording);
}

TEST_F(RecorderTest, ChangedDaemonIsAskedForItsState) {
    startRecording();
    recorder->stop();
    settle();
    EXPECT_FALSE(recorder->state().isRecording);
    asDaemon([](auto& client) { client.updateScreenRecordingState(); });
    EXPECT_TRUE(recorder->state().isRecording);
}

TEST_F(RecorderTest, FrameMayBeKeptPastItsHandlerAndGoesBackWhenDropped) {
    startRecording();
    std::optional<Frame> kept;
    recorder->onFrame([&](const Frame& frame) { kept = frame; });
    kelvo::VideoSurfaceRef surface =
        *kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2));
    surface->writablePixels()[5] = std::byte{9};
    const std::weak_ptr watched = surface;
    asDaemon([&](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(std::move(surface));
        client.captureHandlerWithSample(
            object, kelvo::bytesOfRecord(kelvo::TimingRecord{{}, kelvo::MediaTime::make(3, 2), {}}));
    });
    ASSERT_TRUE(kept);
    EXPECT_EQ(kept->width(), 4U);
    EXPECT_EQ(kept->height(), 2U);
    EXPECT_EQ(kept->bytesPerRow(), 16U);
    EXPECT_EQ(kept->pixels()[5], std::byte{9});
    EXPECT_EQ(kept->presentationTime(), std::chrono::milliseconds(1500));
    EXPECT_FALSE(watched.expired());
    kept.reset();
    EXPECT_TRUE(watched.expired());
}

TEST_F(RecorderTest, FrameThatNobodyWantsGoesBackAtOnce) {
    startRecording();
    kelvo::VideoSurfaceRef surface =
        *kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2));
    const std::weak_ptr watched = surface;
    asDaemon([&](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(std::move(surface));
        client.captureHandlerWithSample(object, {});
    });
    EXPECT_TRUE(watched.expired());
}

TEST_F(RecorderTest, SoundArrivesWithItsFormat) {
    startRecording();
    std::optional<AudioBuffer> heard;
    recorder->onAudio([&](const AudioBuffer& buffer) { heard = buffer; });
    asDaemon([](auto& client) {
        client.captureHandlerWithAudioSample(
            kelvo::Bytes(16, std::byte{1}), kelvo::bytesOfRecord(kelvo::AudioFormatRecord::float32(48000, 2)),
            2, kelvo::SampleBuffer::Type::microphone, {});
    });
    ASSERT_TRUE(heard);
    EXPECT_EQ(heard->source(), AudioBuffer::Source::microphone);
    EXPECT_EQ(heard->sampleRate(), 48000);
    EXPECT_EQ(heard->channels(), 2U);
    EXPECT_EQ(heard->bitsPerSample(), 32U);
    EXPECT_TRUE(heard->isFloat());
    EXPECT_FALSE(heard->isSigned());
    EXPECT_FALSE(heard->isPlanar());
    EXPECT_EQ(heard->frameCount(), 2);
    EXPECT_EQ(heard->bytes().size(), 16U);
    EXPECT_EQ(heard->presentationTime(), std::nullopt);
}

TEST_F(RecorderTest, SoundBeyondTheBoundIsDroppedAndCounted) {
    startRecording();
    int heard = 0;
    recorder->onAudio([&](const AudioBuffer&) { ++heard; });
    {
        const auto connection = daemon->client.copy();
        kelvo::RemoteClient client = kelvo::remoteClient(*connection, "client");
        for (int i = 0; i < kMostWaitingAudioBuffers + 3; ++i)
            client.captureHandlerWithAudioSample({}, {}, 0, kelvo::SampleBuffer::Type::applicationAudio, {});
        device.settle();
    }
    EXPECT_EQ(recorder->droppedAudioBuffers(), 3U);
    settle();
    EXPECT_EQ(heard, kMostWaitingAudioBuffers);
}

TEST_F(RecorderTest, AbsentDaemonIsAClearError) {
    isDaemonUp = false;
    std::optional<Error> error;
    recorder->save("/m.mp4", [&](const std::optional<Error>& given) { error = given; });
    settle();
    ASSERT_TRUE(error);
    EXPECT_TRUE(error->is(ErrorCode::connectionInvalid));
    EXPECT_THAT(error->detail, testing::HasSubstr("/run/socket"));
    EXPECT_THAT(losses, ElementsAre());
    EXPECT_FALSE(recorder->state().isConnected);
}

TEST_F(RecorderTest, EveryRequestFailsWhenTheDaemonIsAbsent) {
    isDaemonUp = false;
    recorder->start({}, noteStart());
    recorder->stop(noteMovie());
    recorder->discard(noteDone());
    recorder->setUpBroadcast({}, noteDone());
    recorder->getBroadcastImages([this](const auto&, const auto&, const auto& error) { noteDone()(error); });
    recorder->getBroadcastExtensions([this](const auto&, const auto& error) { noteDone()(error); });
    recorder->isBroadcasting("x", [this](bool, const auto& error) { noteDone()(error); });
    recorder->pause();
    settle();
    EXPECT_THAT(answers, testing::AllOf(testing::SizeIs(7), testing::Each("-5814")));
}

TEST_F(RecorderTest, RequestUnderWayFailsWhenTheDaemonIsLost) {
    daemon->keepsStopHandler = true;
    startRecording();
    const auto connection = daemon->client.copy();
    // The fake daemon never answers this one.
    daemon->onRequest.set([&](const std::string& request) {
        if (request == "saveVideoToCameraRoll") connection->invalidate();
    });
    recorder->save("/m.mp4", noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("-5815"));
}

TEST_F(RecorderTest, LostDaemonIsReportedAndItsRecordingIsGone) {
    startRecording();
    killDaemon();
    EXPECT_THAT(losses, ElementsAre(-5815));
    EXPECT_EQ(recorder->state(), RecorderState());
}

TEST_F(RecorderTest, DaemonIsLookedForWithGrowingPausesUntilItIsBack) {
    startRecording();
    killDaemon();
    std::vector<std::int64_t> pauses;
    for (int i = 0; i < 8; ++i)
        pauses.push_back(fireTimer().count());
    EXPECT_THAT(pauses, ElementsAre(100, 200, 400, 800, 1600, 3200, 5000, 5000));
    EXPECT_EQ(restorations, 0);
    startDaemon();
    fireTimer();
    EXPECT_EQ(restorations, 1);
    EXPECT_TRUE(recorder->state().isConnected);
    EXPECT_EQ(daemon->requests().back(), "synchronousGetCurrentState");
    EXPECT_TRUE(timers.copy().empty());
    killDaemon();
    EXPECT_EQ(fireTimer().count(), 100);
}

TEST_F(RecorderTest, RequestLooksForALostDaemonAtOnce) {
    startRecording();
    killDaemon();
    startDaemon();
    recorder->discard(noteDone());
    settle();
    EXPECT_THAT(answers, ElementsAre("done"));
}

TEST_F(RecorderTest, NoHandlerRunsOnceTheRecorderIsGone) {
    startRecording();
    recorder->discard(noteDone());
    device.settle();
    recorder.reset();
    settle();
    EXPECT_THAT(answers, ElementsAre());
}

TEST_F(RecorderTest, RecorderMayGoInsideAHandler) {
    recorder->stop([this](const auto&, const auto&) {
        recorder.reset();
        answers.emplace_back("gone");
    });
    settle();
    EXPECT_THAT(answers, ElementsAre("gone"));
}

TEST_F(RecorderTest, GoneRecorderLooksForNoDaemon) {
    startRecording();
    killDaemon();
    recorder.reset();
    const int before = attempts;
    fireTimer();
    EXPECT_EQ(attempts, before);
}

TEST_F(RecorderTest, RecorderThatGoesWhileItIsLookedForLeavesNoConnection) {
    startRecording();
    killDaemon();
    startDaemon();
    const std::size_t before = daemon->departures.copy().size();
    afterConnecting = [this] { recorder.reset(); };
    fireTimer();
    EXPECT_EQ(daemon->departures.copy().size(), before + 2);
}

TEST_F(RecorderTest, HandlerThatRunsAtOnceMayMakeRequests) {
    const auto direct =
        RecorderTestAccess::make({[this] { return connect(); }, [](auto, auto) {}, [](auto task) { task(); },
                                  std::make_shared<kelvo::KVUserErrors>(localization)});
    direct->onState([&](const RecorderState& state) {
        if (state.isConnected) direct->pause();
    });
    direct->discard();
    settle();
    EXPECT_THAT(daemon->requests(), ElementsAre("pauseRecording", "discardRecordingWithHandler"));
}

TEST_F(RecorderTest, RequestsWithoutAHandlerAreAllowed) {
    recorder->start({});
    recorder->stop();
    recorder->discard();
    recorder->save("/m.mp4");
    recorder->setUpBroadcast({});
    recorder->getBroadcastImages({});
    recorder->getBroadcastExtensions({});
    recorder->isBroadcasting("x", {});
    settle();
    isDaemonUp = false;
    killDaemon();
    recorder->start({});
    recorder->stop();
    settle();
    EXPECT_FALSE(recorder->state().isConnected);
}

TEST(SocketPathTest, OptionWinsOverTheEnvironmentAndThatOverTheUsualPlace) {
    ::unsetenv("KELVO_SOCKET");
    EXPECT_EQ(socketPath({}), "/run/kelvod/com.quillon.kelvod");
    ::setenv("KELVO_SOCKET", "/tmp/named", 1);
    EXPECT_EQ(socketPath({}), "/tmp/named");
    EXPECT_EQ(socketPath({.socketPath = "/tmp/given", .executor = {}}), "/tmp/given");
    ::unsetenv("KELVO_SOCKET");
}

TEST(LocalRecorderTest, AbsentDaemonIsToldWithATextForTheUser) {
    Recorder recorder({.socketPath = "/nonexistent/socket", .executor = [](auto task) { task(); }});
    std::optional<Error> error;
    recorder.discard([&](const std::optional<Error>& given) { error = given; });
    ASSERT_TRUE(error);
    EXPECT_TRUE(error->is(ErrorCode::connectionInvalid));
    EXPECT_EQ(error->description, "There is no valid connection to the recording service.");
    EXPECT_THAT(error->detail, testing::HasSubstr("/nonexistent/socket"));
}

}  // namespace
}  // namespace kelvokit
