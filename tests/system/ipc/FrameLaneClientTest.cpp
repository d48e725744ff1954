#include "ipc/KVClientProtocolTable.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "support/Eventually.h"
#include "support/FakeClientProxy.h"
#include "support/LogRecorder.h"
#include "support/RawSocket.h"

#include <array>
#include <functional>
#include <pthread.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::eventually;
using test::RawSocket;
using test::WireMessage;

/// A client's end of a connection with a daemon that the test plays by hand.
class FrameLaneClientTest : public testing::Test {
  protected:
    FrameLaneClientTest() {
        auto [end, socket] = RawSocket::pair();
        daemon = std::make_unique<RawSocket>(std::move(end));
        client = std::make_shared<SocketConnection>(SocketConnection::Side::client, std::move(socket), loop,
                                                    nullptr, nullptr, nullptr);
        client->setExported(interfaceOf<KVClientProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks));
        client->resume();
        daemon->readUntil("BEGIN\r\n");
        daemon->write("OK 6b656c766f640000000000000000001f\r\nAGREE_UNIX_FD\r\n");
    }
    ~FrameLaneClientTest() override {
        callbacks->videoSamples.set({});
        client->invalidate();
        loop->stop();
    }

    static std::size_t methodNamed(std::string_view name) {
        return *interfaceOf<KVClientProtocol>()->indexOf(name);
    }
    void call(const std::string& member) {
        dbus::Message message;
        message.serial = ++lastSerial;
        message.flags = dbus::Message::kNoReplyExpected;
        message.path = dbus::kObjectPath;
        message.interface = interfaceOf<KVClientProtocol>()->name;
        message.member = member;
        daemon->write(dbus::serialize(message));
    }
    void sendFrameInMessage() {
        const RecordBytes<TimingRecord> timing{};
        dbus::Message message;
        message.serial = ++lastSerial;
        message.path = dbus::kObjectPath;
        message.interface = interfaceOf<KVClientProtocol>()->name;
        message.member = "captureHandlerWithSample";
        message.signature = "a(huuuu)ay";
        ASSERT_FALSE(dbus::writeBody(
            {Array{std::shared_ptr<ObjectHandle>(surface)}, Bytes(timing.begin(), timing.end())}, message));
        daemon->write(dbus::serialize(message), {surface->descriptor()});
    }
    /// Answers the request for a lane, which came with the first frame.
    void answerWith(int descriptor) {
        const WireMessage request = daemon->read();
        EXPECT_EQ(request.parsed().interface, dbus::kLaneInterface);
        EXPECT_EQ(request.parsed().member, "Open");
        dbus::Message reply = dbus::Message::replying(dbus::MessageType::reply, request.parsed().serial);
        reply.serial = ++lastSerial;
        reply.signature = "h";
        reply.body = Bytes(4);
        reply.sentDescriptors.resize(1);
        daemon->write(dbus::serialize(reply), {descriptor});
    }
    /// With a lane, and the surface known.
    void becomeReady() {
        sendFrameInMessage();
        answerWith(lane.descriptor());
        ASSERT_TRUE(hasFrames(1));
    }
    FrameLane::Entry frame(std::uint32_t serial) const {
        FrameLane::Entry entry;
        entry.serial = serial;
        entry.method = static_cast<std::uint32_t>(methodNamed("captureHandlerWithSample"));
        entry.surface = surface->file();
        entry.size = 72;
        return entry;
    }
    /// The next frame, by the lane; without the bell.
    void put() { lane.put(count++, frame(++lastSerial)); }
    bool hasFrames(std::size_t expected) {
        return eventually([&] {
            return callbacks->videoSamples.with([](const auto& all) { return all.size(); }) == expected;
        });
    }

    test::LogRecorder log;
    const std::shared_ptr<SocketLoop> loop = std::make_shared<SocketLoop>();
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(8, 8));
    const std::shared_ptr<test::FakeClientProxy> callbacks = std::make_shared<test::FakeClientProxy>();
    FrameLane lane = *FrameLane::create();
    std::unique_ptr<RawSocket> daemon;
    std::shared_ptr<SocketConnection> client;
    std::uint32_t lastSerial = 0;
    std::uint32_t count = 0;
};

TEST_F(FrameLaneClientTest, LaneIsAskedForOnceWithTheFirstFrame) {
    call("recordingDidPause");
    sendFrameInMessage();
    sendFrameInMessage();
    answerWith(lane.descriptor());
    ASSERT_TRUE(hasFrames(2));
    callbacks->videoSamples.set({});
    EXPECT_EQ(daemon->read().parsed().type, dbus::MessageType::reply) << "nothing else was asked for";
}

TEST_F(FrameLaneClientTest, DaemonWithoutLanesIsUnderstood) {
    sendFrameInMessage();
    dbus::Message error = dbus::Message::replying(dbus::MessageType::error, daemon->read().parsed().serial);
    error.serial = ++lastSerial;
    error.errorName = "org.freedesktop.DBus.Error.UnknownMethod";
    daemon->write(dbus::serialize(error));
    sendFrameInMessage();
    EXPECT_TRUE(hasFrames(2));
}

TEST_F(FrameLaneClientTest, FramesOfTheLaneArriveWithTheirPixels) {
    surface->writablePixels()[5] = std::byte{6};
    becomeReady();
    FrameLane::Entry entry = frame(++lastSerial);
    entry.bytes[71] = std::byte{8};
    lane.put(count++, entry);
    lane.ring();
    ASSERT_TRUE(hasFrames(2));
    const auto samples = callbacks->videoSamples.copy();
    EXPECT_EQ(samples[1].timingData[71], std::byte{8});
    EXPECT_EQ(samples[1].surface->ioSurface()->pixels()[5], std::byte{6});
    EXPECT_EQ(samples[1].surface->ioSurface()->pixels().data(),
              samples[0].surface->ioSurface()->pixels().data());
}

