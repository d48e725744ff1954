#include "MovieFiles.h"
#include "platform/linux/library/MovieLibrary.h"
#include "platform/linux/system/KernelRandom.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <fstream>
#include <set>
#include <sqlite3.h>
#include <sys/mount.h>
#include <sys/stat.h>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;
using test::contentOf;

class MovieLibraryTest : public testing::Test {
  protected:
    std::string movie(const std::string& name, const std::string& content) const {
        return test::writeMovie(store, name, content);
    }
    /// The names in the library's folder, without the index.
    std::vector<std::string> files() const {
        std::vector<std::string> names;
        for (const auto& item : fs::directory_iterator(folder)) {
            const std::string name = item.path().filename().string();
            if (!name.starts_with(".library.sqlite")) names.push_back(name);
        }
        std::ranges::sort(names);
        return names;
    }
    void executeInIndex(const std::string& sql) const {
        sqlite3* database = nullptr;
        sqlite3_open((folder + "/.library.sqlite").c_str(), &database);
        EXPECT_EQ(sqlite3_exec(database, sql.c_str(), nullptr, nullptr, nullptr), SQLITE_OK)
            << sqlite3_errmsg(database);
        sqlite3_close(database);
    }

    test::TemporaryDirectory store;
    test::TemporaryDirectory videos;
    const std::string folder = videos.path() + "/Videos/Screen Recordings";
    MovieLibrary library{folder, std::make_shared<KernelRandom>()};
};

TEST_F(MovieLibraryTest, LibraryThatWasNeverUsedIsEmptyAndLeavesNoTrace) {
    EXPECT_TRUE(library.movies()->empty());
    EXPECT_EQ(library.recover(), std::nullopt);
    EXPECT_EQ(library.remove("8D7C0B2A-0000-4000-8000-000000000000")->code(), ENOENT);
    EXPECT_FALSE(fs::exists(folder));
}

TEST_F(MovieLibraryTest, AddedMovieIsListedWithItsWholeContent) {
    const std::string path = movie("a.mp4", "pictures");
    const auto identifier = library.add(path);
    ASSERT_TRUE(identifier);
    const auto movies = library.movies();
    ASSERT_EQ(movies->size(), 1U);
    EXPECT_EQ(movies->front().identifier, *identifier);
    EXPECT_EQ(movies->front().size, 8U);
    EXPECT_EQ(movies->front().creationDate.secondsSince1970(), 1700000000);
    EXPECT_EQ(contentOf(movies->front().path), "pictures");
    EXPECT_TRUE(contentOf(path) == "pictures");
}

TEST_F(MovieLibraryTest, FileNameTellsWhenTheMovieWasRecorded) {
    ASSERT_TRUE(library.add(movie("a.mov", "1")));
    const std::string expected =
        localTimeText(Date::fromSecondsSince1970(1700000000), "Screen Recording %Y-%m-%d at %H.%M.%S.mov");
    EXPECT_EQ(files(), std::vector<std::string>{expected});
}

TEST_F(MovieLibraryTest, AssetKeepsItsContentWhenTheSourceGoes) {
    const std::string path = movie("a.mp4", "pictures");
    ASSERT_TRUE(library.add(path));
    fs::remove(path);
    EXPECT_EQ(contentOf(library.movies()->front().path), "pictures");
}

TEST_F(MovieLibraryTest, PixelsAreSharedOnOneVolume) {
    const std::string path = movie("a.mp4", std::string(1 << 20, 'p'));
    ASSERT_TRUE(library.add(path));
    struct stat source {};
    struct stat asset {};
    ::stat(path.c_str(), &source);
    ::stat(library.movies()->front().path.c_str(), &asset);
    const bool isLink = source.st_ino == asset.st_ino && source.st_dev == asset.st_dev;
    // A volume that clones gives the asset an inode of its own.
    if (!isLink) GTEST_SKIP() << "the volume clones instead";
    EXPECT_EQ(asset.st_nlink, 2U);
}

TEST_F(MovieLibraryTest, MovieOfAnotherVolumeIsCopied) {
    const test::TemporaryDirectory elsewhere;
    if (::mount("none", elsewhere.path().c_str(), "tmpfs", 0, "size=20m") != 0)
        GTEST_SKIP() << "no second volume can be mounted here: " << std::strerror(errno);
    std::string content(9 << 20, 'p');  // more than one piece
    content += "end";
    ASSERT_TRUE(library.add(elsewhere.write("a.mp4", content)));
    EXPECT_TRUE(contentOf(library.movies()->front().path) == content);
    ::umount2(elsewhere.path().c_str(), MNT_DETACH);
}

TEST_F(MovieLibraryTest, ClashingNamesAreNumbered) {
    std::vector<std::string> identifiers;
    for (const std::string content : {"1", "2", "3"})
        identifiers.push_back(*library.add(movie(content + ".mp4", content)));
    EXPECT_EQ(std::set<std::string>(identifiers.begin(), identifiers.end()).size(), 3U);
    const auto names = files();
    ASSERT_EQ(names.size(), 3U);
    EXPECT_TRUE(names[0].ends_with(" 2.mp4"));
    EXPECT_TRUE(names[1].ends_with(" 3.mp4"));
    const auto movies = library.movies();
    for (const LibraryMovie& item : *movies) {
        const auto which = std::ranges::find(identifiers, item.identifier) - identifiers.begin();
        EXPECT_EQ(contentOf(item.path), std::to_string(which + 1));
    }
}

