#include "base/GlobalQueue.h"
#include "platform/linux/analytics/AnalyticsLine.h"
#include "platform/linux/analytics/AnalyticsLog.h"
#include "platform/linux/analytics/LineFile.h"
#include "platform/simulated/SimulatedClock.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"

#include <cerrno>
#include <filesystem>
#include <fstream>
#include <limits>
#include <semaphore>
#include <thread>

#include <gtest/gtest.h>
#include <nlohmann/json.hpp>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

std::vector<std::string> linesOf(const std::string& path) {
    std::ifstream file(path);
    std::vector<std::string> lines;
    for (std::string line; std::getline(file, line);)
        lines.push_back(line);
    return lines;
}

AnalyticsMessage message(const std::string& service) {
    AnalyticsMessage message;
    message.clientType = 23;
    message.clientVersion = 1;
    message.isBatchEvent = true;
    message.clientName = "KelvoKit";
    message.serviceName = service;
    message.category = 1;
    message.payload = {{"ActiveDuration", 3}, {"FrontCameraUsed", true}};
    return message;
}

class AnalyticsLogTest : public testing::Test {
  protected:
    test::TemporaryDirectory folder;
    const std::string path = folder.path() + "/Logs/analytics.jsonl";
    std::shared_ptr<SimulatedClock> clock = std::make_shared<SimulatedClock>();
};

TEST_F(AnalyticsLogTest, EachMessageIsOneLineOfJson) {
    AnalyticsLog log(path, clock);
    EXPECT_EQ(log.send(message("SystemRecording")), std::nullopt);
    EXPECT_EQ(log.send(message("line\nbreak")), std::nullopt);
    GlobalQueue::drain();
    const auto lines = linesOf(path);
    ASSERT_EQ(lines.size(), 2U);
    const auto json = nlohmann::json::parse(lines[0]);
    EXPECT_EQ(json["clientName"], "KelvoKit");
    EXPECT_EQ(json["serviceName"], "SystemRecording");
    EXPECT_EQ(json["clientType"], 23);
    EXPECT_EQ(json["batchEvent"], true);
    EXPECT_EQ(json["userInfoRequired"], false);
    EXPECT_EQ(json["category"], 1);
    EXPECT_EQ(json["payload"], (nlohmann::json{{"ActiveDuration", 3}, {"FrontCameraUsed", true}}));
    EXPECT_EQ(nlohmann::json::parse(lines[1])["serviceName"], "line\nbreak");
}

TEST_F(AnalyticsLogTest, WhatWaitsIsWrittenWhenTheLogGoes) {
    {
        AnalyticsLog log(path, clock);
        for (int i = 0; i < 50; ++i)
            EXPECT_EQ(log.send(message(std::to_string(i))), std::nullopt);
    }
    const auto lines = linesOf(path);
    ASSERT_EQ(lines.size(), 50U);
    EXPECT_EQ(nlohmann::json::parse(lines[49])["serviceName"], "49");
    GlobalQueue::drain();
}

TEST_F(AnalyticsLogTest, SizeIsBoundedAndTheNewestLinesStay) {
    constexpr std::uint64_t kBound = 4096;
    {
        AnalyticsLog log(path, clock, kBound);
        for (int i = 0; i < 100; ++i) {
            EXPECT_EQ(log.send(message(std::to_string(i))), std::nullopt);
            GlobalQueue::drain();
        }
    }
    EXPECT_LE(fs::file_size(path), kBound);
    EXPECT_LE(fs::file_size(path + ".old"), kBound);
    EXPECT_EQ(nlohmann::json::parse(linesOf(path).back())["serviceName"], "99");
    for (const std::string& line : linesOf(path + ".old"))
        EXPECT_TRUE(nlohmann::json::accept(line)) << line;
}

TEST_F(AnalyticsLogTest, SendingDoesNotWaitForADiskThatIsBusyAndIsBounded) {
    std::counting_semaphore<> gate{0};
    // All the threads that background work may have.
    constexpr int kThreads = 16;
    for (int i = 0; i < kThreads; ++i)
        GlobalQueue::get(QueuePriority::high).async([&gate] { gate.acquire(); });
    AnalyticsLog log(path, clock);
    for (std::size_t i = 0; i < AnalyticsLog::kMostWaiting; ++i)
        EXPECT_EQ(log.send(message("x")), std::nullopt);
    const auto refused = log.send(message("one too many"));
    ASSERT_TRUE(refused);
    EXPECT_EQ(refused->code(), EAGAIN);
    gate.release(kThreads);
    GlobalQueue::drain();
    EXPECT_EQ(linesOf(path).size(), AnalyticsLog::kMostWaiting);
    EXPECT_EQ(log.send(message("again")), std::nullopt);
    GlobalQueue::drain();
}

TEST_F(AnalyticsLogTest, FolderThatCannotBeMadeIsLogged) {
    const test::LogRecorder recorder;
    folder.write("Logs", "a file");
    AnalyticsLog log(path, clock);
    EXPECT_EQ(log.send(message("x")), std::nullopt);
    GlobalQueue::drain();
    ASSERT_EQ(recorder.texts().size(), 1U);
    EXPECT_TRUE(recorder.texts().front().starts_with("dropped an analytics event: "));
}

TEST_F(AnalyticsLogTest, LineThatACrashCutStaysAlone) {
    folder.write("Logs/analytics.jsonl", "{\"whole\":1}\n{\"cut\":");
    LineFile file(path, 4096);
    EXPECT_EQ(file.append("{\"next\":2}"), std::nullopt);
    EXPECT_EQ(linesOf(path), (std::vector<std::string>{"{\"whole\":1}", "{\"cut\":", "{\"next\":2}"}));
}

TEST_F(AnalyticsLogTest, LineLongerThanAFileIsRefused) {
    LineFile file(path, 100);
    EXPECT_EQ(file.append(std::string(100, 'x'))->code(), EMSGSIZE);
    EXPECT_FALSE(fs::exists(path));
}

TEST_F(AnalyticsLogTest, LinkInTheFilesPlaceIsNotFollowed) {
    const std::string precious = folder.write("precious", "mine");
    fs::create_directories(folder.path() + "/Logs");
    fs::create_symlink(precious, path);
    EXPECT_EQ(LineFile(path, 4096).append("x")->code(), ELOOP);
    EXPECT_EQ(linesOf(precious), std::vector<std::string>{"mine"});
}

TEST_F(AnalyticsLogTest, EveryKindOfValueHasAForm) {
    AnalyticsMessage everything;
    everything.payload = {{"nothing", Value()},
                          {"large", std::numeric_limits<std::uint64_t>::max()},
                          {"double", 1.5},
                          {"infinite", std::numeric_limits<double>::infinity()},
                          {"date", Date::fromSecondsSince1970(5)},
                          {"url", URL("https://example.com")},
                          {"array", Array{1, "two", Dictionary{{"three", 3}}}},
                          {"broken", std::string("\xff")}};
    const auto json = nlohmann::json::parse(analyticsLine(everything, Date{}))["payload"];
    EXPECT_EQ(json["nothing"], nullptr);
    EXPECT_EQ(json["large"], std::numeric_limits<std::uint64_t>::max());
    EXPECT_EQ(json["double"], 1.5);
    EXPECT_EQ(json["infinite"], nullptr);
    EXPECT_EQ(json["date"], 5);
    EXPECT_EQ(json["array"][2]["three"], 3);
    EXPECT_EQ(json["broken"], "\xEF\xBF\xBD");
    EXPECT_TRUE(json["url"].is_string());
}

}  // namespace
}  // namespace kelvo
