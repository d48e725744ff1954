#include "platform/simulated/SimulatedDevice.h"
#include "support/KVTemporaryFileStore.h"
#include "support/LogRecorder.h"

#include <cerrno>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using namespace std::chrono_literals;
using test::LogRecorder;
using testing::ElementsAre;
using testing::IsEmpty;

const std::string kStore = "/private/var/mobile/Library/KelvoKit/";
const std::string kDeletionError =
    "error in _kkRemoveFile_srDeleteFilesOlderThanTimeToLiveInSeconds, error code: ";

class KVTemporaryFileStoreTest : public testing::Test {
  protected:
    KVTemporaryFileStoreTest() { files.createDirectory(kStore); }

    /// A file of the store, under the path that the logic forms: with a doubled slash.
    static std::string inStore(const std::string& name) { return kStore + "/" + name; }
    void addFile(const std::string& name, std::uint64_t size = 1, std::chrono::nanoseconds age = {}) {
        files.addFile(inStore(name), size, age);
    }
    std::vector<std::string> namesInStore() { return files.namesInDirectory(kStore).valueOr({}); }

    /// A completion that keeps its error and the thread on which it ran.
    ErrorHandler keepError() {
        return [this](const OptionalError& error) {
            ++completions;
            completionError = error;
            completionThread = std::this_thread::get_id();
        };
    }

    SimulatedDevice device;
    SimulatedFileSystem& files = *device.fileSystem;
    KVTemporaryFileStore store{device.fileSystem, device.textFolding, device.clock};
    LogRecorder log;
    int completions = 0;
    OptionalError completionError;
    std::thread::id completionThread;
};

TEST_F(KVTemporaryFileStoreTest, PathEndsInASlash) {
    EXPECT_EQ(KVTemporaryFileStore::_srTempPath(), "/private/var/mobile/Library/KelvoKit/");
}

TEST_F(KVTemporaryFileStoreTest, SetupCreatesTheDirectoryAndThoseAboveIt) {
    files.removeItem("/private");
    store._srSetupTempDirectory();
    ASSERT_TRUE(files.itemExists(kStore));
    EXPECT_TRUE(files.attributesOfItem(kStore)->isDirectory);
    EXPECT_THAT(log.lines(), ElementsAre(LogRecorder::Line{LogLevel::info, "_srSetupTempDirectory"}));
}

TEST_F(KVTemporaryFileStoreTest, SetupLeavesAnExistingDirectoryAlone) {
    addFile("a.mp4");
    device.failNext("FileSystem.createDirectory", EIO);
    store._srSetupTempDirectory();
    EXPECT_THAT(namesInStore(), ElementsAre("a.mp4"));
    EXPECT_THAT(log.texts(), ElementsAre("_srSetupTempDirectory"));
}

TEST_F(KVTemporaryFileStoreTest, SetupTakesAPlainFileForPresent) {
    files.removeItem(kStore);
    files.addFile("/private/var/mobile/Library/KelvoKit", 1);
    store._srSetupTempDirectory();
    EXPECT_FALSE(files.attributesOfItem(kStore)->isDirectory);
    EXPECT_THAT(log.texts(), ElementsAre("_srSetupTempDirectory"));
}

TEST_F(KVTemporaryFileStoreTest, FailedSetupIsPrintedAndLogged) {
    files.removeItem(kStore);
    device.failNext("FileSystem.createDirectory", EACCES);
    store._srSetupTempDirectory();
    const std::string description = KVError::posix(EACCES, "FileSystem.createDirectory").description();
    EXPECT_THAT(log.lines(),
                ElementsAre(LogRecorder::Line{LogLevel::info, "_srSetupTempDirectory"},
                            LogRecorder::Line{LogLevel::console, "error: " + description},
                            LogRecorder::Line{LogLevel::error, "error creating temp directory"}));
}

TEST_F(KVTemporaryFileStoreTest, SizeIsThatOfTheDirectorysEntryAlone) {
    const auto entrySize = static_cast<std::int64_t>(files.attributesOfItem(kStore)->size);
    addFile("a.mp4", 1000000);
    OptionalError error = KVError("stale", 1);
    EXPECT_EQ(store._srSizeOfTempDir(&error), entrySize);
    EXPECT_EQ(error, std::nullopt);
}

TEST_F(KVTemporaryFileStoreTest, SizeThatCannotBeReadIsZeroWithTheError) {
    device.failNext("FileSystem.attributesOfItem", EIO);
    OptionalError error;
    EXPECT_EQ(store._srSizeOfTempDir(&error), 0);
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), EIO);
}

TEST_F(KVTemporaryFileStoreTest, SizeNeedsNoPlaceForTheError) {
    files.removeItem(kStore);
    EXPECT_EQ(store._srSizeOfTempDir(nullptr), 0);
}

