#include "MovieFiles.h"
#include "platform/linux/library/MovieLibrary.h"
#include "platform/linux/system/KernelRandom.h"
#include "support/Eventually.h"
#include "support/LogRecorder.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <future>
#include <sqlite3.h>
#include <sys/file.h>
#include <sys/mount.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;
using test::contentOf;
using namespace std::chrono_literals;
using testing::Contains;
using testing::HasSubstr;

enum class Holder { ofTheFolder, ofTheIndex };

/// A library with one movie, which another program does not let go of.
class HeldLibraryTest : public testing::TestWithParam<Holder> {
  protected:
    HeldLibraryTest() { first = *library.add(movie("first.mp4", "first")); }
    ~HeldLibraryTest() override { letGo(); }

    std::string movie(const std::string& name, const std::string& content) const {
        return test::writeMovie(store, name, content);
    }

    void hold() {
        if (GetParam() == Holder::ofTheFolder) {
            lock = UniqueFd(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
            ASSERT_EQ(::flock(lock.get(), LOCK_EX), 0);
        } else {
            sqlite3_open((folder + "/.library.sqlite").c_str(), &database);
            ASSERT_EQ(sqlite3_exec(database, "BEGIN EXCLUSIVE", nullptr, nullptr, nullptr), SQLITE_OK);
        }
    }
    void letGo() {
        lock = UniqueFd();
        sqlite3_close(database);
        database = nullptr;
    }
    /// How often what is held is open in this process.
    std::ptrdiff_t countHeldOpen() const {
        const fs::path held = GetParam() == Holder::ofTheFolder ? folder : folder + "/.library.sqlite";
        std::error_code code;
        return std::ranges::count_if(fs::directory_iterator("/proc/self/fd"), [&](const auto& descriptor) {
            return fs::read_symlink(descriptor.path(), code) == held;
        });
    }
    /// What is there beside the index and what belongs to it.
    std::size_t countFiles() const {
        std::size_t count = 0;
        for (const auto& item : fs::directory_iterator(folder))
            count += item.path().filename().string().starts_with(".library.sqlite") ? 0U : 1U;
        return count;
    }

    const test::LogRecorder log;
    test::TemporaryDirectory store;
    test::TemporaryDirectory videos;
    const std::string folder = videos.path() + "/Screen Recordings";
    MovieLibrary library{folder, std::make_shared<KernelRandom>(), 20ms};
    std::string first;
    UniqueFd lock;
    sqlite3* database = nullptr;
};

TEST_P(HeldLibraryTest, CannotBeReadAndSaysWhy) {
    hold();
    for (const OptionalError& error :
         {library.movies().optionalError(), library.remove(first), library.recover()}) {
        ASSERT_TRUE(error);
        EXPECT_EQ(error->code(), EBUSY);
        EXPECT_THAT(error->localizedDescription(),
                    HasSubstr(": another program is using the library of recordings"));
        EXPECT_THAT(error->localizedDescription(), HasSubstr(folder));
    }
    letGo();
    EXPECT_EQ(library.movies()->size(), 1U);
}

TEST_P(HeldLibraryTest, NewMovieComesInWithItsIdentifierAndDateOnceItIsLetGo) {
    hold();
    const auto second = library.add(movie("second.mp4", "second"));
    ASSERT_TRUE(second) << second.error().description();
    EXPECT_THAT(log.texts(), Contains(HasSubstr("; the new recording comes in when that ends")));
    fs::remove(store.path() + "/second.mp4");  // as whoever saves a movie does
    letGo();
    const auto movies = library.movies();
    ASSERT_TRUE(movies);
    ASSERT_EQ(movies->size(), 2U);
    const LibraryMovie& taken = (*movies)[(*movies)[0].identifier == first ? 1 : 0];
    EXPECT_EQ(taken.identifier, *second);
    EXPECT_EQ(taken.creationDate.secondsSince1970(), test::kRecordedAt);
    EXPECT_THAT(taken.path, testing::EndsWith(" 2.mp4"));
    EXPECT_EQ(contentOf(taken.path), "second");
    EXPECT_EQ(countFiles(), 2U);
}

TEST_P(HeldLibraryTest, CopyThatWaitsKeepsTheDateOfTheMovie) {
    const test::TemporaryDirectory elsewhere;
    if (::mount("none", elsewhere.path().c_str(), "tmpfs", 0, "size=1m") != 0)
        GTEST_SKIP() << "no second volume can be mounted here: " << std::strerror(errno);
    const std::string path = elsewhere.path() + "/second.mp4";
    fs::copy_file(movie("second.mp4", "second"), path);
    fs::last_write_time(path, fs::last_write_time(store.path() + "/second.mp4"));
    hold();
    const auto second = library.add(path);
    ::umount2(elsewhere.path().c_str(), MNT_DETACH);
    ASSERT_TRUE(second) << second.error().description();
    letGo();
    const auto movies = library.movies();
    ASSERT_EQ(movies->size(), 2U);
    for (const LibraryMovie& each : *movies)
        EXPECT_EQ(each.creationDate.secondsSince1970(), test::kRecordedAt);
}

TEST_P(HeldLibraryTest, MovieThatWaitedIsTakenInOnce) {
    hold();
    ASSERT_TRUE(library.add(movie("second.mp4", "second")));
    letGo();
    EXPECT_EQ(library.recover(), std::nullopt);
    EXPECT_EQ(library.recover(), std::nullopt);
    EXPECT_EQ(library.movies()->size(), 2U);
    EXPECT_EQ(library.remove(first), std::nullopt);
    EXPECT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(countFiles(), 1U);
}

TEST_P(HeldLibraryTest, IsWaitedFor) {
    hold();
    MovieLibrary patient(folder, std::make_shared<KernelRandom>(), 60s);
    auto movies = std::async(std::launch::async, [&] { return patient.movies(); });
    // Once for the holder, once for the one who waits.
    EXPECT_TRUE(test::eventually([this] { return countHeldOpen() == 2; }));
    letGo();
    const auto found = movies.get();
    EXPECT_TRUE(found) << found.error().description();
}

INSTANTIATE_TEST_SUITE_P(By, HeldLibraryTest, testing::Values(Holder::ofTheFolder, Holder::ofTheIndex),
                         [](const auto& item) {
                             return item.param == Holder::ofTheFolder ? "AnotherLibrary" : "AnotherDatabase";
                         });

/// A library into whose folder things came by other ways.
class WaitingNamesTest : public testing::Test {
  protected:
    test::TemporaryDirectory store;
    test::TemporaryDirectory videos;
    MovieLibrary library{videos.path(), std::make_shared<KernelRandom>()};
};

TEST_F(WaitingNamesTest, WhatOnlyLooksLikeAWaitingMovieIsLeftAlone) {
    const std::string identifier = "8D7C0B2A-0000-4000-8000-000000000000";
    ASSERT_TRUE(library.add(store.write("a.mp4", "1")));
    const std::string mark = "." + identifier + ".waiting.";
    std::vector<std::string> names{mark, mark + ".a.mp4", "x" + mark + "a.mp4",
                                   "." + identifier + "-waiting-a.mp4", ".mine.waiting.a.mp4"};
    for (const std::string& name : names)
        videos.write(name, "not the library's");
    names.push_back(mark + "Folder.mp4");
    fs::create_directory(videos.path() + "/" + names.back());
    EXPECT_EQ(library.recover(), std::nullopt);
    EXPECT_EQ(library.movies()->size(), 1U);
    for (const std::string& name : names)
        EXPECT_TRUE(fs::exists(videos.path() + "/" + name)) << name;
}

TEST_F(WaitingNamesTest, TakingInThatWasInterruptedAfterItsEntryIsDoneAgain) {
    const auto identifier = library.add(store.write("a.mp4", "1"));
    const std::string path = library.movies()->front().path;
    const std::string fileName = fs::path(path).filename().string();
    fs::rename(path, videos.path() + "/." + *identifier + ".waiting." + fileName);
    sqlite3* database = nullptr;
    sqlite3_open((videos.path() + "/.library.sqlite").c_str(), &database);
    EXPECT_EQ(sqlite3_exec(database, "UPDATE movies SET state = 0", nullptr, nullptr, nullptr), SQLITE_OK);
    sqlite3_close(database);
    ASSERT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(library.movies()->front().identifier, *identifier);
    EXPECT_EQ(contentOf(path), "1");
}

}  // namespace
}  // namespace kelvo
