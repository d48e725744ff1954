#include "RecordingFixture.h"
#include "support/Tones.h"

#include <algorithm>
#include <sys/mount.h>

namespace kelvo::test {
namespace {

using testing::Contains;
using testing::ElementsAre;
using testing::IsEmpty;
using StartAnswer = ClientProcess::StartAnswer;

class SystemRecordingTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }

    void blankScreen(bool isBlank) const {
        root_.write("new", isBlank ? "1" : "0");
        std::filesystem::rename(root_.path() + "/new", root_.path() + "/run/kelvod/notifications/" +
                                                           "com.quillon.plinth.hasBlankedScreen");
    }
};

/// With a sound server, which the daemon learns of as it starts.
class SoundRecordingTest : public RecordingFixture {
  protected:
    void SetUp() override {
        ASSERT_TRUE(sound_.start());
        startDaemon();
    }

    static double amplitude(const std::string& movie, const std::string& stream, double frequency) {
        std::vector<std::int16_t> samples;
        for (const float sample : decodedSound(movie, stream))
            samples.push_back(static_cast<std::int16_t>(std::clamp(sample, -1.0F, 1.0F) * 32767));
        return amplitudeOf(frequency, samples);
    }

    SoundServer sound_;
};

TEST_F(SoundRecordingTest, ScreenMicrophoneAndApplicationAreInTheSavedMovie) {
    const auto client = shell();
    const auto counter = application();
    const auto spoken = sound_.play(440, "micfeed");
    const auto played = sound_.play(880, "speaker", counter->processIdentifier());
    ASSERT_TRUE(eventually([&] {
        return std::ranges::count(sound_.answer("list short sink-inputs"), '\n') == 2;
    })) << "both play";
    EXPECT_EQ(client->start({{}, true, false, true, false}), (StartAnswer{0, true, false})) << log();
    EXPECT_EQ(client->flag("isRecording"), true);
    EXPECT_EQ(client->flag("isSystemRecording"), true);
    pass(4000ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_EQ(stopped->code, 0);
    EXPECT_GT(countedIn(stopped->movie), 30U);
    EXPECT_EQ(probeStream(stopped->movie, "v:0", "width,height"), "320,480");
    EXPECT_GT(amplitude(stopped->movie, "a:1", 440), 500) << "the microphone";
    EXPECT_GT(amplitude(stopped->movie, "a:0", 880), 500) << "the application";
    EXPECT_EQ(client->save(stopped->movie), 0) << log();
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(countedIn(library().front()), 30U);
    EXPECT_EQ(probeStream(library().front(), "a", "codec_name"), "aac") << "one mixed track";
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_EQ(client->flag("isRecording"), false);
    EXPECT_THAT(client->told().stops.copy(), IsEmpty()) << "the client's own stop needs no telling";
}

TEST_F(SystemRecordingTest, ClientWithoutTheRightIsRefused) {
    const auto client = application();
    EXPECT_EQ(client->start({{}, false, false, true, false}), (StartAnswer{-5810, false, false}));
    EXPECT_EQ(client->flag("isRecording"), false);
}

TEST_F(SystemRecordingTest, SecondStartSavesTheFirstRecordingAndBeginsAnother) {
    const auto client = shell();
    const auto counter = application();
    ASSERT_EQ(client->start({{}, false, false, true, false})->code, 0) << log();
    pass(1200ms);
    ASSERT_EQ(client->start({{}, false, false, true, false})->code, 0) << log();
    EXPECT_EQ(client->flag("isRecording"), true) << "the second one is not reset by the first one's end";
    ASSERT_EQ(library().size(), 1U) << log();
    EXPECT_GT(countedIn(library().front()), 10U);
    pass(600ms);
    const auto stopped = client->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_GT(countedIn(library().front()), 10U) << "the saved one is not written over";
    EXPECT_EQ(client->save(stopped->movie), 0);
    EXPECT_EQ(library().size(), 2U);
}

TEST_F(SystemRecordingTest, LockedDeviceRefusesAndEndsARecordingThatRuns) {
    const auto client = shell();
    const auto counter = application();
    ASSERT_EQ(client->start({{}, false, false, true, false})->code, 0) << log();
    pass(800ms);
    blankScreen(true);
    EXPECT_TRUE(eventually([&] { return stopCodes(*client).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*client), ElementsAre(-5806));
    EXPECT_TRUE(eventually([&] { return library().size() == 1; }, 20s));
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_EQ(client->start({{}, false, false, true, false}), (StartAnswer{-5809, false, false}));
    blankScreen(false);
    EXPECT_TRUE(eventually([&] { return client->start({{}, false, false, true, false})->code == 0; }, 20s));
}

TEST_F(SystemRecordingTest, ShellThatDiesLeavesTheRecordingToTheNextOne) {
    const auto counter = application();
    {
        const auto first = shell();
        ASSERT_EQ(first->start({{}, false, false, true, false})->code, 0) << log();
        pass(600ms);
        first->kill();
    }
    const auto next = shell();
    EXPECT_EQ(next->flag("isRecording"), true);
    const auto stopped = next->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
}

TEST_F(SystemRecordingTest, BroadcastWithoutASetUpIsRefused) {
    const auto client = shell();
    EXPECT_EQ(client->start({{}, false, true, true, false}), (StartAnswer{-5808, false, false}));
    EXPECT_EQ(client->flag("isRecording"), false);
}

TEST_F(SystemRecordingTest, ClientsThatComeAndGoLeaveNothingBehind) {
    const auto entriesOf = [this](const std::string& folder) {
        return std::distance(std::filesystem::directory_iterator(
                                 "/proc/" + std::to_string(daemon_->processIdentifier()) + "/" + folder),
                             std::filesystem::directory_iterator());
    };
    shell()->kill();
    EXPECT_TRUE(logs("connection INVALID"));
    const auto threads = entriesOf("task");
    const auto descriptors = entriesOf("fd");
    for (int i = 0; i < 10; ++i)
        shell()->kill();
    EXPECT_TRUE(eventually(
        [&] { return entriesOf("task") <= threads + 1 && entriesOf("fd") <= descriptors + 1; }, 20s))
        << threads << " threads, now " << entriesOf("task") << "; " << descriptors << " descriptors, now "
        << entriesOf("fd");
}

TEST_F(SystemRecordingTest, OnlyMoviesOfTheStoreAreSavedAndDeleted) {
    const auto client = shell();
    const std::string mine = root_.write("mine.mp4", "mine");
    EXPECT_EQ(client->save(mine), -5812);
    EXPECT_TRUE(std::filesystem::exists(mine));
}

TEST_F(SystemRecordingTest, SigtermFinishesAndSavesTheRecording) {
    const auto client = shell();
    const auto counter = application();
    ASSERT_EQ(client->start({{}, false, false, true, false})->code, 0) << log();
    pass(1200ms);
    daemon_->signal(SIGTERM);
    EXPECT_EQ(daemon_->waitForExit(), 0) << log();
    EXPECT_THAT(stopCodes(*client), ElementsAre(-5806));
    // A slow machine may have no time left to mix it.
    std::vector<std::string> movies = library().empty() ? store() : library();
    std::erase_if(movies, [](const auto& path) { return path.find("KVKelvo_Final") != std::string::npos; });
    ASSERT_EQ(movies.size(), 1U) << log();
    EXPECT_GT(countedIn(movies.front()), 10U);
    EXPECT_THAT(boxTypes(movies.front()), testing::Not(testing::HasSubstr("moof"))) << "indexed";
}

TEST_F(SystemRecordingTest, KilledDaemonLeavesAMovieThatPlaysAndTheNextOneSaysSo) {
    const auto counter = application();
    {
        const auto client = shell();
        ASSERT_EQ(client->start({{}, false, false, true, false})->code, 0) << log();
        pass(1500ms);
        daemon_->signal(SIGKILL);
        daemon_->waitForExit();
    }
    ASSERT_EQ(store().size(), 1U) << log();
    EXPECT_GT(countedIn(store().front()), 10U);
    std::filesystem::remove(socket());
    startDaemon();
    EXPECT_TRUE(logs("movies of an earlier run lie in the store: 1;"));
    const auto client = shell();
    EXPECT_EQ(client->save(store().front()), 0) << log();
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(countedIn(library().front()), 10U);
    EXPECT_TRUE(storeGetsEmpty());
}

/// The store on a volume of its own, on which less is free than a recording needs.
class FullStoreTest : public RecordingFixture {
  protected:
    void SetUp() override {
        std::filesystem::create_directories(storePath());
        if (::mount("none", storePath().c_str(), "tmpfs", 0, "size=90m") != 0)
            GTEST_SKIP() << "a small volume cannot be mounted here";
        isMounted_ = true;
        startDaemon();
    }
    void TearDown() override {
        daemon_.reset();
        if (isMounted_) ::umount2(storePath().c_str(), MNT_DETACH);
    }

    bool isMounted_ = false;
};

TEST_F(FullStoreTest, NothingStartsWithoutRoomForIt) {
    const auto client = shell();
    EXPECT_EQ(client->start({{}, false, false, true, false}), (StartAnswer{-5805, false, false}));
    const auto counter = application();
    EXPECT_EQ(counter->start({{counter->window()}, false, false, false, false}),
              (StartAnswer{-5805, false, false}));
    EXPECT_THAT(store(), IsEmpty());
}

}  // namespace
}  // namespace kelvo::test
