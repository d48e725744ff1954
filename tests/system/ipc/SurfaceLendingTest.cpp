#include "base/VideoSurfacePool.h"
#include "ipc/KVClientProtocolTable.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/linux/ipc/SurfaceLending.h"
#include "support/Eventually.h"
#include "support/FakeClientProxy.h"
#include "support/TemporaryDirectory.h"

#include <cerrno>
#include <future>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::eventually;

/// Keeps the connections that it accepts.
struct Keeper : IPCListenerDelegate {
    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        connection->setRemoteInterface(interfaceOf<KVClientProtocol>());
        connection->resume();
        accepted.set_value(connection);
        return true;
    }
    std::promise<IPCConnectionRef> accepted;
};

/// A client that holds the frames it is sent for as long as the test wants.
struct FrameHolder : test::FakeClientProxy {
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                  const RecordBytes<TimingRecord>& timingData) override {
        held.with([&](auto& all) { all.push_back(surface->ioSurface()); });
        FakeClientProxy::captureHandlerWithSample(surface, timingData);
        videoSamples.set({});
    }
    std::size_t count() const {
        return held.with([](const auto& all) { return all.size(); });
    }
    Guarded<std::vector<VideoSurfaceRef>> held;
};

class SurfaceLendingTest : public testing::Test {
  protected:
    SurfaceLendingTest() {
        listener->setDelegate(keeper);
        listener->resume();
        connection = *transport.connectToService("frames");
        connection->setExported(interfaceOf<KVClientProtocol>(),
                                std::make_shared<ProtocolDispatcher<KVClientProtocol>>(client));
        connection->resume();
        server = keeper->accepted.get_future().get();
        remote = std::make_unique<RemoteClient>(
            *server, [this](const KVError& error) { failures.push_back(error.code()); });
    }
    ~SurfaceLendingTest() override {
        remote.reset();
        client->held.set({});
    }

    void send(VideoSurfaceRef surface) {
        const auto object = std::make_shared<KVIOSurfaceObject>();
        object->setIOSurface(std::move(surface));
        remote->captureHandlerWithSample(object, {});
    }

    test::TemporaryDirectory root;
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
    std::shared_ptr<Keeper> keeper = std::make_shared<Keeper>();
    std::shared_ptr<IPCListener> listener = transport.createListener("frames");
    std::shared_ptr<FrameHolder> client = std::make_shared<FrameHolder>();
    IPCConnectionRef connection;
    IPCConnectionRef server;
    std::unique_ptr<RemoteClient> remote;
    std::vector<std::int64_t> failures;
    VideoSurfacePool pool{VideoSurface::Geometry::packed(8, 8), 1};
};

TEST_F(SurfaceLendingTest, SurfaceComesBackWhenTheReceiverDropsIt) {
    send(*pool.take());
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    EXPECT_EQ(*pool.take(), nullptr);
    client->held.set({});
    VideoSurfaceRef again;
    EXPECT_TRUE(eventually([&] { return (again = *pool.take()) != nullptr; }));
}

TEST_F(SurfaceLendingTest, ReceiverSeesThePixelsForAsLongAsItHoldsThem) {
    VideoSurfaceRef surface = *pool.take();
    surface->writablePixels()[0] = std::byte{7};
    send(std::move(surface));
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    const VideoSurfaceRef received = client->held.copy().front();
    EXPECT_EQ(received->pixels()[0], std::byte{7});
    EXPECT_TRUE(received->writablePixels().empty());
}

TEST_F(SurfaceLendingTest, SurfacesComeBackWhenTheReceiverIsLost) {
    send(*pool.take());
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    connection->invalidate();
    VideoSurfaceRef again;
    EXPECT_TRUE(eventually([&] { return (again = *pool.take()) != nullptr; }));
}

TEST_F(SurfaceLendingTest, ReceiverMayDropASurfaceAfterTheConnectionIsOver) {
    send(*pool.take());
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    server->invalidate();
    EXPECT_EQ(client->held.copy().front()->pixels().size(), 8U * 8 * 4);
    client->held.set({});
}

TEST_F(SurfaceLendingTest, NothingIsLentOverAConnectionThatIsOver) {
    server->invalidate();
    send(*pool.take());
    EXPECT_NE(*pool.take(), nullptr);
    EXPECT_EQ(failures, std::vector<std::int64_t>{ENOTCONN});
}

