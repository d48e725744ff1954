#include "platform/simulated/SimulatedDevice.h"

#include <cerrno>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

ApplicationInformation application(std::int32_t process, const std::string& bundle, std::int32_t state,
                                   bool isFrontmost) {
    ApplicationInformation information;
    information.state = state;
    information.processIdentifier = process;
    information.isFrontmost = isFrontmost;
    information.bundleIdentifier = bundle;
    return information;
}

class SimulatedLibraryTest : public testing::Test {
  protected:
    SimulatedDevice device;
    const URL movie = URL::file("/m.mp4");
};

TEST_F(SimulatedLibraryTest, MovieBecomesAnAssetUntilItIsDeleted) {
    device.fileSystem->addFile("/m.mp4", 1);
    const auto first = device.photoLibrary->createVideoAsset(movie);
    const auto second = device.photoLibrary->createVideoAsset(movie);
    ASSERT_TRUE(first && second);
    EXPECT_NE(first->localIdentifier, second->localIdentifier);
    EXPECT_TRUE(device.fileSystem->itemExists("/m.mp4"));
    EXPECT_EQ(device.photoLibrary->assetWithLocalIdentifier(first->localIdentifier), *first);
    EXPECT_EQ(device.photoLibrary->deleteAsset(*first), std::nullopt);
    EXPECT_EQ(device.photoLibrary->assetWithLocalIdentifier(first->localIdentifier), std::nullopt);
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_EQ(device.photoLibrary->deleteAsset(*first)->code(), ENOENT);
}

TEST_F(SimulatedLibraryTest, MissingMovieBecomesNoAsset) {
    EXPECT_EQ(device.photoLibrary->createVideoAsset(movie).error().code(), ENOENT);
    EXPECT_THAT(device.photoLibrary->items(), IsEmpty());
}

TEST_F(SimulatedLibraryTest, OrderedFailuresAreReported) {
    device.fileSystem->addFile("/m.mp4", 1);
    device.failNext("PhotoLibrary.createVideoAsset", ENOSPC);
    EXPECT_EQ(device.photoLibrary->createVideoAsset(movie).error().code(), ENOSPC);
    const auto asset = device.photoLibrary->createVideoAsset(movie);
    ASSERT_TRUE(asset);
    device.failNext("PhotoLibrary.deleteAsset", EIO);
    EXPECT_EQ(device.photoLibrary->deleteAsset(*asset)->code(), EIO);
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
}

TEST(SimulatedApplicationsTest, ChangesReachTheHandlerInTheirOrderUntilItIsTakenAway) {
    SimulatedDevice device;
    std::vector<std::int32_t> states;
    device.applications->setUpdateHandler([&](const auto& update) { states.push_back(update.state); });
    device.applications->change(application(5, "a", 8, true));
    device.applications->change(application(5, "a", 4, false));
    device.settle();
    EXPECT_TRUE(device.applications->hasUpdateHandler());
    device.applications->setUpdateHandler(nullptr);
    device.applications->change(application(5, "a", 8, false));
    device.settle();
    EXPECT_FALSE(device.applications->hasUpdateHandler());
    EXPECT_THAT(states, ElementsAre(8, 4));
}

TEST(SimulatedApplicationsTest, AnswersComeFromTheLatestChange) {
    SimulatedDevice device;
    device.applications->change(application(5, "a", 8, true));
    EXPECT_EQ(device.applications->stateOfApplication("a"), 8);
    EXPECT_EQ(device.applications->stateOfApplication("b"), 0);
    EXPECT_EQ(device.applications->informationOfProcess(5)->bundleIdentifier, "a");
    EXPECT_FALSE(device.applications->informationOfProcess(6));
    EXPECT_EQ(device.applications->frontmostApplicationBundleIdentifier(), "a");
    std::vector<std::int32_t> processes;
    const auto answered = [&](const auto& found) {
        processes.push_back(found ? found->processIdentifier : -1);
    };
    device.applications->informationOfApplication("a", answered);
    device.applications->informationOfApplication("b", answered);
    device.settle();
    EXPECT_THAT(processes, ElementsAre(5, -1));
    device.applications->change(application(5, "a", 1, false));
    device.applications->clearFrontmost();
    EXPECT_FALSE(device.applications->informationOfProcess(5));
    EXPECT_EQ(device.applications->frontmostApplicationBundleIdentifier(), std::nullopt);
}

TEST(SimulatedApplicationsTest, StaleUpdateChangesNothing) {
    SimulatedDevice device;
    int updates = 0;
    device.applications->setUpdateHandler([&](const auto&) { ++updates; });
    device.applications->report(application(5, "a", 8, true));
    device.settle();
    EXPECT_EQ(updates, 1);
    EXPECT_EQ(device.applications->frontmostApplicationBundleIdentifier(), std::nullopt);
    EXPECT_EQ(device.applications->stateOfApplication("a"), 0);
}

TEST(SimulatedEnvironmentTest, SoundsCarAndScreenReaderAreAsSet) {
    SimulatedDevice device;
    device.sounds->playSystemSound(kSystemSoundBeginRecording);
    device.sounds->playSystemSound(kSystemSoundEndRecording);
    EXPECT_THAT(device.sounds->played(), ElementsAre(1117U, 1118U));
    EXPECT_FALSE(*device.inCarDisplay->isActive());
    device.inCarDisplay->setActive(true);
    device.failNext("InCarDisplay.isActive", EIO);
    EXPECT_EQ(device.inCarDisplay->isActive().error().code(), EIO);
    EXPECT_TRUE(*device.inCarDisplay->isActive());
    EXPECT_FALSE(device.accessibility->isScreenReaderRunning());
    device.accessibility->setScreenReaderRunning(true);
    EXPECT_TRUE(device.accessibility->isScreenReaderRunning());
    EXPECT_EQ(device.platform().processIdentifier, SimulatedDevice::kProcessIdentifier);
}

}  // namespace
}  // namespace kelvo
