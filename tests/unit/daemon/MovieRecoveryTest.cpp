#include "daemon/LibraryService.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/Eventually.h"
#include "support/LogRecorder.h"

#include <cerrno>
#include <future>
#include <set>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::IsEmpty;
using namespace std::chrono_literals;

std::string textIn(const Dictionary& dictionary, std::string_view key) {
    const Value* const value = dictionary.find(key);
    return value != nullptr && value->asString() != nullptr ? *value->asString() : "";
}

/// A daemon that starts on a store in which something lies, and a shell that asks it.
class MovieRecoveryTest : public testing::Test {
  protected:
    ~MovieRecoveryTest() override {
        for (const IPCConnectionRef& connection : connections)
            connection->invalidate();
    }

    struct Answer {
        std::vector<Dictionary> movies;
        OptionalError error;
    };
    using Request = void (KVLibraryProtocol::*)(KVLibraryProtocol::MoviesHandler);

    static std::string path(const std::string& name) {
        return "/private/var/mobile/Library/KelvoKit//" + name;
    }
    void leave(const std::string& name, std::chrono::nanoseconds age = 1h, std::uint64_t size = 100) {
        device.fileSystem->addFile(path(name), size, age);
        device.media->addMovie(URL::file(path(name)),
                               {MediaTime::make(5, 1), {MediaType::video, MediaType::audio}});
        device.fileSystem->addFile(path(name), size, age);
    }
    bool isInStore(const std::string& name) { return device.fileSystem->itemExists(path(name)); }

    void start() {
        service = LibraryService::create(
            device.platform(), [this](const std::string& name) { return inUse.copy().contains(name); });
    }
    std::future<Answer> ask(Request request, bool isShell = true) {
        device.ipc->setIdentity(7,
                                isShell ? Dictionary{{"com.quillon.private.kelvo-kit", true}} : Dictionary());
        auto connection = *device.ipc->connectToService(kLibraryServiceName);
        connection->setRemoteInterface(interfaceOf<KVLibraryProtocol>());
        connection->resume();
        auto answer = std::make_shared<std::promise<Answer>>();
        RemoteLibrary library(*connection, nullptr);
        (library.*request)([answer](const auto& movies, const auto& error) {
            answer->set_value({movies, error});
        });
        connections.push_back(std::move(connection));
        return answer->get_future();
    }
    Answer recover() { return ask(&KVLibraryProtocol::recoverMovies).get(); }
    Answer list() { return ask(&KVLibraryProtocol::listMovies).get(); }

    const test::LogRecorder log;
    SimulatedDevice device;
    Guarded<std::set<std::string>> inUse;
    std::shared_ptr<LibraryService> service;
    std::vector<IPCConnectionRef> connections;
};

TEST_F(MovieRecoveryTest, EmptyStoreIsNotSpokenOfAndGivesNothing) {
    start();
    EXPECT_FALSE(
        log.contains("movies of an earlier run lie in the store: 0; kelvoctl library recover saves "
                     "them"));
    const Answer answer = recover();
    EXPECT_FALSE(answer.error);
    EXPECT_THAT(answer.movies, IsEmpty());
}

TEST_F(MovieRecoveryTest, MoviesOfAnEarlierRunAreSaidAtTheStartAndLeftWhereTheyAre) {
    leave("ScreenRecording_1.mp4");
    leave("ScreenRecording_2.mp4");
    start();
    EXPECT_TRUE(
        log.contains("movies of an earlier run lie in the store: 2; kelvoctl library recover saves them"));
    EXPECT_TRUE(isInStore("ScreenRecording_1.mp4"));
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
}

TEST_F(MovieRecoveryTest, EachIsMixedAndSavedAndLeavesTheStore) {
    leave("ScreenRecording_1.mp4");
    leave("ScreenRecording_2.mp4");
    start();
    const Answer answer = recover();
    EXPECT_FALSE(answer.error);
    ASSERT_EQ(answer.movies.size(), 2U);
    EXPECT_EQ(textIn(answer.movies[0], "name"), "ScreenRecording_1.mp4");
    EXPECT_EQ(textIn(answer.movies[1], "name"), "ScreenRecording_2.mp4");
    const auto items = device.photoLibrary->items();
    ASSERT_EQ(items.size(), 2U);
    EXPECT_EQ(textIn(answer.movies[0], "identifier"), items[0].asset.localIdentifier);
    EXPECT_EQ(textIn(answer.movies[0], "path"), items[0].moviePath);
    EXPECT_THAT(items[0].moviePath, HasSubstr("KVKelvo_Final"));
    EXPECT_THAT(*device.fileSystem->namesInDirectory(path("")), IsEmpty());
}

