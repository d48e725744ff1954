#include "SessionFixture.h"

namespace kelvo::test {
namespace {

class KVRecordingSessionBroadcastTest : public SessionFixture {};

TEST_F(KVRecordingSessionBroadcastTest, DisabledBroadcastReturnsToPlainRecording) {
    broadcast(BroadcastProcessMode::sampleBuffers);
    session->setBroadcastConfiguration(std::make_shared<KVBroadcastConfiguration>());
    session->disableBroadcast();
    EXPECT_TRUE(log.contains("KVRecordingSession: disableBroadcast"));
    EXPECT_EQ(session->broadcastExtension(), nullptr);
    EXPECT_EQ(session->broadcastConfiguration(), nullptr);
    EXPECT_EQ(session->broadcastUserInfo(), std::nullopt);
    EXPECT_EQ(session->broadcastProcessMode(), BroadcastProcessMode::movieClips);
}

TEST_F(KVRecordingSessionBroadcastTest, BroadcastWithoutALinkToExtensionsFails) {
    const Dictionary userInfo{{"k", 1}};
    session->setBroadcastFragmentIndex(5);
    const OptionalError error = session->enableBroadcastWithExtension(
        Value(), BroadcastProcessMode::sampleBuffers, userInfo, nullptr);
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), -5808);
    EXPECT_TRUE(log.contains("KVRecordingSession: enableBroadcastWithExtension"));
    EXPECT_EQ(session->broadcastUserInfo(), userInfo);
    EXPECT_EQ(session->broadcastFragmentIndex(), 1);
    EXPECT_EQ(session->broadcastProcessMode(), BroadcastProcessMode::sampleBuffers);
}

}  // namespace
}  // namespace kelvo::test