TEST_F(SurfaceLendingTest, ReceiverThatHoldsTooManyGetsNoFurtherOneAndIsNotCutOff) {
    VideoSurfacePool large(VideoSurface::Geometry::packed(8, 8), ipc_bounds::kMostLentMessages + 1);
    for (std::size_t i = 0; i < ipc_bounds::kMostLentMessages; ++i)
        send(*large.take());
    EXPECT_EQ(failures, std::vector<std::int64_t>());
    send(*large.take());
    EXPECT_EQ(failures, std::vector<std::int64_t>{EAGAIN});
    ASSERT_TRUE(eventually([&] { return client->count() == ipc_bounds::kMostLentMessages; }));
    client->held.set({});
    EXPECT_TRUE(eventually([&] {
        failures.clear();
        send(*large.take());
        return failures.empty();
    }));
}

TEST_F(SurfaceLendingTest, OneMemoryFileIsMappedOnce) {
    send(*pool.take());
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    const std::byte* const first = client->held.copy().front()->pixels().data();
    client->held.set({});
    VideoSurfaceRef again;
    ASSERT_TRUE(eventually([&] { return (again = *pool.take()) != nullptr; }));
    send(std::move(again));
    ASSERT_TRUE(eventually([&] { return client->count() == 1; }));
    EXPECT_EQ(client->held.copy().front()->pixels().data(), first);
}

/// Frames take the shorter way as soon as they can; nobody notices.
TEST_F(SurfaceLendingTest, FramesAndOtherNewsArriveInTheirOrder) {
    VideoSurfacePool frames(VideoSurface::Geometry::packed(8, 8), 8);
    std::vector<std::string> sent;
    for (int i = 0; i < 300; ++i) {
        VideoSurfaceRef surface;
        ASSERT_TRUE(eventually([&] {
            client->held.set({});
            return (surface = *frames.take()) != nullptr;
        }));
        send(std::move(surface));
        sent.emplace_back("captureHandlerWithSample");
        if (i % 3 == 0) continue;
        remote->recordingDidPause();
        sent.emplace_back("recordingDidPause");
    }
    EXPECT_TRUE(eventually([&] { return client->messages().size() == sent.size(); }));
    EXPECT_EQ(client->messages(), sent);
    EXPECT_EQ(failures, std::vector<std::int64_t>());
}

TEST(SurfaceReturnsTest, OnlyOneThatIsHeldMayBeLetGoOfQuietly) {
    SurfaceReturns returns;
    EXPECT_FALSE(returns.isQuiet());
    returns.hold();
    EXPECT_TRUE(returns.isQuiet());
    returns.hold();
    EXPECT_FALSE(returns.isQuiet());
    returns.letGo(1, {});
    EXPECT_FALSE(returns.isQuiet()) << "one waits";
    returns.take();
    EXPECT_TRUE(returns.isQuiet());
    returns.letGoQuietly();
    EXPECT_FALSE(returns.isQuiet());
    EXPECT_EQ(returns.due(), std::nullopt);
}

TEST(SurfaceReturnsTest, AFewAreToldOfTogether) {
    SurfaceReturns returns;
    for (std::uint32_t serial = 1; serial < SurfaceReturns::kMostTogether; ++serial) {
        EXPECT_FALSE(returns.hold());
        EXPECT_FALSE(returns.letGo(serial, {}));
    }
    EXPECT_FALSE(returns.hold());
    EXPECT_TRUE(returns.letGo(9, {}));
    EXPECT_EQ(returns.take(), (std::vector<std::uint32_t>{1, 2, 3, 4, 5, 9}));
    EXPECT_EQ(returns.take(), std::vector<std::uint32_t>());
}

TEST(SurfaceReturnsTest, NothingWaitsWhileOthersAreHeld) {
    SurfaceReturns returns;
    returns.hold();
    returns.hold();
    EXPECT_TRUE(returns.letGo(1, {}));
    EXPECT_EQ(returns.take(), std::vector<std::uint32_t>{1});
    EXPECT_FALSE(returns.letGo(2, {}));
}

TEST(SurfaceReturnsTest, WhatWaitsGoesBackWhenMoreThanOneIsHeld) {
    SurfaceReturns returns;
    EXPECT_FALSE(returns.hold());
    EXPECT_FALSE(returns.hold()) << "nothing waits";
    EXPECT_TRUE(returns.letGo(1, {}));
    returns.take();
    EXPECT_FALSE(returns.letGo(2, {}));
    EXPECT_FALSE(returns.hold());
    EXPECT_TRUE(returns.hold());
    EXPECT_EQ(returns.take(), std::vector<std::uint32_t>{2});
    EXPECT_FALSE(returns.hold());
}