TEST_F(MovieRecoveryTest, SecondRecoveryHasNothingLeft) {
    leave("ScreenRecording_1.mp4");
    start();
    recover();
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
}

TEST_F(MovieRecoveryTest, MovieThatCannotBeMixedIsSavedAsItIs) {
    leave("ScreenRecording_1.mp4");
    device.failNext("ExportSession.export", ENOSPC);
    start();
    EXPECT_EQ(recover().movies.size(), 1U);
    ASSERT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_EQ(device.photoLibrary->items().front().moviePath, path("ScreenRecording_1.mp4"));
    EXPECT_FALSE(isInStore("ScreenRecording_1.mp4"));
}

TEST_F(MovieRecoveryTest, MovieThatCannotBeSavedStaysAndTheNextIsTaken) {
    leave("ScreenRecording_1.mp4");
    leave("ScreenRecording_2.mp4");
    device.failNext("PhotoLibrary.createVideoAsset", ENOSPC);
    start();
    const Answer answer = recover();
    ASSERT_EQ(answer.movies.size(), 2U);
    ASSERT_NE(answer.movies[0].find("error"), nullptr);
    EXPECT_EQ(answer.movies[0].find("error")->asError()->code(), ENOSPC);
    EXPECT_THAT(*device.fileSystem->namesInDirectory(path("")), ElementsAre("ScreenRecording_1.mp4"));
    EXPECT_EQ(recover().movies.size(), 1U);  // there is room again
    EXPECT_FALSE(isInStore("ScreenRecording_1.mp4"));
}

TEST_F(MovieRecoveryTest, WhatCannotBePlayedGoesWithoutBeingSaved) {
    device.fileSystem->addFile(path("ScreenRecording_0.mp4"), 0, 1h);
    start();
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_FALSE(isInStore("ScreenRecording_0.mp4"));
    EXPECT_TRUE(log.contains("nothing to save in ScreenRecording_0.mp4"));
}

TEST_F(MovieRecoveryTest, MovieThatTheLibraryHasAlreadyIsNotSavedAgain) {
    leave("ScreenRecording_1.mp4");
    ASSERT_TRUE(device.photoLibrary->createVideoAsset(URL::file(path("ScreenRecording_1.mp4"))));
    start();
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_FALSE(isInStore("ScreenRecording_1.mp4"));
}

TEST_F(MovieRecoveryTest, UnfinishedMixesAndTrimsGoForTheMovieTheyWereMadeFrom) {
    leave("Game.mp4");
    leave("Game_trimmed.mp4");
    leave("KVKelvo_Final1700000000.mp4");
    leave("Only_trimmed.mp4");
    start();
    leave("KVKelvo_Final1700000001.mp4");  // is being made
    const Answer answer = recover();
    ASSERT_EQ(answer.movies.size(), 2U);
    EXPECT_EQ(textIn(answer.movies[0], "name"), "Game.mp4");
    EXPECT_EQ(textIn(answer.movies[1], "name"), "Only_trimmed.mp4");
    EXPECT_THAT(*device.fileSystem->namesInDirectory(path("")), ElementsAre("KVKelvo_Final1700000001.mp4"));
}

TEST_F(MovieRecoveryTest, MoviesOfApplicationsThatRunAreLeftToThem) {
    leave("Game.mp4");
    device.fileSystem->addFile(path("notes.txt"), 1, 1h);
    device.fileSystem->addFile(path("ScreenRecording_1.txt"), 1, 1h);
    start();
    leave("Game.mp4", 5s);  // the application has recorded itself again
    leave("KVMovie_game_1.000000_0.mp4");
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_EQ(device.fileSystem->namesInDirectory(path(""))->size(), 4U);
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
}

TEST_F(MovieRecoveryTest, RecordingOfThisRunThatNobodySavedIsRecovered) {
    start();
    leave("ScreenRecording_1.mp4", 3s);
    const Answer answer = recover();
    ASSERT_EQ(answer.movies.size(), 1U);
    EXPECT_EQ(textIn(answer.movies[0], "name"), "ScreenRecording_1.mp4");
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_FALSE(isInStore("ScreenRecording_1.mp4"));
}

