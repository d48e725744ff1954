#include "base/VideoSurfacePool.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVClientProxy.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "support/Eventually.h"
#include "support/LogRecorder.h"
#include "support/RawSocket.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <string>
#include <sys/mman.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::eventually;
using test::RawSocket;
using test::WireMessage;

/// The daemon's end of a connection with a client that the test plays by hand.
class FrameLaneServerTest : public testing::Test {
  protected:
    FrameLaneServerTest() {
        auto [end, socket] = RawSocket::pair();
        client = std::make_unique<RawSocket>(std::move(end));
        server = std::make_shared<SocketConnection>(SocketConnection::Side::server, std::move(socket), loop,
                                                    nullptr, nullptr, nullptr);
        server->setRemoteInterface(interfaceOf<KVClientProtocol>());
        server->resume();
        client->authenticate();
        client->readUntil("AGREE_UNIX_FD\r\n");
        proxy = std::make_unique<KVClientProxy>(server);
    }
    ~FrameLaneServerTest() override {
        proxy.reset();
        loop->stop();
    }

    WireMessage askForLane() {
        dbus::Message call;
        call.serial = ++lastSerial;
        call.path = dbus::kObjectPath;
        call.interface = dbus::kLaneInterface;
        call.member = "Open";
        client->write(dbus::serialize(call));
        return client->read();
    }
    void openLane() {
        WireMessage reply = askForLane();
        ASSERT_EQ(reply.descriptors.size(), 1U);
        lane = *FrameLane::fromDescriptor(std::move(reply.descriptors.front()));
    }
    void send(VideoSurfaceRef picture) {
        const auto object = std::make_shared<KVIOSurfaceObject>();
        object->setIOSurface(std::move(picture));
        RecordBytes<TimingRecord> timing{};
        timing[0] = static_cast<std::byte>(++sent);
        proxy->captureHandlerWithSample(object, timing);
    }
    std::size_t failures(int code) const {
        return log.count("KVClientProxy:captureHandlerWithSample: error getting remote proxy: " +
                         std::to_string(code));
    }
    /// The serial of the frame that came as a message.
    std::uint32_t readFrame() {
        const WireMessage message = client->read();
        EXPECT_EQ(message.parsed().member, "captureHandlerWithSample");
        EXPECT_EQ(message.descriptors.size(), 1U);
        return message.parsed().serial;
    }
    void giveBackByMessage(std::uint32_t serial, dbus::MessageType type = dbus::MessageType::reply) {
        dbus::Message reply = dbus::Message::replying(type, serial);
        reply.serial = ++lastSerial;
        if (type == dbus::MessageType::error) reply.errorName = "com.example.Any";
        client->write(dbus::serialize(reply));
    }
    bool comesBack() {
        VideoSurfaceRef again;
        return eventually([&] { return (again = *pool.take()) != nullptr; });
    }
    /// The pool's one surface: in a message, which gives it back, and then by the lane.
    void sendByLane() {
        send(*pool.take());
        giveBackByMessage(readFrame());
        ASSERT_TRUE(comesBack());
        send(*pool.take());
        ASSERT_TRUE(lane->hasEntry(0));
    }
    /// With the lane open, and the surface sent once.
    void becomeReady() {
        openLane();
        send(surface);
        firstSerial = readFrame();
    }

    test::LogRecorder log;
    const std::shared_ptr<std::atomic<int>> millisecondsAhead = std::make_shared<std::atomic<int>>(0);
    const std::shared_ptr<SocketLoop> loop = std::make_shared<SocketLoop>([ahead = millisecondsAhead] {
        return std::chrono::steady_clock::now() + std::chrono::milliseconds(*ahead);
    });
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(8, 8));
    VideoSurfacePool pool{VideoSurface::Geometry::packed(8, 8), 1};
    std::unique_ptr<RawSocket> client;
    std::shared_ptr<SocketConnection> server;
    std::unique_ptr<KVClientProxy> proxy;
    std::optional<FrameLane> lane;
    std::uint32_t lastSerial = 0;
    std::uint32_t firstSerial = 0;
    int sent = 0;
};

TEST_F(FrameLaneServerTest, LaneIsOpenedOnce) {
    openLane();
    const WireMessage second = askForLane();
    EXPECT_EQ(second.parsed().type, dbus::MessageType::error);
    EXPECT_EQ(second.parsed().errorName, "org.freedesktop.DBus.Error.Failed");
    EXPECT_TRUE(second.descriptors.empty());
}

TEST_F(FrameLaneServerTest, FrameGoesByTheLaneWhenTheClientHasItsSurface) {
    becomeReady();
    EXPECT_FALSE(lane->hasEntry(0));
    const std::uint32_t bell = lane->bell();
    send(surface);
    ASSERT_TRUE(lane->hasEntry(0));
    EXPECT_NE(lane->bell(), bell);
    const FrameLane::Entry entry = lane->entry(0);
    EXPECT_EQ(entry.serial, firstSerial + 1);
    EXPECT_EQ(interfaceOf<KVClientProtocol>()->methods[entry.method].name, "captureHandlerWithSample");
    EXPECT_EQ(entry.surface, surface->file());
    EXPECT_EQ(entry.size, 72U);
    EXPECT_EQ(entry.bytes[0], std::byte{2});
    send(*VideoSurface::create(VideoSurface::Geometry::packed(8, 8)));
    EXPECT_EQ(readFrame(), firstSerial + 2) << "another surface";
}

