#include "support/TemporaryDirectory.h"
#include "tools/kelvoctl/MovieOutput.h"

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo::ctl {
namespace {

namespace fs = std::filesystem;

std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

TEST(MovieOutputTest, NewFileInAWritableFolderIsFine) {
    const test::TemporaryDirectory folder;
    EXPECT_FALSE(checkOutput(folder.path() + "/new.mp4"));
    EXPECT_FALSE(fs::exists(folder.path() + "/new.mp4"));
}

TEST(MovieOutputTest, FileThatExistsIsNotOverwritten) {
    const test::TemporaryDirectory folder;
    EXPECT_EQ(checkOutput(folder.write("old.mp4", "old"))->code(), EEXIST);
    fs::create_symlink("nowhere", folder.path() + "/link");
    EXPECT_EQ(checkOutput(folder.path() + "/link")->code(), EEXIST);
}

TEST(MovieOutputTest, FolderThatIsMissingIsFoundBeforeTheRecording) {
    const test::TemporaryDirectory folder;
    EXPECT_EQ(checkOutput(folder.path() + "/none/new.mp4")->code(), ENOENT);
}

TEST(MovieOutputTest, MovieIsMoved) {
    const test::TemporaryDirectory folder;
    const std::string movie = folder.write("movie.mp4", "pixels");
    EXPECT_FALSE(takeMovie(URL::file(movie), "", folder.path() + "/new.mp4"));
    EXPECT_EQ(contentOf(folder.path() + "/new.mp4"), "pixels");
    EXPECT_FALSE(fs::exists(movie));
}

TEST(MovieOutputTest, MovieOnAnotherVolumeIsCopiedAndLeavesNothingPartial) {
    const test::TemporaryDirectory folder;
    const std::string other = "/dev/shm/kelvoctl-test-" + std::to_string(::getpid()) + ".mp4";
    std::ofstream(other) << "pixels";
    EXPECT_FALSE(takeMovie(URL::file(other), "", folder.path() + "/new.mp4"));
    EXPECT_EQ(contentOf(folder.path() + "/new.mp4"), "pixels");
    EXPECT_FALSE(fs::exists(folder.path() + "/new.mp4.part"));
    fs::remove(other);
}

TEST(MovieOutputTest, MovieIsFoundUnderTheRootOfItsDaemon) {
    const test::TemporaryDirectory root;
    root.write("store/movie.mp4", "pixels");
    const std::string output = root.path() + "/new.mp4";
    EXPECT_FALSE(
        takeMovie(URL("file:///store/movie.mp4"), root.path() + "/run/kelvod/com.quillon.kelvod", output));
    EXPECT_EQ(contentOf(output), "pixels");
}

TEST(MovieOutputTest, MovieThatIsNotThereIsAnError) {
    const test::TemporaryDirectory folder;
    EXPECT_EQ(takeMovie(URL("file:///nowhere/movie.mp4"), "", folder.path() + "/new.mp4")->code(), ENOENT);
}

}  // namespace
}  // namespace kelvo::ctl
