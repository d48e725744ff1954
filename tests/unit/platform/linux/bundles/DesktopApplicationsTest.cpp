#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <filesystem>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

/// A desktop with the folders "own" and "shared", the first the more important, and programs in "bin".
class DesktopApplicationsTest : public testing::Test {
  protected:
    LinuxBundleService serviceFor(std::string_view language) const {
        return {std::make_shared<const DeviceRoot>(device.path(), "/none"),
                std::make_shared<LocaleLanguages>(language, ""),
                {{host.path() + "/own", host.path() + "/shared"}, {"/nowhere", host.path() + "/bin"}}};
    }
    std::string program(const std::string& name) const { return host.write("bin/" + name, "program"); }
    void entry(const std::string& relativePath, const std::string& lines) const {
        host.write(relativePath, "[Desktop Entry]\nType=Application\n" + lines);
    }
    /// The identifier of the application that a program belongs to; empty when it belongs to none.
    std::string ownerOf(const std::string& path) {
        const auto folder = service.folderOfBundleOwning(path);
        const BundleRef bundle = folder ? service.bundleAtPath(*folder) : nullptr;
        return bundle ? bundle->bundleIdentifier() : std::string();
    }

    const test::TemporaryDirectory device;
    const test::TemporaryDirectory host;
    LinuxBundleService service = serviceFor("en");
};

TEST_F(DesktopApplicationsTest, ApplicationIsFoundByItsIdentifier) {
    entry("shared/applications/org.example.Editor.desktop", "Name=Editor\nName[de]=Schreiber\nExec=editor\n");
    const BundleRef bundle = service.bundleWithIdentifier("org.example.Editor");
    ASSERT_TRUE(bundle);
    EXPECT_EQ(bundle->bundleIdentifier(), "org.example.Editor");
    EXPECT_EQ(bundle->path(), "/@host" + host.path() + "/shared/applications/org.example.Editor.desktop");
    EXPECT_EQ(bundle->displayName(), "Editor");
    EXPECT_EQ(bundle->name(), "Editor");
    EXPECT_TRUE(bundle->localizations().empty());
    EXPECT_EQ(service.bundleAtPath(bundle->path())->bundleIdentifier(), "org.example.Editor");
    EXPECT_EQ(service.bundleWithIdentifier("org.example.None"), nullptr);
}

TEST_F(DesktopApplicationsTest, NameIsInTheUsersLanguageElseThePlainOne) {
    entry("shared/applications/a.desktop", "Name=Editor\nName[af]=Redigeerder\nName[de]=Schreiber\nExec=a\n");
    EXPECT_EQ(serviceFor("de_AT").bundleWithIdentifier("a")->localizedDisplayName(), "Schreiber");
    EXPECT_EQ(serviceFor("it").bundleWithIdentifier("a")->localizedDisplayName(), "Editor");
}

TEST_F(DesktopApplicationsTest, ProcessBelongsToTheEntryThatStartsItsProgram) {
    const std::string path = program("editor");
    entry("shared/applications/org.example.Editor.desktop", "Name=Editor\nExec=editor %U\n");
    EXPECT_EQ(ownerOf(path), "org.example.Editor");
    EXPECT_EQ(ownerOf(program("other")), "");
}

TEST_F(DesktopApplicationsTest, LinkToAProgramLeadsToIt) {
    const std::string path = host.write("opt/editor/editor", "program");
    fs::create_directories(host.path() + "/bin");
    fs::create_symlink(path, host.path() + "/bin/editor");
    entry("shared/applications/a.desktop", "Name=Editor\nExec=editor\n");
    EXPECT_EQ(ownerOf(path), "a");
}

TEST_F(DesktopApplicationsTest, ApplicationHasNoRights) {
    entry("own/applications/a.desktop", "Name=A\nExec=a\nentitlements=com.quillon.private.kelvo-kit\n");
    EXPECT_TRUE(service.bundleWithIdentifier("a")->entitlements().empty());
}

TEST_F(DesktopApplicationsTest, BundleFolderComesFirst) {
    const std::string path = device.write("Applications/A.app/a", "program");
    device.write("Applications/A.app/Info.json", R"({"identifier":"a","displayName":"Bundle"})");
    entry("own/applications/a.desktop", "Name=Entry\nExec=" + path + "\n");
    entry("own/applications/b.desktop", "Name=Entry\nExec=" + path + "\n");
    EXPECT_EQ(service.bundleWithIdentifier("a")->displayName(), "Bundle");
    EXPECT_EQ(ownerOf(path), "a");
}

TEST_F(DesktopApplicationsTest, NamesOfTheSystemAreNotForTheDesktop) {
    const std::string path = program("shell");
    entry("own/applications/com.quillon.plinth.desktop", "Name=Shell\nExec=shell\n");
    entry("own/applications/com/quillon.plinth.desktop", "Name=Shell\nExec=shell\n");
    EXPECT_EQ(service.bundleWithIdentifier("com.quillon.plinth"), nullptr);
    EXPECT_EQ(ownerOf(path), "com-quillon.plinth");
}

TEST_F(DesktopApplicationsTest, MoreImportantFolderCounts) {
    entry("shared/applications/a.desktop", "Name=Shared\nExec=a\n");
    entry("shared/applications/b.desktop", "Name=Shared\nExec=b\n");
    entry("own/applications/a.desktop", "Name=Own\nExec=a\n");
    entry("own/applications/b.desktop", "Name=Own\nExec=b\nHidden=true\n");
    EXPECT_EQ(service.bundleWithIdentifier("a")->displayName(), "Own");
    EXPECT_EQ(service.bundleWithIdentifier("b"), nullptr) << "its user took it away";
}