TEST_F(MovieLibraryTest, FileOfTheUserWithTheSameNameIsLeftAlone) {
    fs::create_directories(folder);
    const std::string name =
        localTimeText(Date::fromSecondsSince1970(1700000000), "Screen Recording %Y-%m-%d at %H.%M.%S.mp4");
    std::ofstream(folder + "/" + name) << "mine";
    ASSERT_TRUE(library.add(movie("a.mp4", "theirs")));
    EXPECT_EQ(contentOf(folder + "/" + name), "mine");
    EXPECT_EQ(contentOf(library.movies()->front().path), "theirs");
}

TEST_F(MovieLibraryTest, IdentifiersSurviveAnotherLook) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    MovieLibrary other(folder, std::make_shared<KernelRandom>());
    EXPECT_EQ(other.movies()->front().identifier, *identifier);
}

TEST_F(MovieLibraryTest, RemovedMovieGoesWithItsFile) {
    const auto first = library.add(movie("a.mp4", "1"));
    const auto second = library.add(movie("b.mp4", "2"));
    EXPECT_EQ(library.remove(*first), std::nullopt);
    ASSERT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(library.movies()->front().identifier, *second);
    EXPECT_EQ(files().size(), 1U);
    EXPECT_EQ(library.remove(*first)->code(), ENOENT);
}

TEST_F(MovieLibraryTest, MovieThatTheUserTookAwayIsNotListed) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    fs::remove(library.movies()->front().path);
    EXPECT_TRUE(library.movies()->empty());
    EXPECT_EQ(library.remove(*identifier), std::nullopt);
}

TEST_F(MovieLibraryTest, WhatIsNoRegularFileIsRefused) {
    EXPECT_EQ(library.add(store.path() + "/missing.mp4").error().code(), ENOENT);
    EXPECT_EQ(library.add(store.path()).error().code(), EINVAL);
    ::mkfifo((store.path() + "/pipe.mp4").c_str(), 0600);
    EXPECT_EQ(library.add(store.path() + "/pipe.mp4").error().code(), EINVAL);
    EXPECT_FALSE(fs::exists(folder));
}

TEST_F(MovieLibraryTest, FolderThatCannotBeMadeIsAnError) {
    std::ofstream(videos.path() + "/Videos") << "a file";
    const auto result = library.add(movie("a.mp4", "1"));
    EXPECT_EQ(result.error().code(), ENOTDIR);
    EXPECT_EQ(contentOf(store.path() + "/a.mp4"), "1");
}

TEST_F(MovieLibraryTest, VolumeThatCannotBeWrittenIsAnError) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    if (::mount(folder.c_str(), folder.c_str(), nullptr, MS_BIND, nullptr) != 0)
        GTEST_SKIP() << "nothing can be mounted here: " << std::strerror(errno);
    ::mount(nullptr, folder.c_str(), nullptr, MS_BIND | MS_REMOUNT | MS_RDONLY, nullptr);
    const auto result = library.add(movie("b.mp4", "2"));
    ::umount2(folder.c_str(), MNT_DETACH);
    ASSERT_FALSE(result);
    EXPECT_EQ(result.error().code(), EROFS);
    EXPECT_EQ(library.movies()->size(), 1U);
    EXPECT_TRUE(fs::exists(store.path() + "/b.mp4"));
}

TEST_F(MovieLibraryTest, FullVolumeIsAnErrorThatLosesNothing) {
    fs::create_directories(folder);
    if (::mount("none", folder.c_str(), "tmpfs", 0, "size=400k") != 0)
        GTEST_SKIP() << "a small volume cannot be mounted here: " << std::strerror(errno);
    ASSERT_TRUE(library.add(movie("small.mp4", "small")));
    const std::string large = movie("large.mp4", std::string(1 << 20, 'p'));
    const auto result = library.add(large);
    EXPECT_TRUE(!result && result.error().code() == ENOSPC);
    EXPECT_EQ(fs::file_size(large), 1U << 20);
    EXPECT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(files().size(), 1U);
    EXPECT_TRUE(library.add(movie("little.mp4", "room for this")));
    ::umount2(folder.c_str(), MNT_DETACH);
}

TEST_F(MovieLibraryTest, VolumeWithoutRoomForTheIndexIsAnErrorThatLosesNothing) {
    fs::create_directories(folder);
    if (::mount("none", folder.c_str(), "tmpfs", 0, "size=64k") != 0)
        GTEST_SKIP() << "a small volume cannot be mounted here: " << std::strerror(errno);
    ASSERT_TRUE(library.add(movie("small.mp4", "small")));
    std::ofstream filler(folder + "/filler");
    filler << std::string(100 << 10, 'f');
    filler.close();
    const auto result = library.add(movie("b.mp4", ""));
    EXPECT_TRUE(!result && result.error().code() == ENOSPC);
    fs::remove(folder + "/filler");
    EXPECT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(files().size(), 1U);
    ::umount2(folder.c_str(), MNT_DETACH);
}

