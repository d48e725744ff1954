#include "ManagerFixture.h"

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* kFramework = "/System/Library/Frameworks/KelvoKit.framework";

/// Bulletins about a recording that was saved by a stop before a start.
class ManagerBulletinTest : public test::ManagerFixture {
  protected:
    ManagerBulletinTest() {
        SimulatedBundleContent framework;
        auto& texts = framework.tables["en"]["Localizable"];
        for (const char* key : {"QUICK_PANEL_TITLE", "RECORDING_BULLETIN_MESSAGE",
                                "SYSTEM_RECORDING_LONG_PRESS_VIEW", "SYSTEM_RECORDING_LONG_PRESS_DELETE"})
            texts[key] = std::string("text of ") + key;
        device.bundles->addBundle(kFramework, framework);
        createManager();
    }

    /// Saves a recording; its asset.
    PhotoAsset save() {
        const std::string movie = std::string(kStore) + "/movie.mp4";
        device.fileSystem->addFile(movie, 100);
        device.media->addMovie(URL::file(movie), {});
        const auto system = recordingSystemSession();
        manager->stopCurrentRecordingSessionWithHandler(nullptr);
        system->completeFinish(URL::file(movie), std::nullopt);
        return device.photoLibrary->items().back().asset;
    }
};

TEST_F(ManagerBulletinTest, SavedRecordingIsToldAtOnce) {
    const PhotoAsset asset = save();
    EXPECT_EQ(device.bulletins->requests().back(), "interrupt");
    ASSERT_EQ(device.bulletins->bulletins().size(), 1U);
    const BulletinRequest bulletin = device.bulletins->bulletins().front();
    EXPECT_EQ(bulletin.sectionIdentifier, "text of QUICK_PANEL_TITLE");
    EXPECT_EQ(bulletin.recordIdentifier, "orginalRecordID");
    EXPECT_EQ(bulletin.title, "text of QUICK_PANEL_TITLE");
    EXPECT_EQ(bulletin.message, "text of RECORDING_BULLETIN_MESSAGE");
    EXPECT_EQ(bulletin.date, device.clock->now());
    EXPECT_EQ(bulletin.iconBundlePath, "/System/Library/QuickPanel/Bundles/KelvoKitModule.bundle");
    EXPECT_EQ(bulletin.iconName, "SettingsIcon");
    const std::string uuid = asset.localIdentifier.substr(0, asset.localIdentifier.find('/'));
    const URL launch("gallery://asset?uuid=" + uuid + "&albumname=camera-roll");
    EXPECT_EQ(bulletin.defaultActionURL, launch);
    EXPECT_THAT(
        bulletin.supplementaryActions,
        ElementsAre(
            BulletinAction{"viewAction", "text of SYSTEM_RECORDING_LONG_PRESS_VIEW", 1, launch},
            BulletinAction{"deleteAction", "text of SYSTEM_RECORDING_LONG_PRESS_DELETE", 1, std::nullopt}));
    EXPECT_EQ(manager->photoAsset().copy(), asset);
}

TEST_F(ManagerBulletinTest, DeletingFromAnOlderBulletinDeletesTheNewestRecording) {
    const PhotoAsset older = save();
    const PhotoAsset newest = save();
    manager->handleBulletinActionResponse("deleteAction");
    manager->handleBulletinActionResponse("deleteAction");
    ASSERT_EQ(device.photoLibrary->items().size(), 1U) << "one asset is remembered";
    EXPECT_EQ(device.photoLibrary->items().front().asset, older);
    EXPECT_FALSE(manager->photoAsset().copy());
}

TEST_F(ManagerBulletinTest, FailedDeletionIsLoggedAndForgotten) {
    save();
    device.failNext("PhotoLibrary.deleteAsset", EIO);
    manager->handleBulletinActionResponse("deleteAction");
    EXPECT_THAT(log.texts().back(),
                testing::StartsWith(
                    "KVRecordingManager: handleBulletinActionResponse: Error deleting photo asset: "));
    EXPECT_FALSE(manager->photoAsset().copy());
}

TEST_F(ManagerBulletinTest, OtherActionsAreTheServicesOwn) {
    save();
    manager->handleBulletinActionResponse("viewAction");
    EXPECT_EQ(device.photoLibrary->items().size(), 1U);
    EXPECT_TRUE(manager->photoAsset().copy());
}

TEST_F(ManagerBulletinTest, SectionIsNamedByItsTitleAndSortedByDate) {
    const BulletinSection section = manager->bulletinSection();
    EXPECT_EQ(section.identifier, "text of QUICK_PANEL_TITLE");
    EXPECT_EQ(section.mostMessageLines, 3);
    EXPECT_EQ(section.type, 0);
    EXPECT_TRUE(section.isSuppressedFromSettings);
    EXPECT_EQ(section.sortKey, "date");
    EXPECT_FALSE(section.isSortedAscending);
}

}  // namespace
}  // namespace kelvo
