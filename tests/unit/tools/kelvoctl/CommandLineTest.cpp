#include "tools/kelvoctl/CommandLine.h"

#include <array>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::ctl {
namespace {

Result<CommandLine> parse(const std::vector<const char*>& arguments) {
    return CommandLine::parse(arguments);
}

std::string problem(const std::vector<const char*>& arguments) {
    const auto line = parse(arguments);
    return line ? "none" : line.error().localizedDescription();
}

TEST(CommandLineTest, EveryCommandIsKnown) {
    const std::array<std::pair<const char*, Command>, 9> commands{{{"record", Command::record},
                                                                   {"stop", Command::stop},
                                                                   {"pause", Command::pause},
                                                                   {"resume", Command::resume},
                                                                   {"status", Command::status},
                                                                   {"extensions", Command::extensions},
                                                                   {"library", Command::library},
                                                                   {"watch", Command::watch},
                                                                   {"shell", Command::shell}}};
    for (const auto& [name, command] : commands) {
        const auto line = parse({name});
        ASSERT_TRUE(line) << name;
        EXPECT_EQ(line->command, command);
    }
}

TEST(CommandLineTest, OptionsOfARecordingAreRead) {
    const auto line = parse({"--socket=/s", "record", "--seconds", "2.5", "--microphone", "--output", "a.mp4",
                             "--size=1080x1920", "--json"});
    ASSERT_TRUE(line) << line.error().localizedDescription();
    EXPECT_EQ(line->socket, "/s");
    EXPECT_EQ(line->seconds, 2.5);
    EXPECT_TRUE(line->wantsMicrophone);
    EXPECT_EQ(line->output, "a.mp4");
    EXPECT_EQ(line->size, (Size{1080, 1920}));
    EXPECT_TRUE(line->isJson);
}

TEST(CommandLineTest, WhatIsWrongIsSaid) {
    EXPECT_EQ(problem({}), "what to do? kelvoctl --help tells the commands");
    EXPECT_EQ(problem({"frob"}), "unknown command frob");
    EXPECT_EQ(problem({"stop", "now"}), "unexpected argument now");
    EXPECT_EQ(problem({"status", "--frob"}), "unknown option --frob");
    EXPECT_EQ(problem({"status", "--microphone"}), "status takes no --microphone");
    EXPECT_EQ(problem({"stop", "--seconds", "1"}), "stop takes no --seconds");
    EXPECT_EQ(problem({"record", "--microphone=yes"}), "--microphone takes no value");
    EXPECT_EQ(problem({"record", "--output"}), "--output needs a file");
    EXPECT_EQ(problem({"record", "--output="}), "--output needs a file");
    EXPECT_EQ(problem({"status", "--socket"}), "--socket needs a path");
}

TEST(CommandLineTest, LibraryIsListedOrRecovered) {
    EXPECT_FALSE(parse({"library"})->isRecovery);
    const auto line = parse({"library", "recover", "--json"});
    ASSERT_TRUE(line);
    EXPECT_EQ(line->command, Command::library);
    EXPECT_TRUE(line->isRecovery);
    EXPECT_EQ(problem({"library", "recover", "recover"}), "unexpected argument recover");
    EXPECT_EQ(problem({"status", "recover"}), "unexpected argument recover");
    EXPECT_EQ(problem({"recover"}), "unknown command recover");
}

TEST(CommandLineTest, ButtonsThatAnswerAreKnown) {
    EXPECT_EQ(parse({"shell", "--answer", "default"})->answer, SystemAlertResponse::defaultButton);
    EXPECT_EQ(parse({"shell", "--answer", "alternate"})->answer, SystemAlertResponse::alternateButton);
    EXPECT_EQ(parse({"shell", "--answer", "other"})->answer, SystemAlertResponse::otherButton);
    EXPECT_EQ(parse({"shell", "--answer", "cancel"})->answer, SystemAlertResponse::cancelled);
    EXPECT_EQ(problem({"shell", "--answer", "yes"}),
              "--answer needs default, alternate, other or cancel, not yes");
}

TEST(CommandLineTest, NumbersThatAreNoneAreRefused) {
    for (const char* text : {"", "x", "0", "-1", "1s", "nan", "inf", "1e9"})
        EXPECT_NE(problem({"record", "--seconds", text}), "none") << text;
    for (const char* text : {"", "100", "100x", "x100", "0x100", "1e9x5", "100x100x", "axb"})
        EXPECT_NE(problem({"record", "--size", text}), "none") << text;
}

TEST(CommandLineTest, HelpNeedsNoCommandAndOverlooksTheRest) {
    EXPECT_TRUE(parse({"--help"})->wantsHelp);
    const auto line = parse({"stop", "--seconds", "1", "-h"});
    ASSERT_TRUE(line);
    EXPECT_TRUE(line->wantsHelp);
    EXPECT_EQ(line->command, Command::stop);
    EXPECT_TRUE(parse({"--version"})->wantsVersion);
}

TEST(CommandLineTest, EveryCommandHasAHelpOfItsOwnAndStandsInTheOverview) {
    const std::string overview = CommandLine::helpText(Command::none);
    for (const char* name :
         {"record", "stop", "pause", "resume", "status", "extensions", "library", "watch", "shell"}) {
        const std::string help = CommandLine::helpText(parse({name})->command);
        EXPECT_TRUE(help.starts_with(std::string("Usage: kelvoctl ") + name)) << help;
        EXPECT_NE(overview.find(std::string("\n  ") + name + " "), std::string::npos) << name;
    }
}

}  // namespace
}  // namespace kelvo::ctl
