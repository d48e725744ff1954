#include "platform/linux/library/MovieLibrary.h"
#include "platform/linux/system/KernelRandom.h"
#include "support/ChildProcess.h"
#include "support/TemporaryDirectory.h"

#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <random>
#include <set>
#include <sys/mount.h>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

namespace fs = std::filesystem;

std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// Kills a program that adds and removes movies, over and over at random moments, and looks at what it left.
class KilledLibraryTest : public testing::Test {
  protected:
    static constexpr int kKills = 10;

    void addMovies(const std::string& folder) {
        for (const char letter : {'a', 'b'}) {
            const std::string path = folder + "/" + letter + ".mp4";
            std::ofstream(path, std::ios::binary) << std::string(3 << 20, letter) << "end";
            movies_.push_back(path);
            contents_.insert(contentOf(path));
        }
    }

    void killOften(int longestMicroseconds) {
        std::mt19937 random{std::random_device{}()};
        std::uniform_int_distribution moments(0, longestMicroseconds);
        for (int i = 0; i < kKills && !HasFailure(); ++i) {
            const int moment = moments(random);
            SCOPED_TRACE("killed after " + std::to_string(moment) + " microseconds");
            std::vector<std::string> command{LIBRARY_PROGRAM, folder_};
            command.insert(command.end(), movies_.begin(), movies_.end());
            ChildProcess process(command);
            ASSERT_TRUE(process.waitForLine("begins"));
            std::this_thread::sleep_for(std::chrono::microseconds(moment));
            process.signal(SIGKILL);
            EXPECT_EQ(process.waitForExit(), std::nullopt);
            expectWhole();
        }
    }

    /// Every movie of the library is a whole one, and its folder holds those alone.
    void expectWhole() {
        MovieLibrary library(folder_, std::make_shared<KernelRandom>());
        const auto found = library.movies();
        ASSERT_TRUE(found) << found.error().description();
        std::set<std::string> paths;
        for (const LibraryMovie& movie : *found) {
            EXPECT_TRUE(contents_.contains(contentOf(movie.path))) << movie.path;
            paths.insert(movie.path);
        }
        EXPECT_EQ(paths.size(), found->size());
        if (!fs::exists(folder_)) return;
        for (const auto& item : fs::directory_iterator(folder_)) {
            const std::string name = item.path().filename().string();
            EXPECT_TRUE(name.starts_with(".library.sqlite") || paths.contains(item.path().string())) << name;
        }
        for (const std::string& movie : movies_)
            EXPECT_TRUE(contents_.contains(contentOf(movie))) << movie;
        for (const LibraryMovie& movie : *found)
            EXPECT_EQ(library.remove(movie.identifier), std::nullopt);
    }

    TemporaryDirectory store_;
    TemporaryDirectory videos_;
    const std::string folder_ = videos_.path() + "/Screen Recordings";
    std::vector<std::string> movies_;
    std::set<std::string> contents_;
};

TEST_F(KilledLibraryTest, LinkedMoviesAreThereWholeOrNotAtAll) {
    addMovies(store_.path());
    killOften(150000);
}

TEST_F(KilledLibraryTest, CopiedMoviesAreThereWholeOrNotAtAll) {
    if (::mount("none", store_.path().c_str(), "tmpfs", 0, "size=20m") != 0)
        GTEST_SKIP() << "no second volume can be mounted here: " << std::strerror(errno);
    addMovies(store_.path());
    killOften(150000);
    ::umount2(store_.path().c_str(), MNT_DETACH);
}

}  // namespace
}  // namespace kelvo::test