TEST_F(MovieLibraryTest, DamagedIndexIsAClearErrorAndEveryFileStays) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    const std::string noise(8192, 'x');
    std::ofstream(folder + "/.library.sqlite", std::ios::binary) << noise;
    const auto before = files();
    const auto result = library.add(movie("b.mp4", "2"));
    ASSERT_FALSE(result);
    EXPECT_EQ(result.error().domain(), kLibraryIndexErrorDomain);
    EXPECT_NE(result.error().localizedDescription().find(folder + "/.library.sqlite"), std::string::npos);
    EXPECT_FALSE(library.movies());
    EXPECT_TRUE(library.remove(*identifier).has_value());
    EXPECT_EQ(files(), before);
    EXPECT_EQ(contentOf(folder + "/.library.sqlite"), noise);
}

TEST_F(MovieLibraryTest, IndexCutShortIsAnErrorAndEveryFileStays) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    fs::resize_file(folder + "/.library.sqlite", 5000);
    const auto before = files();
    EXPECT_FALSE(library.add(movie("b.mp4", "2")));
    EXPECT_EQ(files(), before);
}

TEST_F(MovieLibraryTest, ForeignDatabaseIsRefused) {
    fs::create_directories(folder);
    executeInIndex("CREATE TABLE other (x)");
    EXPECT_EQ(library.add(movie("a.mp4", "1")).error().domain(), kLibraryIndexErrorDomain);
    EXPECT_TRUE(files().empty());
}

TEST_F(MovieLibraryTest, EntryThatLeadsOutOfTheFolderIsNoMovie) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    const std::string outside = videos.write("Videos/precious.mp4", "mine");
    executeInIndex("UPDATE movies SET fileName = '../precious.mp4', state = 2");
    EXPECT_TRUE(library.movies()->empty());
    EXPECT_TRUE(library.remove(*identifier).has_value());
    EXPECT_EQ(contentOf(outside), "mine");
}

TEST_F(MovieLibraryTest, StagedContentWithoutAnEntryIsSwept) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    std::ofstream(folder + "/.8D7C0B2A-0000-4000-8000-000000000000.staged") << "half";
    std::ofstream(folder + "/.mine.staged") << "not the library's";
    EXPECT_EQ(library.recover(), std::nullopt);
    const auto names = files();
    ASSERT_EQ(names.size(), 2U);
    EXPECT_EQ(names.front(), ".mine.staged");
}

TEST_F(MovieLibraryTest, EntryBeforeItsFileHasItsNameIsFinished) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    const std::string path = library.movies()->front().path;
    fs::rename(path, folder + "/." + *identifier + ".staged");
    executeInIndex("UPDATE movies SET state = 0");
    ASSERT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(contentOf(path), "1");
}

TEST_F(MovieLibraryTest, NameThatSomebodyTookMeanwhileIsNumberedWhenFinishing) {
    const auto identifier = library.add(movie("a.mp4", "1"));
    const std::string path = library.movies()->front().path;
    fs::rename(path, folder + "/." + *identifier + ".staged");
    std::ofstream(path) << "mine";
    executeInIndex("UPDATE movies SET state = 0");
    EXPECT_EQ(contentOf(library.movies()->front().path), "1");
    EXPECT_EQ(contentOf(path), "mine");
}

TEST_F(MovieLibraryTest, EntryWhoseFileHasItsNameAlreadyIsFinished) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    executeInIndex("UPDATE movies SET state = 0");
    EXPECT_EQ(library.movies()->size(), 1U);
    EXPECT_EQ(files().size(), 1U);
}

TEST_F(MovieLibraryTest, EntryWithoutAnyFileIsForgotten) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    fs::remove(library.movies()->front().path);
    executeInIndex("UPDATE movies SET state = 0");
    EXPECT_TRUE(library.movies()->empty());
}

TEST_F(MovieLibraryTest, RemovalThatWasInterruptedIsFinished) {
    ASSERT_TRUE(library.add(movie("a.mp4", "1")));
    executeInIndex("UPDATE movies SET state = 2");
    EXPECT_TRUE(library.movies()->empty());
    EXPECT_TRUE(files().empty());
}

TEST_F(MovieLibraryTest, ManyMayAddAtOnce) {
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([this, i, path = movie(std::to_string(i) + ".mp4", std::to_string(i))] {
            // Half of them are as other programs.
            MovieLibrary another(folder, std::make_shared<KernelRandom>());
            for (int round = 0; round < 3; ++round)
                EXPECT_TRUE((i % 2 == 0 ? library : another).add(path));
        });
    }
    for (std::thread& thread : threads)
        thread.join();
    EXPECT_THAT(files(), testing::Each(testing::StartsWith("Screen Recording")));
    EXPECT_EQ(files().size(), 12U);
    EXPECT_EQ(library.movies()->size(), 12U);
}

}  // namespace
}  // namespace kelvo
