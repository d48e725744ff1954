#include "ipc/KVClientProtocolTable.h"
#include "support/FakeClientProxy.h"

#include <span>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

class ProtocolDispatcherTest : public testing::Test {
  protected:
    static std::size_t methodNamed(std::string_view name) {
        return *interfaceOf<KVClientProtocol>()->indexOf(name);
    }
    bool serveFrame(std::string_view method, std::span<const std::byte> record) {
        return dispatcher.serveFrame({methodNamed(method), surface, record});
    }

    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    const RecordBytes<TimingRecord> timing = bytesOfRecord(TimingRecord{{1, 30, 1, 0}, {5, 30, 1, 0}, {}});
    std::shared_ptr<test::FakeClientProxy> target = std::make_shared<test::FakeClientProxy>();
    ProtocolDispatcher<KVClientProtocol> dispatcher{target};
};

TEST_F(ProtocolDispatcherTest, FrameIsServedAsItIs) {
    EXPECT_TRUE(serveFrame("captureHandlerWithSample", timing));
    const auto frame = target->videoSamples.copy().at(0);
    EXPECT_EQ(frame.surface->ioSurface(), surface);
    EXPECT_EQ(frame.timingData, timing);
}

TEST_F(ProtocolDispatcherTest, WhatIsNoFrameIsRefused) {
    EXPECT_FALSE(serveFrame("captureHandlerWithSample", std::span(timing).first(71)));
    EXPECT_FALSE(serveFrame("captureHandlerWithSample", Bytes(73)));
    EXPECT_FALSE(serveFrame("captureHandlerWithAudioSample", timing));
    EXPECT_FALSE(serveFrame("recordingDidPause", timing));
    EXPECT_THAT(target->messages(), testing::IsEmpty());
}

TEST_F(ProtocolDispatcherTest, WhatComesAfterItsTargetHasGoneIsDropped) {
    target.reset();
    EXPECT_TRUE(serveFrame("captureHandlerWithSample", timing));
    EXPECT_TRUE(dispatcher.serve(methodNamed("recordingDidPause"), {}, nullptr));
    EXPECT_EQ(surface.use_count(), 1);
}

}  // namespace
}  // namespace kelvo