TEST_F(KVTemporaryFileStoreTest, DeletingAllDeletesEveryFileAndReturnsTheSumOfTheirSizes) {
    addFile("a.mp4", 10);
    addFile("b.mp4", 200, 1h);
    EXPECT_EQ(store._srDeleteAllTempFiles(), 210U);
    EXPECT_THAT(namesInStore(), IsEmpty());
    EXPECT_THAT(log.texts(), ElementsAre("_srDeleteFilesOlderThanTimeToLiveInSeconds: 0", "deleting old file",
                                         "deleting old file"));
}

TEST_F(KVTemporaryFileStoreTest, TimeToLiveOfZeroDeletesFilesOfTheFutureToo) {
    addFile("future.mp4", 7, -1h);
    EXPECT_EQ(store._srDeleteFilesOlderThanTimeToLiveInSeconds(0), 7U);
    EXPECT_THAT(namesInStore(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, FileAsOldAsTheTimeToLiveIsKept) {
    addFile("exact.mp4", 1, 86400s);
    addFile("older.mp4", 20, 86400s + 1ns);
    addFile("younger.mp4", 300, 86399s);
    EXPECT_EQ(store._srDeleteFilesOlderThanTimeToLiveInSeconds(86400), 20U);
    EXPECT_THAT(namesInStore(), ElementsAre("exact.mp4", "younger.mp4"));
}

TEST_F(KVTemporaryFileStoreTest, AgeGrowsWithTheClock) {
    addFile("a.mp4", 5);
    device.clock->advance(10s);
    EXPECT_EQ(store._srDeleteFilesOlderThanTimeToLiveInSeconds(10), 0U);
    device.clock->advance(1s);
    EXPECT_EQ(store._srDeleteFilesOlderThanTimeToLiveInSeconds(10), 5U);
}

TEST_F(KVTemporaryFileStoreTest, TimeToLiveIsLoggedAsAWholeNumber) {
    store._srDeleteFilesOlderThanTimeToLiveInSeconds(86400.9);
    EXPECT_THAT(log.texts(), ElementsAre("_srDeleteFilesOlderThanTimeToLiveInSeconds: 86400"));
}

TEST_F(KVTemporaryFileStoreTest, ListingThatFailsIsReportedAndFreesNothing) {
    addFile("a.mp4", 10);
    device.failNext("FileSystem.namesInDirectory", EIO);
    EXPECT_EQ(store._srDeleteAllTempFiles(), 0U);
    EXPECT_THAT(namesInStore(), ElementsAre("a.mp4"));
    EXPECT_EQ(log.count(LogLevel::error, kDeletionError + std::to_string(EIO)), 1U);
    EXPECT_EQ(log.count(LogLevel::console,
                        "error = " + KVError::posix(EIO, "FileSystem.namesInDirectory").description()),
              1U);
}

TEST_F(KVTemporaryFileStoreTest, RemovalThatFailsFreesNothingAndTheNextFileStillGoes) {
    addFile("a.mp4", 10);
    addFile("b.mp4", 200);
    device.failNext("FileSystem.removeItem", EACCES);
    EXPECT_EQ(store._srDeleteAllTempFiles(), 200U);
    EXPECT_THAT(namesInStore(), ElementsAre("a.mp4"));
    EXPECT_THAT(log.texts(),
                ElementsAre("_srDeleteFilesOlderThanTimeToLiveInSeconds: 0", "deleting old file",
                            kDeletionError + std::to_string(EACCES),
                            "error = " + KVError::posix(EACCES, "FileSystem.removeItem").description(),
                            "deleting old file"));
}

TEST_F(KVTemporaryFileStoreTest, FileWithoutAttributesGoesOnlyWhenAllGoAndCountsNothing) {
    addFile("a.mp4", 10, 100s);
    device.failNext("FileSystem.attributesOfItem", EIO);
    EXPECT_EQ(store._srDeleteFilesOlderThanTimeToLiveInSeconds(1), 0U);
    EXPECT_THAT(namesInStore(), ElementsAre("a.mp4"));
    EXPECT_EQ(log.count(LogLevel::error, kDeletionError + std::to_string(EIO)), 1U);
    device.failNext("FileSystem.attributesOfItem", EIO);
    EXPECT_EQ(store._srDeleteAllTempFiles(), 0U);
    EXPECT_THAT(namesInStore(), IsEmpty());
    EXPECT_EQ(log.count(LogLevel::error, kDeletionError + std::to_string(EIO)), 2U);
}

TEST_F(KVTemporaryFileStoreTest, MissingStoreIsReported) {
    files.removeItem(kStore);
    EXPECT_EQ(store._srDeleteAllTempFiles(), 0U);
    EXPECT_EQ(log.count(LogLevel::error, kDeletionError + std::to_string(ENOENT)), 1U);
}

TEST_F(KVTemporaryFileStoreTest, RemovedFileIsGoneAndTheCompletionRunsInTheBackground) {
    addFile("a.mp4");
    store._srRemoveFile(URL::file(inStore("a.mp4")), keepError());
    device.settle();
    EXPECT_THAT(namesInStore(), IsEmpty());
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(completionError, std::nullopt);
    EXPECT_NE(completionThread, std::this_thread::get_id());
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, RemovalOfAFileThatDoesNotExistIsNoError) {
    device.failNext("FileSystem.removeItem", EIO);  // not even asked
    store._srRemoveFile(URL::file(inStore("none.mp4")), keepError());
    device.settle();
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(completionError, std::nullopt);
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, RemovalThatFailsIsLoggedAndHandedOn) {
    addFile("a.mp4");
    device.failNext("FileSystem.removeItem", EACCES);
    store._srRemoveFile(URL::file(inStore("a.mp4")), keepError());
    device.settle();
    ASSERT_TRUE(completionError);
    EXPECT_EQ(completionError->code(), EACCES);
    EXPECT_THAT(log.lines(), ElementsAre(LogRecorder::Line{
                                 LogLevel::info, "_kkRemoveFile error: " + std::to_string(EACCES)}));
}

TEST_F(KVTemporaryFileStoreTest, RemovalNeedsNoCompletion) {
    addFile("a.mp4");
    store._srRemoveFile(URL::file(inStore("a.mp4")), nullptr);
    device.settle();
    EXPECT_THAT(namesInStore(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, MovedFileIsAtItsNewPlace) {
    addFile("a.mp4", 5);
    store._srMoveFileFromURL(URL::file(inStore("a.mp4")), URL::file(inStore("b.mp4")), keepError());
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("b.mp4"));
    EXPECT_EQ(completions, 1);
    EXPECT_EQ(completionError, std::nullopt);
    EXPECT_NE(completionThread, std::this_thread::get_id());
}

TEST_F(KVTemporaryFileStoreTest, MoveReplacesWhatStandsAtTheDestination) {
    addFile("a.mp4", 5);
    addFile("b.mp4", 99);
    store._srMoveFileFromURL(URL::file(inStore("a.mp4")), URL::file(inStore("b.mp4")), keepError());
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("b.mp4"));
    EXPECT_EQ(files.attributesOfItem(inStore("b.mp4"))->size, 5U);
    EXPECT_EQ(completionError, std::nullopt);
}

TEST_F(KVTemporaryFileStoreTest, MoveIgnoresThatTheDestinationCouldNotBeRemoved) {
    addFile("a.mp4", 5);
    addFile("b.mp4", 99);
    device.failNext("FileSystem.removeItem", EACCES);
    store._srMoveFileFromURL(URL::file(inStore("a.mp4")), URL::file(inStore("b.mp4")), keepError());
    device.settle();
    ASSERT_TRUE(completionError);
    EXPECT_EQ(completionError->code(), EEXIST);  // the move's own error
    EXPECT_THAT(log.texts(), ElementsAre("_kkMoveFileFromURL error: " + std::to_string(EEXIST)));
}

TEST_F(KVTemporaryFileStoreTest, MoveThatFailsIsLoggedAsAnErrorAndHandedOn) {
    store._srMoveFileFromURL(URL::file(inStore("none.mp4")), URL::file(inStore("b.mp4")), keepError());
    device.settle();
    ASSERT_TRUE(completionError);
    EXPECT_EQ(completionError->code(), ENOENT);
    EXPECT_THAT(log.lines(), ElementsAre(LogRecorder::Line{
                                 LogLevel::error, "_kkMoveFileFromURL error: " + std::to_string(ENOENT)}));
}

TEST_F(KVTemporaryFileStoreTest, MoveNeedsNoCompletion) {
    addFile("a.mp4");
    store._srMoveFileFromURL(URL::file(inStore("a.mp4")), URL::file(inStore("b.mp4")), nullptr);
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("b.mp4"));
}

TEST_F(KVTemporaryFileStoreTest, PrefixInUpperCaseMatchesNamesInLowerCase) {
    addFile("movie_1.mp4");
    addFile("MOVIE_2.mp4");
    addFile("other_movie.mp4");
    store._srDeleteFilesWithPrefix("MOVIE");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("other_movie.mp4"));
}