TEST_F(FrameLaneServerTest, OtherMessagesStayOnTheSocketAndAreCountedWithTheFrames) {
    becomeReady();
    send(surface);
    proxy->recordingDidPause();
    EXPECT_EQ(client->read().parsed().serial, lane->entry(0).serial + 1);
    proxy->captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(), {});
    EXPECT_EQ(client->read().parsed().member, "captureHandlerWithSample") << "a frame without a surface";
    send(surface);
    EXPECT_EQ(lane->entry(1).serial, lane->entry(0).serial + 3);
}

TEST_F(FrameLaneServerTest, SurfaceThatTheClientMayHaveDroppedGoesInAMessage) {
    becomeReady();
    *millisecondsAhead += 500;
    send(surface);
    readFrame();
    EXPECT_FALSE(lane->hasEntry(0));
    send(surface);
    EXPECT_TRUE(lane->hasEntry(0));
}

TEST_F(FrameLaneServerTest, FrameThatIsGivenBackInTheLaneComesBackWithTheNextOne) {
    becomeReady();
    sendByLane();
    lane->giveBack(0, lane->entry(0).serial);
    EXPECT_EQ(*pool.take(), nullptr) << "the daemon has not looked yet";
    send(surface);
    EXPECT_NE(*pool.take(), nullptr);
}

TEST_F(FrameLaneServerTest, FrameThatIsGivenBackInTheLaneComesBackAfterAWhileWithoutANextOne) {
    becomeReady();
    sendByLane();
    lane->giveBack(0, lane->entry(0).serial);
    EXPECT_TRUE(comesBack());
}

TEST_F(FrameLaneServerTest, FrameOfTheLaneMayBeGivenBackByAMessage) {
    becomeReady();
    sendByLane();
    giveBackByMessage(lane->entry(0).serial);
    EXPECT_TRUE(comesBack());
}

TEST_F(FrameLaneServerTest, ClientThatHasNotTheSurfaceGetsMessagesAgain) {
    becomeReady();
    send(surface);
    const std::uint32_t serial = lane->entry(0).serial;
    giveBackByMessage(serial, dbus::MessageType::error);
    // Handled in the order of the socket: once this is answered, the error was read.
    EXPECT_EQ(askForLane().parsed().type, dbus::MessageType::error);
    send(surface);
    readFrame();
    send(surface);
    EXPECT_TRUE(lane->hasEntry(1));
}

TEST_F(FrameLaneServerTest, FramesOfBothWaysCountAsLent) {
    becomeReady();
    for (std::size_t i = 1; i < ipc_bounds::kMostLentMessages; ++i)
        send(surface);
    EXPECT_EQ(failures(EAGAIN), 0U);
    send(surface);
    EXPECT_EQ(failures(EAGAIN), 1U);
    lane->giveBack(0, lane->entry(0).serial);
    const std::uint32_t last = lane->entry(FrameLane::kPlaces - 2).serial;
    send(surface);
    EXPECT_EQ(failures(EAGAIN), 1U);
    EXPECT_EQ(lane->entry(FrameLane::kPlaces - 1).serial, last + 1) << "what was refused has no serial";
}

TEST_F(FrameLaneServerTest, WhatIsLentComesBackWithTheEnd) {
    becomeReady();
    send(surface);
    EXPECT_EQ(surface.use_count(), 3);
    server->invalidate();
    EXPECT_EQ(surface.use_count(), 1);
    send(surface);
    EXPECT_EQ(failures(ENOTCONN), 1U);
}

/// Whatever a client writes into the page, the daemon goes on: at worst this client's frames come back early.
TEST_F(FrameLaneServerTest, PageFullOfAnythingDoesNoHarm) {
    becomeReady();
    constexpr std::size_t kPage = 4096;
    void* page = ::mmap(nullptr, kPage, PROT_READ | PROT_WRITE, MAP_SHARED, lane->descriptor(), 0);
    ASSERT_NE(page, MAP_FAILED);
    const std::span bytes(static_cast<std::byte*>(page), kPage / 2);
    for (int value : {0xff, 0x00, 0x01, 0x7f}) {
        std::ranges::fill(bytes, static_cast<std::byte>(value));
        for (std::uint32_t serial = 0; serial < 40; ++serial) {
            send(surface);
            for (std::size_t place = 0; place < FrameLane::kPlaces; ++place)
                lane->giveBack(place, serial * (place + 1));
        }
    }
    ::munmap(page, kPage);
    EXPECT_LE(surface.use_count(), 1 + static_cast<long>(ipc_bounds::kMostLentMessages));
    EXPECT_FALSE(server->isOver());
    server->invalidate();
    EXPECT_EQ(surface.use_count(), 1);
}

}  // namespace
}  // namespace kelvo
