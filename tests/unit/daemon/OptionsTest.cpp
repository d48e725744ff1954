#include "daemon/Options.h"

#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

Result<Options> parse(const std::vector<const char*>& arguments) {
    return Options::parse(arguments);
}

std::string problemWith(const std::vector<const char*>& arguments) {
    const auto options = parse(arguments);
    return options ? "none" : options.error().localizedDescription();
}

TEST(OptionsTest, WithoutArgumentsItRunsOnTheRootAndLogsToTheJournal) {
    const auto options = parse({});
    ASSERT_TRUE(options);
    EXPECT_EQ(options->action, Options::Action::run);
    EXPECT_EQ(options->root, "/");
    EXPECT_EQ(options->log, Options::Log::journal);
    EXPECT_EQ(options->resourceFolder, "");
    EXPECT_FALSE(options->savesToUsersVideos);
    EXPECT_TRUE(options->logsSamples);
}

TEST(OptionsTest, WhatBecameOfSamplesIsLeftOutOfTheLog) {
    const auto options = parse({"--no-sample-log", "--root", "/d"});
    ASSERT_TRUE(options);
    EXPECT_FALSE(options->logsSamples);
    EXPECT_EQ(options->root, "/d");
}

TEST(OptionsTest, ValuesStandBehindTheOptionOrItsEqualsSign) {
    const auto options = parse({"--root", "/d", "--log=stderr", "--user-videos", "--resources", "/r"});
    ASSERT_TRUE(options);
    EXPECT_EQ(options->root, "/d");
    EXPECT_EQ(options->log, Options::Log::standardError);
    EXPECT_EQ(options->resourceFolder, "/r");
    EXPECT_TRUE(options->savesToUsersVideos);
}

TEST(OptionsTest, HelpAndVersionAreActions) {
    EXPECT_EQ(parse({"--help"})->action, Options::Action::showHelp);
    EXPECT_EQ(parse({"-h"})->action, Options::Action::showHelp);
    EXPECT_EQ(parse({"--version"})->action, Options::Action::showVersion);
}

TEST(OptionsTest, WhatIsWrongIsNamed) {
    EXPECT_EQ(problemWith({"--bogus"}), "unknown option --bogus");
    EXPECT_EQ(problemWith({"--bogus=1"}), "unknown option --bogus");
    EXPECT_EQ(problemWith({"extra"}), "unexpected argument extra");
    EXPECT_EQ(problemWith({""}), "unexpected argument ");
    EXPECT_EQ(problemWith({"--root"}), "--root needs a folder");
    EXPECT_EQ(problemWith({"--root="}), "--root needs a folder");
    EXPECT_EQ(problemWith({"--log", "paper"}), "--log needs \"journal\" or \"stderr\"");
    EXPECT_EQ(problemWith({"--log"}), "--log needs \"journal\" or \"stderr\"");
    EXPECT_EQ(problemWith({"--user-videos=x"}), "--user-videos takes no value");
    EXPECT_EQ(problemWith({"--no-sample-log=x"}), "--no-sample-log takes no value");
    EXPECT_EQ(problemWith({"--help=x"}), "--help takes no value");
}

}  // namespace
}  // namespace kelvo
