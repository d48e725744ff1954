#include "base/KVLog.h"
#include "support/LogRecorder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::LogRecorder;
using testing::ElementsAre;

TEST(KVLogTest, EachCallIsOneLineAtItsLevel) {
    const LogRecorder log;
    KVLog("event %i", 1);
    KVLogSample("sample %d", 2);
    KVLogError("error %s", "two");
    KVLogConsole("printed");
    EXPECT_THAT(log.lines(), ElementsAre(LogRecorder::Line{LogLevel::info, "event 1"},
                                         LogRecorder::Line{LogLevel::sample, "sample 2"},
                                         LogRecorder::Line{LogLevel::error, "error two"},
                                         LogRecorder::Line{LogLevel::console, "printed"}));
}

TEST(KVLogTest, WhatBecameOfSamplesCanBeLeftOut) {
    const LogRecorder log;
    setLogsSamples(false);
    KVLogSample("sample %d", 1);
    KVLog("event");
    setLogsSamples(true);
    KVLogSample("sample %d", 2);
    EXPECT_THAT(log.texts(), ElementsAre("event", "sample 2"));
}

TEST(KVLogTest, ControlCharactersBecomeSpaces) {
    const LogRecorder log;
    KVLog("%s", "a\nb\r\tc\x1b[0m\x7f\x01z");
    EXPECT_THAT(log.texts(), ElementsAre("a b  c [0m  z"));
}

TEST(KVLogTest, TextsBeyondASCIIStay) {
    const LogRecorder log;
    KVLog("%s", "“é画面”");
    EXPECT_THAT(log.texts(), ElementsAre("“é画面”"));
}

TEST(KVLogTest, LineOf4096BytesIsWhole) {
    const LogRecorder log;
    const std::string text(4096, 'x');
    KVLog("%s", text.c_str());
    EXPECT_THAT(log.texts(), ElementsAre(text));
}

TEST(KVLogTest, LongerLineEndsAfter4096Bytes) {
    const LogRecorder log;
    KVLog("%s", std::string(5000, 'x').c_str());
    EXPECT_THAT(log.texts(), ElementsAre(std::string(4096, 'x')));
}

TEST(KVLogTest, EmptyTextIsALineToo) {
    const LogRecorder log;
    KVLog("%s", "");
    EXPECT_THAT(log.texts(), ElementsAre(""));
}

TEST(KVLogTest, WithoutASinkLinesAreDropped) {
    const LogRecorder log;
    const std::shared_ptr<LogSink> recorder = setLogSink(nullptr);
    KVLog("dropped");
    EXPECT_EQ(setLogSink(recorder), nullptr);
    KVLog("kept");
    EXPECT_THAT(log.texts(), ElementsAre("kept"));
}

}  // namespace
}  // namespace kelvo
