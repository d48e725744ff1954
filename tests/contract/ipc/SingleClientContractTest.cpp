#include "ClientServiceContract.h"
#include "ipc/KVClientProxy.h"
#include "support/ClientCallbacks.h"

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

template <typename World>
class SingleClientContract : public ClientServiceContract<World> {};

TYPED_TEST_SUITE(SingleClientContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(SingleClientContract, StateUpdateForOneClientOnlyLogs) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    proxy.updateScreenRecordingState();
    proxy.recordingDidPause();
    ASSERT_TRUE(this->hears(client, 1));
    EXPECT_THAT(client.callbacks->messages(), ElementsAre("recordingDidPause"));
    EXPECT_EQ(this->log.count("KVClientProxy:updateScreenRecordingState"), 1U);
}

TYPED_TEST(SingleClientContract, SurfaceObjectArrivesWithItsSurfaceOrWithoutOne) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    const auto object = std::make_shared<KVIOSurfaceObject>();
    proxy.captureHandlerWithSample(object, {});
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    surface->writablePixels()[5] = std::byte{77};
    object->setIOSurface(surface);
    object->setIOSurface(surface);
    EXPECT_EQ(surface.use_count(), 2) << "the same surface is held once";
    proxy.captureHandlerWithSample(object, {});
    ASSERT_TRUE(this->hears(client, 2));
    const auto samples = client.callbacks->videoSamples.copy();
    EXPECT_EQ(samples[0].surface->ioSurface(), nullptr);
    ASSERT_NE(samples[1].surface->ioSurface(), nullptr);
    EXPECT_EQ(samples[1].surface->ioSurface()->geometry(), surface->geometry());
    EXPECT_EQ(samples[1].surface->ioSurface()->pixels()[5], std::byte{77});
}

TYPED_TEST(SingleClientContract, SurfaceThatWasSentIsHeldByNobodyButItsReceiver) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    const VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    {
        const auto object = std::make_shared<KVIOSurfaceObject>();
        object->setIOSurface(surface);
        proxy.captureHandlerWithSample(object, {});
    }
    ASSERT_TRUE(this->hears(client, 1));
    client.callbacks->videoSamples.set({});
    EXPECT_TRUE(this->world.comesTrue([&] { return surface.use_count() == 1; }));
}

TYPED_TEST(SingleClientContract, EveryCallbackIsLoggedAndArrives) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    std::vector<std::string> expected;
    for (const ClientCallback& callback : clientCallbacks()) {
        callback.send(proxy);
        expected.push_back(callback.name);
        EXPECT_EQ(this->log.count(callback.text), 1U) << callback.name;
    }
    ASSERT_TRUE(this->hears(client, expected.size()));
    EXPECT_EQ(client.callbacks->messages(), expected);
}

TYPED_TEST(SingleClientContract, EveryCallbackToAClientThatIsGoneLogsItsFailure) {
    const auto client = this->connect(kOrdinary);
    KVClientProxy proxy(client.daemonsEnd);
    this->leave(client);
    for (const ClientCallback& callback : clientCallbacks()) {
        callback.send(proxy);
        EXPECT_EQ(this->log.count(LogLevel::error, callback.failureText), 1U) << callback.name;
    }
}

TYPED_TEST(SingleClientContract, ProxyThatGoesEndsItsConnectionWithoutItsHandlers) {
    const auto client = this->connect(kOrdinary);
    { const KVClientProxy proxy(client.daemonsEnd); }
    EXPECT_TRUE(this->ends(client));
    this->pauseAndWait(this->connect(kOrdinary));
    EXPECT_THAT(this->daemon->departures.copy(), IsEmpty());
    EXPECT_THAT(this->linesAbout("connection IN"), IsEmpty());
}

TYPED_TEST(SingleClientContract, ProxyThatLetItsConnectionGoEndsNothing) {
    const auto client = this->connect(kOrdinary);
    {
        KVClientProxy proxy(client.daemonsEnd);
        proxy.setConnection(nullptr);
    }
    this->pauseAndWait(client);
    EXPECT_FALSE(*client.isOver);
}

}  // namespace
}  // namespace kelvo::test
