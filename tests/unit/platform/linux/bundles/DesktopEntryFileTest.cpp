#include "platform/linux/bundles/DesktopEntryFile.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::ElementsAre;

DesktopEntryFile parsed(const std::string& lines) {
    const auto file = DesktopEntryFile::parse("[Desktop Entry]\n" + lines);
    EXPECT_TRUE(file) << file.error().description();
    return file ? *file : DesktopEntryFile();
}

std::vector<std::string> commandOf(const std::string& command) {
    return parsed("Exec=" + command + "\n").command;
}

std::string problemWith(const std::string& text) {
    const auto file = DesktopEntryFile::parse(text);
    return file ? "nothing" : file.error().localizedDescription();
}

TEST(DesktopEntryFileTest, NamesAndIconAreRead) {
    const auto file = parsed(
        "# of an editor\nType=Application\nName = Editor\r\nName[de]=Textverarbeitung\n"
        "Name[pt_BR]=Editor de texto\nIcon=editor\nExec=editor %U\n");
    EXPECT_TRUE(file.isApplication);
    EXPECT_EQ(file.name, "Editor");
    EXPECT_EQ(file.localizedNames,
              (Dictionary{{"de", "Textverarbeitung"}, {"pt-BR", "Editor de texto"}, {"en", "Editor"}}));
    EXPECT_EQ(file.icon, "editor");
    EXPECT_FALSE(file.isHidden);
    EXPECT_FALSE(file.isForTerminal);
}

TEST(DesktopEntryFileTest, NameInTheEnglishOfItsOwnStays) {
    EXPECT_EQ(parsed("Name=a\nName[en]=b\n").localizedNames, (Dictionary{{"en", "b"}}));
}

TEST(DesktopEntryFileTest, NameInAnotherScriptIsNotTheLanguages) {
    EXPECT_EQ(parsed("Name=a\nName[sr]=b\nName[sr@latin]=c\nName[]=d\n").localizedNames,
              (Dictionary{{"sr", "b"}, {"en", "a"}}));
}

TEST(DesktopEntryFileTest, OtherGroupsArePassedOver) {
    const auto file = parsed("Name=a\nExec=a\n[Desktop Action new]\nName=b\nExec=b\nTerminal=true\n");
    EXPECT_EQ(file.name, "a");
    EXPECT_THAT(file.command, ElementsAre("a"));
    EXPECT_FALSE(file.isForTerminal);
}

TEST(DesktopEntryFileTest, EscapesOfTextsAreUndone) {
    EXPECT_EQ(parsed("Name=a\\sb\\tc\\\\d\\\n").name, "a b\tc\\d\\");
}

TEST(DesktopEntryFileTest, CommandIsSplitAtSpacesOutsideQuotes) {
    EXPECT_THAT(commandOf("a  -b c"), ElementsAre("a", "-b", "c"));
    EXPECT_THAT(commandOf("\"/opt/the program/a\" \"x \\\\\"y\\\\\"\""),
                ElementsAre("/opt/the program/a", "x \"y\""));
    EXPECT_THAT(commandOf(""), ElementsAre());
}

TEST(DesktopEntryFileTest, PlacesForFilesAreNoArguments) {
    EXPECT_THAT(commandOf("a %f %U %i %c %k"), ElementsAre("a"));
    EXPECT_THAT(commandOf("a --name=%c %%"), ElementsAre("a", "--name=%c", "%%"));
}

TEST(DesktopEntryFileTest, OnlyAProgramWithoutArgumentsOfItsOwnIsSpokenFor) {
    EXPECT_TRUE(parsed("Exec=editor %F\n").speaksForItsProgram());
    EXPECT_TRUE(parsed("Exec=editor %F\n").isPlain());
    EXPECT_TRUE(parsed("Exec=editor --new %F\n").speaksForItsProgram());
    EXPECT_FALSE(parsed("Exec=editor --new %F\n").isPlain());
    EXPECT_FALSE(parsed("Exec=python3 /usr/share/game/game.py\n").speaksForItsProgram());
    EXPECT_FALSE(parsed("Exec=sh -c \"exec something\"\n").speaksForItsProgram());
    EXPECT_FALSE(parsed("Name=a\n").speaksForItsProgram());
}

TEST(DesktopEntryFileTest, WhatIsNoEntryIsRefused) {
    EXPECT_EQ(problemWith(""), "not a desktop entry");
    EXPECT_EQ(problemWith("Name=a\n"), "line 1: not a desktop entry");
    EXPECT_EQ(problemWith("\n[Other]\n"), "line 2: not a desktop entry");
    EXPECT_EQ(problemWith("[Desktop Entry]\nName\n"), "line 2: no key");
    EXPECT_EQ(problemWith("[Desktop Entry]\nExec=\"a\n"), "line 2: the quotes of the command do not end");
    EXPECT_EQ(problemWith("[Desktop Entry]\nName=\xff\n"), "not UTF-8");
}

TEST(DesktopEntryFileTest, BoundsAreHeld) {
    EXPECT_EQ(problemWith("[Desktop Entry]\nName=" + std::string(4096, 'x')), "nothing");
    EXPECT_EQ(problemWith("[Desktop Entry]\nName=" + std::string(4097, 'x')), "line 2: the text is too long");
    EXPECT_EQ(problemWith(std::string(DesktopEntryFile::kMostBytes + 1, '#')), "the file is too large");
    std::string names = "[Desktop Entry]\n";
    for (int i = 0; i < 1025; ++i)
        names += "Name[x" + std::to_string(i) + "]=a\n";
    EXPECT_EQ(problemWith(names), "line 1026: too many names");
}

}  // namespace
}  // namespace kelvo
