#include "platform/linux/library/LinuxPhotoLibrary.h"
#include "platform/linux/library/UserFolders.h"
#include "support/TemporaryDirectory.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class UserFoldersTest : public testing::Test {
  protected:
    std::string folderWith(const std::string& userDirs) const {
        home.write(".config/user-dirs.dirs", userDirs);
        return videosFolder({home.path(), "", ""});
    }
    test::TemporaryDirectory home;
};

TEST_F(UserFoldersTest, VideosIsTheFallback) {
    EXPECT_EQ(videosFolder({home.path(), "", ""}), home.path() + "/Videos");
    EXPECT_EQ(folderWith("# nothing\nXDG_MUSIC_DIR=\"$HOME/Music\"\n"), home.path() + "/Videos");
}

TEST_F(UserFoldersTest, FolderIsReadFromTheUsersFile) {
    EXPECT_EQ(folderWith("# comment\nXDG_VIDEOS_DIR=\"$HOME/Filme\"\n"), home.path() + "/Filme");
    EXPECT_EQ(folderWith("  XDG_VIDEOS_DIR=\"/media/\\\"a b\\\"\""), "/media/\"a b\"");
}

TEST_F(UserFoldersTest, LastLineCounts) {
    EXPECT_EQ(folderWith("XDG_VIDEOS_DIR=\"/a\"\nXDG_VIDEOS_DIR=\"/b\"\n"), "/b");
}

TEST_F(UserFoldersTest, UselessLinesArePassedOver) {
    for (const char* line :
         {"XDG_VIDEOS_DIR=\"relative\"\n", "XDG_VIDEOS_DIR=/bare\n", "XDG_VIDEOS_DIR=\"$HOME/\"\n",
          "XDG_VIDEOS_DIR=\"", "#XDG_VIDEOS_DIR=\"/a\"\n"}) {
        EXPECT_EQ(folderWith(line), home.path() + "/Videos") << line;
    }
}

TEST_F(UserFoldersTest, EnvironmentDecidesFirst) {
    home.write("config/user-dirs.dirs", "XDG_VIDEOS_DIR=\"/from/file\"\n");
    EXPECT_EQ(videosFolder({home.path(), home.path() + "/config", ""}), "/from/file");
    EXPECT_EQ(videosFolder({home.path(), home.path() + "/config", "/from/environment"}), "/from/environment");
    EXPECT_EQ(videosFolder({home.path(), "relative", "relative"}), home.path() + "/Videos");
}

TEST_F(UserFoldersTest, RootOfOnesOwnHasItsOwnRecordings) {
    EXPECT_EQ(screenRecordingsFolder(DeviceRoot("/srv/phone", "/none")),
              "/srv/phone/private/var/mobile/Media/Videos/Screen Recordings");
    EXPECT_TRUE(screenRecordingsFolder(DeviceRoot("/", "/none")).ends_with("/Screen Recordings"));
}

}  // namespace
}  // namespace kelvo