TEST_F(KVTemporaryFileStoreTest, PrefixMatchesWhateverTheDiacritics) {
    addFile("écran.mp4");
    addFile("Ecran.mp4");
    addFile("ecu.mp4");
    store._srDeleteFilesWithPrefix("eçRÂn");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("ecu.mp4"));
}

TEST_F(KVTemporaryFileStoreTest, NameShorterThanThePrefixStays) {
    addFile("mov");
    store._srDeleteFilesWithPrefix("movie");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("mov"));
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, RemovalErrorOfThePrefixIsLoggedOneNameLate) {
    for (const char* name : {"m1", "m2", "m3"})
        addFile(name);
    device.failNext("FileSystem.removeItem", EACCES);
    device.failNext("FileSystem.removeItem", EBUSY);
    store._srDeleteFilesWithPrefix("m");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("m1", "m2"));
    EXPECT_THAT(
        log.lines(),
        ElementsAre(
            LogRecorder::Line{LogLevel::error, "_kkDeleteFilesWithPrefix error: " + std::to_string(EACCES)},
            LogRecorder::Line{LogLevel::error, "_kkDeleteFilesWithPrefix error: " + std::to_string(EBUSY)}));
}

TEST_F(KVTemporaryFileStoreTest, ErrorStaysPendingThroughRemovalsThatSucceed) {
    for (const char* name : {"m1", "m2", "m3"})
        addFile(name);
    device.failNext("FileSystem.removeItem", EACCES);
    store._srDeleteFilesWithPrefix("m");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("m1"));
    EXPECT_EQ(log.count("_kkDeleteFilesWithPrefix error: " + std::to_string(EACCES)), 2U);
}