/// The first ones may come while the thread starts; then whoever opens the lane serves them.
TEST_F(FrameLaneClientTest, FrameIsServedByTheThreadThatWaitsForIt) {
    Guarded<std::string> thread;
    callbacks->onMessage = [&](const std::string&) {
        std::array<char, 16> name{};
        ::pthread_getname_np(::pthread_self(), name.data(), name.size());
        thread.set(name.data());
    };
    becomeReady();
    for (std::size_t frames = 2; thread.copy() != "n.kelvod.frames"; ++frames) {
        ASSERT_LT(frames, FrameLane::kPlaces);
        put();
        lane.ring();
        ASSERT_TRUE(eventually([&] { return callbacks->messages().size() == frames; }));
    }
    client->invalidate();
    loop->stop();
}

TEST_F(FrameLaneClientTest, FramesAndMessagesKeepTheirOrder) {
    becomeReady();
    const std::uint32_t pause = ++lastSerial;
    put();
    lane.ring();  // before the message that comes first
    lastSerial = pause - 1;
    call("recordingDidPause");
    lastSerial = pause + 1;
    put();  // nobody rings
    call("recordingShouldResume");
    put();
    lane.ring();
    ASSERT_TRUE(eventually([&] { return callbacks->messages().size() == 6; }));
    const char* const kFrame = "captureHandlerWithSample";
    EXPECT_THAT(callbacks->messages(), testing::ElementsAre(kFrame, "recordingDidPause", kFrame, kFrame,
                                                            "recordingShouldResume", kFrame));
}

TEST_F(FrameLaneClientTest, OnlyFrameThatIsHeldIsGivenBackInTheLane) {
    becomeReady();
    callbacks->videoSamples.set({});
    daemon->read();  // the first one's return, after a while
    put();
    lane.ring();
    ASSERT_TRUE(hasFrames(1));
    EXPECT_FALSE(lane.isGivenBack(0, lastSerial));
    callbacks->videoSamples.set({});
    EXPECT_TRUE(eventually([&] { return lane.isGivenBack(0, lastSerial); }));
}

TEST_F(FrameLaneClientTest, FrameIsGivenBackByAMessageWhileAnotherOneIsHeld) {
    becomeReady();
    put();
    const std::uint32_t serial = lastSerial;
    lane.ring();
    ASSERT_TRUE(hasFrames(2));
    callbacks->videoSamples.with([](auto& all) { all.pop_back(); });
    EXPECT_EQ(daemon->read().parsed().replySerial, serial);
    EXPECT_FALSE(lane.isGivenBack(0, serial));
}

TEST_F(FrameLaneClientTest, SurfaceThatIsNotKeptIsReported) {
    becomeReady();
    FrameLane::Entry entry = frame(++lastSerial);
    entry.surface.number += 1;
    lane.put(count++, entry);
    lane.ring();
    const WireMessage answer = daemon->read();
    EXPECT_EQ(answer.parsed().type, dbus::MessageType::error);
    EXPECT_EQ(answer.parsed().errorName, "com.quillon.kelvod.FrameLane.UnknownSurface");
    EXPECT_EQ(answer.parsed().replySerial, entry.serial);
    put();
    lane.ring();
    EXPECT_TRUE(hasFrames(2)) << "the connection goes on";
}

/// What a daemon may lie about a frame.
using Spoiler = std::function<void(FrameLane::Entry&)>;
struct LyingLaneTest : FrameLaneClientTest, testing::WithParamInterface<Spoiler> {};

TEST_P(LyingLaneTest, EndsTheConnection) {
    becomeReady();
    FrameLane::Entry entry = frame(++lastSerial);
    GetParam()(entry);
    lane.put(count++, entry);
    lane.ring();
    EXPECT_TRUE(daemon->isCutOff());
    EXPECT_TRUE(hasFrames(1));
    EXPECT_THAT(log.texts(), testing::Contains(testing::HasSubstr("frame that is none")));
}

const std::array<Spoiler, 4> kSpoilers{
    [](FrameLane::Entry& entry) { entry.size = FrameLane::kMostBytes + 1; },
    [](FrameLane::Entry& entry) { entry.size = 71; },
    [](FrameLane::Entry& entry) { entry.method = 1000; },
    [](FrameLane::Entry& entry) {
        entry.method =
            static_cast<std::uint32_t>(*interfaceOf<KVClientProtocol>()->indexOf("recordingDidPause"));
    },
};
std::string spoilerName(const testing::TestParamInfo<Spoiler>& info) {
    return std::array<const char*, 4>{"TooManyBytes", "TooFewBytes", "NoMethod", "AnotherMethod"}[info.index];
}
INSTANTIATE_TEST_SUITE_P(All, LyingLaneTest, testing::ValuesIn(kSpoilers), spoilerName);

TEST_F(FrameLaneClientTest, LaneThatIsNoneEndsTheConnection) {
    sendFrameInMessage();
    answerWith(0);
    EXPECT_TRUE(daemon->isCutOff());
    EXPECT_THAT(log.texts(), testing::Contains(testing::HasSubstr("no frame lane")));
}

TEST_F(FrameLaneClientTest, FrameMayBeDroppedAfterTheEnd) {
    becomeReady();
    put();
    lane.ring();
    ASSERT_TRUE(hasFrames(2));
    client->invalidate();
    EXPECT_EQ(callbacks->videoSamples.copy()[1].surface->ioSurface()->pixels().size(), 8U * 8 * 4);
    callbacks->videoSamples.set({});
}

}  // namespace
}  // namespace kelvo
