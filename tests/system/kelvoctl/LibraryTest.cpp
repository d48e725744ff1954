#include "KelvoctlProcess.h"
#include "base/UniqueFd.h"
#include "support/daemon/DaemonWorld.h"
#include "support/media/MovieProbe.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <sys/file.h>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::KelvoctlProcess;
using Answer = std::pair<int, std::string>;

/// kelvoctl library before the real daemon, on a screen on which nothing moves.
class LibraryCommandTest : public testing::Test {
  protected:
    void SetUp() override { ASSERT_TRUE(world.isUp()) << world.log(); }

    Answer run(const std::vector<std::string>& arguments) {
        return KelvoctlProcess::run(world.socket(), arguments);
    }

    /// Kills the daemon in the middle of a recording with the microphone, and starts it again.
    void crash() {
        KelvoctlProcess recording(world.socket(), {"record", "--microphone"}, KELVOCTL_PROGRAM,
                                  world.display());
        ASSERT_TRUE(recording.waitForLine("recording")) << world.log();
        std::this_thread::sleep_for(2s);
        world.daemon().signal(SIGKILL);
        EXPECT_EQ(recording.waitForExit(), 3) << recording.output();
        world.startDaemon();
    }

    test::DaemonWorld world;
};

TEST_F(LibraryCommandTest, EmptyLibraryAndStoreAreSaid) {
    EXPECT_EQ(run({"library"}), Answer(0, "the library is empty\n"));
    EXPECT_EQ(run({"library", "recover"}), Answer(0, "there is nothing to recover\n"));
    EXPECT_EQ(KelvoctlProcess::answer(world.socket(), {"library", "--json"}), "");
}

TEST_F(LibraryCommandTest, SavedMovieIsListedWithItsFile) {
    KelvoctlProcess recording(world.socket(), {"record", "--seconds", "1"}, KELVOCTL_PROGRAM,
                              world.display());
    ASSERT_EQ(recording.waitForEnd(), 0) << recording.output() << world.log();
    ASSERT_EQ(world.library().size(), 1U);
    const std::string path = world.library().front();
    const auto [status, text] = run({"library"});
    EXPECT_EQ(status, 0);
    EXPECT_NE(text.find(" MB  " + path + "\n"), std::string::npos) << text;
    const std::string json = KelvoctlProcess::answer(world.socket(), {"library", "--json"});
    EXPECT_TRUE(json.starts_with("{\"identifier\":\"")) << json;
    EXPECT_NE(json.find("\"path\":\"" + path + "\""), std::string::npos) << json;
    EXPECT_NE(json.find("\"size\":" + std::to_string(std::filesystem::file_size(path))), std::string::npos)
        << json;
}

TEST_F(LibraryCommandTest, MovieOfADaemonThatWasKilledIsRecovered) {
    ASSERT_NO_FATAL_FAILURE(crash());
    EXPECT_TRUE(world.waitForLog(
        "movies of an earlier run lie in the store: 1; kelvoctl library recover saves them"));
    ASSERT_EQ(world.store().size(), 1U);
    EXPECT_EQ(test::decodingComplaints(world.store().front()), "");
    EXPECT_TRUE(world.library().empty());

    const auto [status, text] = run({"library", "recover"});
    EXPECT_EQ(status, 0);
    EXPECT_TRUE(text.starts_with("saved ScreenRecording_")) << text << world.log();
    EXPECT_TRUE(world.store().empty());
    ASSERT_EQ(world.library().size(), 1U);
    const std::string movie = world.library().front();
    EXPECT_NE(text.find(" to " + movie + "\n"), std::string::npos) << text;
    EXPECT_EQ(test::decodingComplaints(movie), "");
    EXPECT_GT(std::stod(test::probeFormat(movie, "duration")), 0.4);
    EXPECT_EQ(test::probeStream(movie, "a:0", "codec_name"), "aac");
    EXPECT_EQ(test::probeStream(movie, "a:1", "codec_name"), "");  // mixed
    EXPECT_EQ(run({"library", "recover"}), Answer(0, "there is nothing to recover\n"));
}

TEST_F(LibraryCommandTest, RecordingIsKeptWhileAnotherProgramHoldsTheLibrary) {
    std::filesystem::create_directories(world.libraryPath());
    std::ofstream(world.libraryPath() + "/.library.sqlite").close();
    UniqueFd holder(::open(world.libraryPath().c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    ASSERT_EQ(::flock(holder.get(), LOCK_EX), 0);
    KelvoctlProcess recording(world.socket(), {"record", "--seconds", "1"}, KELVOCTL_PROGRAM,
                              world.display());
    EXPECT_EQ(recording.waitForEnd(), 0) << recording.output() << world.log();
    EXPECT_TRUE(world.waitForLog("the new recording comes in when that ends"));
    EXPECT_EQ(run({"library"}),
              Answer(1, "kelvoctl: " + world.libraryPath() +
                            ": another program is using the library of recordings and does not let go of it"
                            " (KVPOSIXErrorDomain 16)\n"));
    holder = UniqueFd();
    const auto [status, text] = run({"library"});
    EXPECT_EQ(status, 0);
    EXPECT_NE(text.find(world.libraryPath() + "/Screen Recording "), std::string::npos) << text;
    ASSERT_EQ(world.library().size(), 1U);
    EXPECT_EQ(test::decodingComplaints(world.library().front()), "");
    EXPECT_TRUE(world.store().empty());
}

TEST_F(LibraryCommandTest, RecordingThatALostDisplayEndedIsRecoveredByTheDaemonThatRunsOn) {
    KelvoctlProcess recording(world.socket(), {"record"}, KELVOCTL_PROGRAM, world.display());
    ASSERT_TRUE(recording.waitForLine("recording")) << world.log();
    std::this_thread::sleep_for(1s);
    world.loseScreen();
    EXPECT_EQ(recording.waitForExit(), 1);
    EXPECT_NE(recording.output().find("the daemon has no display, or lost it."), std::string::npos)
        << recording.output();
    ASSERT_EQ(world.store().size(), 1U);
    Answer answer;
    EXPECT_TRUE(test::eventually([&] {
        answer = run({"library", "recover"});
        return answer.second != "there is nothing to recover\n";
    }));
    EXPECT_EQ(answer.first, 0);
    EXPECT_TRUE(answer.second.starts_with("saved ScreenRecording_")) << answer.second << world.log();
    ASSERT_EQ(world.library().size(), 1U);
    EXPECT_EQ(test::decodingComplaints(world.library().front()), "");
    EXPECT_TRUE(world.store().empty());
}

TEST_F(LibraryCommandTest, ProgramOutsideOfTheBundleIsRefused) {
    const std::string copy = world.root() + "/kelvoctl";
    std::filesystem::copy_file(KELVOCTL_PROGRAM, copy);
    KelvoctlProcess process(world.socket(), {"library"}, copy);
    EXPECT_EQ(process.waitForExit(), 1);
    EXPECT_EQ(process.output(), "kelvoctl: the daemon does not take this program for the system shell\n");
}

}  // namespace
}  // namespace kelvo