TEST_F(MovieRecoveryTest, WhatSomebodyUsesIsLeftAlone) {
    leave("ScreenRecording_1.mp4");
    inUse.set({"ScreenRecording_1.mp4", "ScreenRecording_2.mp4"});
    start();
    leave("ScreenRecording_2.mp4");
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_TRUE(isInStore("ScreenRecording_1.mp4"));
    inUse.set({});
    EXPECT_EQ(recover().movies.size(), 2U);
}

TEST_F(MovieRecoveryTest, WhatIsTakenUpMeanwhileIsLeftAlone) {
    leave("ScreenRecording_1.mp4");
    leave("ScreenRecording_2.mp4");
    device.media->holdExports(true);
    start();
    auto recovered = ask(&KVLibraryProtocol::recoverMovies);
    ASSERT_TRUE(test::eventually([&] { return !device.media->exportSessions().empty(); }));
    inUse.set({"ScreenRecording_2.mp4"});
    device.media->exportSessions().front()->resume();
    EXPECT_EQ(recovered.get().movies.size(), 1U);
    EXPECT_TRUE(isInStore("ScreenRecording_2.mp4"));
}

TEST_F(MovieRecoveryTest, WhatWasWrittenLatelyIsLeftAlone) {
    leave("ScreenRecording_1.mp4", 1h);
    start();
    leave("ScreenRecording_1.mp4", 2s);  // recorded anew
    leave("ScreenRecording_2.mp4", 0s);
    EXPECT_THAT(recover().movies, IsEmpty());
    EXPECT_TRUE(isInStore("ScreenRecording_1.mp4"));
    EXPECT_TRUE(isInStore("ScreenRecording_2.mp4"));
}

TEST_F(MovieRecoveryTest, WhatWasWrittenRightBeforeACrashIsRecoveredAtOnce) {
    leave("ScreenRecording_1.mp4", 0s);
    start();
    EXPECT_EQ(recover().movies.size(), 1U);
}

TEST_F(MovieRecoveryTest, OneRecoveryAtATime) {
    leave("ScreenRecording_1.mp4");
    device.media->holdExports(true);
    start();
    auto first = ask(&KVLibraryProtocol::recoverMovies);
    ASSERT_TRUE(test::eventually([&] { return !device.media->exportSessions().empty(); }));
    const Answer second = recover();
    ASSERT_TRUE(second.error);
    EXPECT_EQ(second.error->code(), EBUSY);
    device.media->exportSessions().front()->resume();
    EXPECT_EQ(first.get().movies.size(), 1U);
}

TEST_F(MovieRecoveryTest, LibraryIsListed) {
    start();
    EXPECT_THAT(list().movies, IsEmpty());
    leave("ScreenRecording_1.mp4", 1h, 123);
    ASSERT_TRUE(device.photoLibrary->createVideoAsset(URL::file(path("ScreenRecording_1.mp4"))));
    const Answer answer = list();
    EXPECT_FALSE(answer.error);
    ASSERT_EQ(answer.movies.size(), 1U);
    const auto item = device.photoLibrary->items().front();
    EXPECT_EQ(answer.movies[0], (Dictionary{{"identifier", item.asset.localIdentifier},
                                            {"path", item.moviePath},
                                            {"creationDate", item.creationDate},
                                            {"size", std::uint64_t{123}}}));
}

TEST_F(MovieRecoveryTest, LibraryThatCannotBeReadIsAnError) {
    start();
    device.failNext("PhotoLibrary.assets", EIO);
    const Answer answer = list();
    ASSERT_TRUE(answer.error);
    EXPECT_EQ(answer.error->code(), EIO);
}

TEST_F(MovieRecoveryTest, OnlyTheShellIsAnswered) {
    leave("ScreenRecording_1.mp4");
    start();
    for (const Request request : {&KVLibraryProtocol::listMovies, &KVLibraryProtocol::recoverMovies}) {
        const Answer answer = ask(request, false).get();
        ASSERT_TRUE(answer.error);
        EXPECT_EQ(answer.error->code(), EPERM);
        EXPECT_THAT(answer.movies, IsEmpty());
    }
    EXPECT_TRUE(isInStore("ScreenRecording_1.mp4"));
}

}  // namespace
}  // namespace kelvo
