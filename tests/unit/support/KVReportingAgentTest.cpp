#include "platform/simulated/SimulatedAnalytics.h"
#include "support/KVReportingAgent.h"
#include "support/LogRecorder.h"

#include <cerrno>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

class KVReportingAgentTest : public testing::Test {
  protected:
    std::int64_t metric(std::string_view key) const {
        const Dictionary metrics = agent.collectSummaryEventMetrics();
        const Value* const value = metrics.find(key);
        return value == nullptr ? -1 : value->asInteger().value_or(-1);
    }

    LogRecorder log;
    std::shared_ptr<SimulatedFaults> faults = std::make_shared<SimulatedFaults>();
    std::shared_ptr<SimulatedAnalytics> analytics = std::make_shared<SimulatedAnalytics>(faults);
    KVReportingAgent agent{"SystemRecording", analytics};
};

TEST_F(KVReportingAgentTest, NewAgentHasOnlyItsServiceName) {
    EXPECT_EQ(agent.serviceName(), "SystemRecording");
    EXPECT_EQ(agent.collectSummaryEventMetrics(), (Dictionary{{"ActiveDuration", 0},
                                                              {"VideoCaptureWidth", 0},
                                                              {"VideoCaptureHeight", 0},
                                                              {"VideoCaptureRate", 0},
                                                              {"VideoFrameCount", 0},
                                                              {"AppAudioCaptureRate", 2},
                                                              {"AppAudioFrameCount", 0},
                                                              {"MicCaptureRate", 43},
                                                              {"MicFrameCount", 0},
                                                              {"FrontCameraUsed", false},
                                                              {"BackCameraUsed", false},
                                                              {"RecordedFileSize", std::uint64_t{0}},
                                                              {"BroadcastExtensionBundleID", ""},
                                                              {"ClientAppBundleID", ""},
                                                              {"EndReason", 0}}));
}

TEST_F(KVReportingAgentTest, SummaryHoldsWhatWasGathered) {
    agent.setActiveDuration(12);
    agent.setVideoCaptureSize({1080, 1920});
    agent.setVideoCaptureRate(60);
    agent.setVideoFrameCount(700);
    agent.setAppAudioFrameCount(50);
    agent.setMicFrameCount(40);
    agent.setFrontCameraUsed(true);
    agent.setBackCameraUsed(true);
    agent.setRecordedFileSize(123456789);
    agent.setEndReason(-5812);
    EXPECT_EQ(metric("ActiveDuration"), 12);
    EXPECT_EQ(metric("VideoCaptureWidth"), 1080);
    EXPECT_EQ(metric("VideoCaptureHeight"), 1920);
    EXPECT_EQ(metric("VideoCaptureRate"), 60);
    EXPECT_EQ(metric("VideoFrameCount"), 700);
    EXPECT_EQ(metric("AppAudioFrameCount"), 50);
    EXPECT_EQ(metric("MicFrameCount"), 40);
    EXPECT_EQ(metric("FrontCameraUsed"), 1);
    EXPECT_EQ(metric("BackCameraUsed"), 1);
    EXPECT_EQ(metric("RecordedFileSize"), 123456789);
    EXPECT_EQ(metric("EndReason"), -5812);
    EXPECT_EQ(agent.collectSummaryEventMetrics().size(), 15U);
}

TEST_F(KVReportingAgentTest, DurationIsRoundedHalfAwayFromZero) {
    agent.setActiveDuration(2.5);
    EXPECT_EQ(metric("ActiveDuration"), 3);
    agent.setActiveDuration(2.4);
    EXPECT_EQ(metric("ActiveDuration"), 2);
}

TEST_F(KVReportingAgentTest, DurationIsRoundedInSinglePrecision) {
    agent.setActiveDuration(16777217);  // has no single-precision neighbour of its own
    EXPECT_EQ(metric("ActiveDuration"), 16777216);
}

TEST_F(KVReportingAgentTest, SizeIsRoundedToTheNearest) {
    agent.setVideoCaptureSize({1170.4, 2531.6});
    EXPECT_EQ(metric("VideoCaptureWidth"), 1170);
    EXPECT_EQ(metric("VideoCaptureHeight"), 2532);
}

TEST_F(KVReportingAgentTest, CountersCount) {
    agent.countVideoFrame();
    agent.countMicFrame();
    agent.countAppAudioFrame();
    agent.countAppAudioFrame();
    EXPECT_EQ(agent.videoFrameCount(), 1);
    EXPECT_EQ(agent.micFrameCount(), 1);
    EXPECT_EQ(agent.appAudioFrameCount(), 2);
}

TEST_F(KVReportingAgentTest, ReportIsOneMessage) {
    agent.reportEventWithType(1, Dictionary{{"key", 1}});
    ASSERT_EQ(analytics->messages().size(), 1U);
    const AnalyticsMessage message = analytics->messages().front();
    EXPECT_EQ(message.clientType, 23);
    EXPECT_EQ(message.clientVersion, 1);
    EXPECT_EQ(message.sessionIdentifier, 0);
    EXPECT_TRUE(message.isBatchEvent);
    EXPECT_TRUE(message.isUserInfoRequired);
    EXPECT_EQ(message.clientName, "KelvoKit");
    EXPECT_EQ(message.serviceName, "SystemRecording");
    EXPECT_EQ(message.category, 1);
    EXPECT_EQ(message.type, 0);
    EXPECT_EQ(message.payload, (Dictionary{{"key", 1}}));
    EXPECT_TRUE(log.contains("KVReportingAgent: reportingEvent:1 payload:{\"key\" = 1}"));
}

TEST_F(KVReportingAgentTest, ReportWithoutAPayloadSendsNothing) {
    agent.reportEventWithType(1, std::nullopt);
    EXPECT_TRUE(analytics->messages().empty());
    EXPECT_TRUE(log.contains("KVReportingAgent: payloadDict cannot be null!"));
}

TEST_F(KVReportingAgentTest, FailureToSendIsOnlyLogged) {
    faults->failNext("AnalyticsSink.send", KVError::posix(EIO, "analytics"));
    agent.reportEventWithType(1, Dictionary());
    EXPECT_TRUE(log.contains("eventType:1 error code 5."));
    EXPECT_TRUE(analytics->messages().empty()) << "it is not tried again";
}

}  // namespace
}  // namespace kelvo::test
