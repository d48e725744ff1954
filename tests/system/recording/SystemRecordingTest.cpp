#include "RecordingFixture.h"

namespace kelvo::test {
namespace {

class SystemRecordingTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }
};

TEST_F(SystemRecordingTest, SecondStartSavesTheFirstRecordingAndBeginsAnother) {
    const auto client = shell();
    const auto counter = application();
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
    pass(1200ms);
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
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
    for (const std::string& movie : library())
        EXPECT_GT(countedIn(movie), 5U);
    EXPECT_EQ(store().size(), 1U) << "the first one's file is nobody's to delete";
    EXPECT_THAT(stopCodes(*client), IsEmpty()) << "its own start ended it";
}

TEST_F(SystemRecordingTest, ShellThatDiesLeavesTheRecordingToTheNextOne) {
    const auto counter = application();
    {
        const auto first = shell();
        ASSERT_EQ(first->start(wholeScreen())->code, 0) << log();
        pass(600ms);
        first->kill();
    }
    const auto next = shell();
    EXPECT_EQ(next->flag("isRecording"), true);
    const auto stopped = next->stop();
    ASSERT_TRUE(stopped && !stopped->movie.empty()) << log();
    EXPECT_GT(countedIn(stopped->movie), 5U);
    EXPECT_EQ(next->save(stopped->movie), 0) << log();
    ASSERT_EQ(library().size(), 1U);
    EXPECT_GT(countedIn(library().front()), 5U);
    EXPECT_TRUE(storeGetsEmpty());
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
    ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
    pass(1200ms);
    const auto begin = std::chrono::steady_clock::now();
    daemon_->signal(SIGTERM);
    EXPECT_EQ(daemon_->waitForExit(), 0) << log();
    EXPECT_LT(std::chrono::steady_clock::now() - begin, 10s) << "five, but for a busy machine";
    EXPECT_TRUE(eventually([&] { return stopCodes(*client).size() == 1; }, 20s));
    EXPECT_THAT(stopCodes(*client), ElementsAre(-5806));
    EXPECT_FALSE(client->told().stops.copy().front().movieURL) << "it is the user's, not the client's";
    if (!library().empty()) {
        EXPECT_THAT(store(), IsEmpty());
    }
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
        ASSERT_EQ(client->start(wholeScreen())->code, 0) << log();
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

}  // namespace
}  // namespace kelvo::test