TEST_F(KVTemporaryFileStoreTest, LastRemovalErrorOfThePrefixIsNotLogged) {
    addFile("m1");
    device.failNext("FileSystem.removeItem", EACCES);
    store._srDeleteFilesWithPrefix("m");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("m1"));
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, ListingThatFailsDeletesNothingOfThePrefixAndIsNotLogged) {
    addFile("m1");
    device.failNext("FileSystem.namesInDirectory", EIO);
    store._srDeleteFilesWithPrefix("m");
    device.settle();
    EXPECT_THAT(namesInStore(), ElementsAre("m1"));
    EXPECT_THAT(log.texts(), IsEmpty());
}

TEST_F(KVTemporaryFileStoreTest, CreationDateIsTheFiles) {
    addFile("a.mp4", 1, 60s);
    EXPECT_EQ(store._srGetCreationDateForFile(URL::file(inStore("a.mp4"))), device.clock->now() + -60s);
}

TEST_F(KVTemporaryFileStoreTest, CreationDateOfAMissingFileIsNone) {
    EXPECT_EQ(store._srGetCreationDateForFile(URL::file(inStore("none.mp4"))), std::nullopt);
}

TEST_F(KVTemporaryFileStoreTest, FreeSpaceIsTheVolumes) {
    device.setFreeSpace(123456789);
    EXPECT_EQ(store._srDeviceFreeDiskSpace(), 123456789U);
}

TEST_F(KVTemporaryFileStoreTest, FreeSpaceThatCannotBeReadIsZero) {
    device.failNext("FileSystem.freeSpace", EIO);
    EXPECT_EQ(store._srDeviceFreeDiskSpace(), 0U);
    device.failNext("FileSystem.freeSpace", EIO);
    EXPECT_FALSE(store._srDeviceHasSufficientFreeSpaceForRecording());
}

TEST_F(KVTemporaryFileStoreTest, ExactlyAHundredMillionFreeBytesAreNotEnough) {
    device.setFreeSpace(100000000);
    EXPECT_FALSE(store._srDeviceHasSufficientFreeSpaceForRecording());
    device.setFreeSpace(100000001);
    EXPECT_TRUE(store._srDeviceHasSufficientFreeSpaceForRecording());
}

TEST_F(KVTemporaryFileStoreTest, OnlyFilesOfTheDirectoryItselfAreInTheStore) {
    for (const std::string& inside : {kStore + "a.mp4", kStore + "/a.mp4", kStore + "x/../a.mp4"})
        EXPECT_EQ(KVTemporaryFileStore::nameInStore(URL::file(inside)), "a.mp4") << inside;
    for (const std::string& outside :
         {std::string("/etc/passwd"), kStore, kStore + ".", kStore + "..", kStore + "../a.mp4",
          kStore + "../../KelvoKit/../a.mp4", kStore + "x/a.mp4", std::string("a.mp4"), std::string()})
        EXPECT_FALSE(KVTemporaryFileStore::nameInStore(URL::file(outside))) << outside;
    EXPECT_FALSE(KVTemporaryFileStore::nameInStore(URL("https://example.com" + kStore + "a.mp4")));
}

}  // namespace
}  // namespace kelvo