TEST_F(DesktopApplicationsTest, FoldersArePartOfTheIdentifier) {
    entry("shared/applications/suite/writer.desktop", "Name=Writer\nExec=a\n");
    EXPECT_TRUE(service.bundleWithIdentifier("suite-writer"));
}

TEST_F(DesktopApplicationsTest, EntryWithoutOptionsOwnsTheProgram) {
    const std::string path = program("browser");
    entry("own/applications/page.desktop", "Name=Page\nExec=browser --page=1\n");
    entry("shared/applications/browser.desktop", "Name=Browser\nExec=browser %U\n");
    EXPECT_EQ(ownerOf(path), "browser");
}

TEST_F(DesktopApplicationsTest, InterpretersAndTerminalProgramsAreNoApplications) {
    const std::string interpreter = program("python3");
    const std::string editor = program("vi");
    entry("own/applications/game.desktop", "Name=Game\nExec=python3 game.py\n");
    entry("own/applications/vi.desktop", "Name=Vi\nExec=vi\nTerminal=true\n");
    EXPECT_EQ(ownerOf(interpreter), "");
    EXPECT_EQ(ownerOf(editor), "");
    EXPECT_EQ(service.bundleWithIdentifier("game")->displayName(), "Game");
    EXPECT_EQ(service.bundleWithIdentifier("vi"), nullptr);
}

TEST_F(DesktopApplicationsTest, WhatComesAndGoesIsNoticed) {
    EXPECT_EQ(service.bundleWithIdentifier("a"), nullptr);
    entry("shared/applications/a.desktop", "Name=A\nExec=a\n");
    EXPECT_TRUE(service.bundleWithIdentifier("a"));
    fs::remove(host.path() + "/shared/applications/a.desktop");
    EXPECT_EQ(service.bundleWithIdentifier("a"), nullptr);
}

TEST_F(DesktopApplicationsTest, MalformedEntryIsLoggedAndPassedOver) {
    const test::LogRecorder log;
    const std::string file = host.write("own/applications/a.desktop", "what?\n");
    entry("own/applications/b.desktop", "Name=B\nExec=b\n");
    EXPECT_TRUE(service.bundleWithIdentifier("b"));
    EXPECT_EQ(service.bundleWithIdentifier("a"), nullptr);
    EXPECT_EQ(log.count(LogLevel::error, "cannot read " + file + ": line 1: not a desktop entry"), 1U);
}

TEST_F(DesktopApplicationsTest, FolderThatLeadsBackToItselfEnds) {
    entry("own/applications/a.desktop", "Name=A\nExec=a\n");
    fs::create_directory_symlink(host.path() + "/own/applications", host.path() + "/own/applications/again");
    EXPECT_TRUE(service.bundleWithIdentifier("a"));
    EXPECT_EQ(service.bundleWithIdentifier("again-again-again-again-a"), nullptr);
}

TEST_F(DesktopApplicationsTest, IconIsThatOfTheTheme) {
    entry("own/applications/a.desktop", "Name=A\nExec=a\nIcon=editor\n");
    const auto icon = [this] { return service.bundleWithIdentifier("a")->iconPath().value_or("none"); };
    EXPECT_EQ(icon(), "none");
    for (const char* path :
         {"shared/pixmaps/editor.png", "shared/icons/hicolor/scalable/apps/editor.svg",
          "own/icons/hicolor/48x48/apps/editor.png", "shared/icons/hicolor/256x256/apps/editor.png"}) {
        const std::string file = host.write(path, "picture");
        EXPECT_EQ(icon(), "/@host" + file);
    }
}

TEST_F(DesktopApplicationsTest, IconMayBeAFile) {
    const std::string picture = host.write("opt/a.png", "picture");
    entry("own/applications/a.desktop", "Name=A\nExec=a\nIcon=" + picture + "\n");
    entry("own/applications/b.desktop", "Name=B\nExec=b\nIcon=/nowhere.png\n");
    entry("own/applications/c.desktop", "Name=C\nExec=c\nIcon=../../../../opt/a\n");
    EXPECT_EQ(service.bundleWithIdentifier("a")->iconPath(), "/@host" + picture);
    EXPECT_EQ(service.bundleWithIdentifier("b")->iconPath(), std::nullopt);
    EXPECT_EQ(service.bundleWithIdentifier("c")->iconPath(), std::nullopt);
}

TEST_F(DesktopApplicationsTest, BundleFoldersIconIsInTheFolder) {
    device.write("Applications/A.app/Info.json", R"({"identifier":"a","icon":"art/./icon.png"})");
    device.write("Applications/A.app/art/icon.png", "picture");
    device.write("Applications/B.app/Info.json", R"({"identifier":"b","icon":"../A.app/art/icon.png"})");
    device.write("Applications/C.app/Info.json", R"({"identifier":"c","icon":"missing.png"})");
    EXPECT_EQ(service.bundleWithIdentifier("a")->iconPath(), "/Applications/A.app/art/icon.png");
    EXPECT_EQ(service.bundleWithIdentifier("b")->iconPath(), std::nullopt);
    EXPECT_EQ(service.bundleWithIdentifier("c")->iconPath(), std::nullopt);
}

}  // namespace
}  // namespace kelvo
