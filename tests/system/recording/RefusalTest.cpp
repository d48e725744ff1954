#include "RecordingFixture.h"

#include <sys/mount.h>

namespace kelvo::test {
namespace {

/// Starts that are refused: what the client is told, and that nothing else has happened.
class RefusalTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }

    void setInCar(bool isInCar) const { root_.write("run/kelvod/in-car-display", isInCar ? "1\n" : "0\n"); }
    void blankScreen(bool isBlank) const {
        root_.write("new", isBlank ? "1" : "0");
        std::filesystem::rename(root_.path() + "/new", root_.path() + "/run/kelvod/notifications/" +
                                                           "com.quillon.plinth.hasBlankedScreen");
    }
};

TEST_F(RefusalTest, NobodyRecordsWhileTheCarShowsTheDevice) {
    const auto first = application();
    const auto client = shell();
    const auto accepting = user("other");
    setInCar(true);
    expectRefusal(*first, ownWindow(*first), -5813, 1);
    expectRefusal(*client, wholeScreen(), -5813, 1);
    EXPECT_EQ(askedTimes(), 0U);
    setInCar(false);
    ASSERT_EQ(first->start(ownWindow(*first)), (StartAnswer{0, false, false})) << log();
    setInCar(true);
    EXPECT_EQ(client->start(wholeScreen()), (StartAnswer{-5813, false, false}));
    EXPECT_EQ(first->flag("isRecording"), true) << "what runs goes on";
    pass(600ms);
    const auto stopped = first->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_THAT(first->told().stops.copy(), IsEmpty());
}

TEST_F(RefusalTest, ClientWithoutTheRightMayNotRecordTheScreen) {
    const auto client = application();
    expectRefusal(*client, wholeScreen(), -5810, 1);
}

TEST_F(RefusalTest, ForeignWindowsAreRefused) {
    const auto first = application("First");
    const auto second = application("Second");
    const auto accepting = user("other");
    expectRefusal(*second, ownWindow(*first), -5803, 0);
    expectRefusal(*second, {{12345}, false, false, false, false}, -5803, 0);
    expectRefusal(*second, {{second->window(), first->window()}, false, false, false, false}, -5803, 0);
    EXPECT_EQ(askedTimes(), 0U);
    EXPECT_EQ(timesLogged("KVRecordingManager:stopCurrentRecordingSession:"), 0U);
}

TEST_F(RefusalTest, ApplicationInTheBackIsRefused) {
    const auto first = application("First");
    const auto second = application("Second");
    const auto accepting = user("other");
    expectRefusal(*first, ownWindow(*first), -5803, 0);
    EXPECT_TRUE(logs("app is not in the foreground, calling handler with error"));
    EXPECT_EQ(askedTimes(), 0U);
}

TEST_F(RefusalTest, DecliningUserAndAbsentUserRefuse) {
    const auto client = application();
    expectRefusal(*client, ownWindow(*client), -5801, 0);
    EXPECT_TRUE(logs("error showing acknowledgement alert")) << "nobody to ask";
    const auto declining = user("default");
    expectRefusal(*client, ownWindow(*client), -5801, 0);
    EXPECT_TRUE(logs("user refused recording"));
    EXPECT_EQ(timesLogged("user declined"), 2U);
    expectRefusal(*client, ownWindow(*client), -5801, 0);
    EXPECT_EQ(askedTimes(), 3U) << "a refusal exempts nobody";
}

TEST_F(RefusalTest, ApplicationThatSharesTheScreenIsRefusedAfterItWasAllowed) {
    const XClient::Place leftHalf{0, 20, kWidth / 2 - 4, kHeight - 30};
    const XClient::Place rightHalf{kWidth / 2, 20, kWidth / 2 - 4, kHeight - 30};
    const auto left = application("Left", leftHalf);
    const auto right = application("Right", rightHalf);
    placeBeside(*left, leftHalf);
    placeBeside(*right, rightHalf);
    const auto accepting = user("other");
    expectRefusal(*right, ownWindow(*right), -5807, 0);
    EXPECT_TRUE(logs("attempted to start recording in split mode, bailing out"));
    EXPECT_EQ(askedTimes(), 1U);
    EXPECT_TRUE(logs("user acknowledged recording, but microphone recording is disabled"));
}

TEST_F(RefusalTest, BroadcastWithoutASetUpIsRefusedWithoutAText) {
    const auto client = shell();
    expectRefusal(*client, {{}, false, true, true, false}, -5808, 1);
    EXPECT_EQ(client->startError(), KVError(std::string(KVRecordingErrorDomain), -5808));
    const auto first = application();
    const auto accepting = user("other");
    expectRefusal(*first, {{first->window()}, false, true, false, false}, -5808, 1);
}

TEST_F(RefusalTest, LockedDeviceRefusesAndEndsARecordingThatRuns) {
    const auto client = shell();
    const auto counter = application();
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
    pass(800ms);
    blankScreen(true);
    EXPECT_TRUE(eventually([&] { return stopCodes(*client).size() == 1; }, 20s)) << log();
    EXPECT_THAT(stopCodes(*client), ElementsAre(-5806));
    EXPECT_TRUE(eventually([&] { return library().size() == 1; }, 20s));
    EXPECT_TRUE(storeGetsEmpty());
    EXPECT_GT(countedIn(library().front()), 5U);
    expectRefusal(*client, wholeScreen(), -5809, 1);
    EXPECT_TRUE(logs("failed to start system recording because device was in locked state"));
    blankScreen(false);
    EXPECT_TRUE(eventually([&] { return client->start(wholeScreen())->code == 0; }, 20s));
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
    expectRefusal(*client, wholeScreen(), -5805, 1);
    const auto counter = application();
    const auto accepting = user("other");
    expectRefusal(*counter, ownWindow(*counter), -5805, 1);
    EXPECT_EQ(timesLogged("insufficient disk space for recording, calling handler with error"), 2U);
    EXPECT_EQ(askedTimes(), 0U);
}

}  // namespace
}  // namespace kelvo::test