TEST(SurfaceReturnsTest, TheFirstThatWaitsSaysHowLong) {
    using Moment = SurfaceReturns::Moment;
    SurfaceReturns returns;
    EXPECT_EQ(returns.due(), std::nullopt);
    const Moment start{std::chrono::seconds(1)};
    for (std::uint32_t serial = 1; serial < 3; ++serial) {
        returns.hold();
        EXPECT_FALSE(returns.letGo(serial, start + std::chrono::milliseconds(serial)));
    }
    EXPECT_EQ(returns.due(), start + std::chrono::milliseconds(1) + SurfaceReturns::kPatience);
    returns.take();
    EXPECT_EQ(returns.due(), std::nullopt);
}

TEST(SurfaceCacheTest, KeepsWhatIsUsedAndDropsTheRest) {
    using Moment = SurfaceCache::Moment;
    const auto geometry = VideoSurface::Geometry::packed(8, 8);
    const VideoSurfaceRef one = *VideoSurface::create(geometry);
    const VideoSurfaceRef two = *VideoSurface::create(geometry);
    const auto duplicate = [](const VideoSurfaceRef& surface) {
        return UniqueFd(::dup(surface->descriptor()));
    };
    SurfaceCache cache;
    const Moment start{};
    const auto first = *cache.open(duplicate(one), geometry, start);
    EXPECT_TRUE(cache.open(duplicate(two), geometry, start));
    EXPECT_EQ(*cache.open(duplicate(one), geometry, start + SurfaceCache::kPatience), first);
    cache.dropUnused(start + SurfaceCache::kPatience);
    EXPECT_FALSE(cache.empty());
    cache.dropUnused(start + 2 * SurfaceCache::kPatience);
    EXPECT_TRUE(cache.empty());
    EXPECT_NE(*cache.open(duplicate(one), geometry, start), first);
}

TEST(SurfaceCacheTest, FindsWhatItKeepsAndKeepsItForThat) {
    using Moment = SurfaceCache::Moment;
    const auto geometry = VideoSurface::Geometry::packed(8, 8);
    const auto half = VideoSurface::Geometry::packed(4, 8);
    const VideoSurfaceRef one = *VideoSurface::create(geometry);
    SurfaceCache cache;
    EXPECT_EQ(cache.find(one->file(), Moment{}), nullptr);
    const auto first = *cache.open(UniqueFd(::dup(one->descriptor())), geometry, Moment{});
    EXPECT_EQ(cache.find(one->file(), Moment{SurfaceCache::kPatience}), first);
    cache.dropUnused(Moment{SurfaceCache::kPatience});
    EXPECT_FALSE(cache.empty());
    const auto second =
        *cache.open(UniqueFd(::dup(one->descriptor())), half, Moment{SurfaceCache::kPatience * 2});
    EXPECT_EQ(cache.find(one->file(), Moment{SurfaceCache::kPatience * 2}), second) << "used last";
}

TEST(SurfaceCacheTest, HoldsNoMoreThanItsBound) {
    const auto geometry = VideoSurface::Geometry::packed(8, 8);
    SurfaceCache cache;
    std::vector<std::weak_ptr<VideoSurface>> opened;
    for (int i = 0; i < 20; ++i) {
        const VideoSurfaceRef surface = *VideoSurface::create(geometry);
        opened.push_back(*cache.open(UniqueFd(::dup(surface->descriptor())), geometry,
                                     SurfaceCache::Moment{std::chrono::seconds(i)}));
    }
    const auto kept = std::ranges::count_if(opened, [](const auto& each) { return !each.expired(); });
    EXPECT_EQ(kept, static_cast<std::ptrdiff_t>(SurfaceCache::kMostSurfaces));
    EXPECT_TRUE(opened.front().expired());
}

TEST(SurfaceCacheTest, FileThatIsNoSurfaceIsRefused) {
    SurfaceCache cache;
    EXPECT_FALSE(cache.open(UniqueFd(), VideoSurface::Geometry::packed(8, 8), {}));
    EXPECT_FALSE(cache.open(UniqueFd(::dup(0)), VideoSurface::Geometry::packed(8, 8), {}));
    EXPECT_TRUE(cache.empty());
}

}  // namespace
}  // namespace kelvo
