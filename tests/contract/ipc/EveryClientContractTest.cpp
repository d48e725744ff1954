#include "ClientServiceContract.h"
#include "ipc/KVClientProxyFactory.h"
#include "support/ClientCallbacks.h"

#include <latch>
#include <thread>

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

template <typename World>
class EveryClientContract : public ClientServiceContract<World> {};

TYPED_TEST_SUITE(EveryClientContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(EveryClientContract, PrivilegedClientsShareOneProxyThatHoldsEachConnectionOnce) {
    const auto shell = this->connect(kPrivileged);
    const auto panel = this->connect(kPrivileged);
    const auto ordinary = this->connect(kOrdinary);
    const auto proxyOf = [](const auto& client) {
        return KVClientProxyFactory::clientProxyWithNewConnection(client.daemonsEnd);
    };
    const ClientProxyRef shared = proxyOf(shell);
    EXPECT_EQ(shared, KVMultipleClientProxy::clientProxy());
    EXPECT_EQ(proxyOf(panel), shared);
    EXPECT_EQ(proxyOf(shell), shared);
    const auto set = KVMultipleClientProxy::clientProxy()->connectionSet();
    EXPECT_EQ(std::ranges::count(set, shell.daemonsEnd), 1);
    EXPECT_EQ(std::ranges::count(set, panel.daemonsEnd), 1);
    EXPECT_NE(proxyOf(ordinary), shared);
    EXPECT_NE(proxyOf(ordinary), proxyOf(ordinary));
}

TYPED_TEST(EveryClientContract, StateUpdateReachesOnlyWhoDidNotCauseItAndNobodyWhileThereIsOne) {
    const auto one = this->connect(kPrivileged);
    this->everyone.handleNewConnection(one.daemonsEnd);
    this->everyone.updateScreenRecordingState();
    const auto two = this->connect(kPrivileged);
    this->everyone.handleNewConnection(two.daemonsEnd);
    this->everyone.setCurrentConnectionProcessIdentifier(one.processIdentifier);
    this->everyone.updateScreenRecordingState();
    this->everyone.recordingTimerDidUpdate("00:01");
    ASSERT_TRUE(this->hears(one, 1));
    ASSERT_TRUE(this->hears(two, 2));
    EXPECT_THAT(one.callbacks->messages(), ElementsAre("recordingTimerDidUpdate"));
    EXPECT_THAT(two.callbacks->messages(),
                ElementsAre("updateScreenRecordingState", "recordingTimerDidUpdate"));
}

TYPED_TEST(EveryClientContract, PrivilegedClientThatIsGoneIsStillTriedAndTheFailureLogged) {
    const auto gone = this->connect(kPrivileged);
    const auto other = this->connect(kPrivileged);
    this->everyone.handleNewConnection(gone.daemonsEnd);
    this->everyone.handleNewConnection(other.daemonsEnd);
    gone.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->departures.copy().size() == 2; }));
    this->everyone.resetConnectionWithProcessIdentifier(gone.processIdentifier);
    EXPECT_EQ(this->everyone.connectionSet().size(), 2U);
    this->everyone.recordingTimerDidUpdate("00:01");
    EXPECT_TRUE(this->hears(other, 1));
    EXPECT_EQ(
        this->log.count("KVMultipleClientProxy:recordingTimerDidUpdate: error getting remote proxy: 107"),
        1U);
}

TYPED_TEST(EveryClientContract, ResetEndsALivingProcessWithoutItsHandlers) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    std::atomic<bool> isInterrupted{false};
    client.connection->setInterruptionHandler([&] { isInterrupted = true; });
    this->everyone.resetConnectionWithProcessIdentifier(client.processIdentifier + 1);
    this->pauseAndWait(client);
    this->everyone.resetConnectionWithProcessIdentifier(client.processIdentifier);
    EXPECT_TRUE(this->world.comesTrue([&] { return isInterrupted.load(); }));
    this->pauseAndWait(this->connect(kOrdinary));
    EXPECT_THAT(this->daemon->departures.copy(), IsEmpty());
    client.connection->setInterruptionHandler(nullptr);
}

TYPED_TEST(EveryClientContract, ServiceInformationAndCapturesForEveryoneAreDropped) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.updateBroadcastServiceInfo({{"a", 1}});
    this->everyone.captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(), {});
    this->everyone.captureHandlerWithAudioSample(Bytes(8), {}, 2, SampleBuffer::Type::microphone, {});
    EXPECT_THAT(this->linesAbout("KVMultipleClientProxy"), IsEmpty());
    this->everyone.recordingTimerDidUpdate("behind");
    ASSERT_TRUE(this->hears(client, 1));
    EXPECT_THAT(client.callbacks->messages(), ElementsAre("recordingTimerDidUpdate"));
}

TYPED_TEST(EveryClientContract, WhatConcernsEverybodyReachesEverybodyAndIsLoggedOnce) {
    const auto one = this->connect(kPrivileged);
    const auto two = this->connect(kPrivileged);
    this->everyone.handleNewConnection(one.daemonsEnd);
    this->everyone.handleNewConnection(two.daemonsEnd);
    std::vector<std::string> expected;
    std::vector<std::string> texts;
    for (const ClientCallback& callback : clientCallbacks()) {
        if (!callback.isOfferedToEveryone) continue;
        callback.send(this->everyone);
        if (callback.fanOutText.empty()) continue;
        expected.push_back(callback.name);
        texts.push_back(callback.fanOutText);
    }
    EXPECT_EQ(expected.size(), 4U);
    for (const auto& client : {one, two}) {
        ASSERT_TRUE(this->hears(client, expected.size()));
        EXPECT_EQ(client.callbacks->messages(), expected);
        EXPECT_THAT(client.callbacks->stops.copy(),
                    ElementsAre(FakeClientProxy::Stop{kCallbackError, URL("movie:m")}));
        EXPECT_THAT(client.callbacks->lockInterruptions.copy(), ElementsAre(kCallbackError));
    }
    EXPECT_EQ(this->linesAbout("KVMultipleClientProxy"), texts);
}

TYPED_TEST(EveryClientContract, EveryFanOutToAClientThatIsGoneLogsItsFailure) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.handleNewConnection(this->connect(kPrivileged).daemonsEnd);
    this->leave(client);
    for (const ClientCallback& callback : clientCallbacks()) {
        if (callback.fanOutFailure.empty()) continue;
        callback.send(this->everyone);
        EXPECT_EQ(this->log.count(LogLevel::error, callback.fanOutFailure), 1U) << callback.name;
    }
    this->everyone.updateScreenRecordingState();
    EXPECT_EQ(
        this->log.count(LogLevel::error,
                        "KVMultipleClientProxy:updateScreenRecordingState: error getting remote proxy: 107"),
        1U);
}

TYPED_TEST(EveryClientContract, AllConnectionsOfTheProcessThatCausedAChangeAreLeftOut) {
    const auto one = this->connectFromHere();
    const auto another = this->connectFromHere();
    const auto other = this->connect(kPrivileged);
    for (const auto& client : {one, another, other})
        this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.setCurrentConnectionProcessIdentifier(one.processIdentifier);
    this->everyone.updateScreenRecordingState();
    this->everyone.recordingTimerDidUpdate("00:01");
    for (const auto& client : {one, another}) {
        ASSERT_TRUE(this->hears(client, 1));
        EXPECT_THAT(client.callbacks->messages(), ElementsAre("recordingTimerDidUpdate"));
    }
    ASSERT_TRUE(this->hears(other, 2));
    EXPECT_THAT(other.callbacks->messages(),
                ElementsAre("updateScreenRecordingState", "recordingTimerDidUpdate"));
}

TYPED_TEST(EveryClientContract, ResetEndsAllConnectionsOfItsProcessAndNobodyElses) {
    const auto one = this->connectFromHere();
    const auto another = this->connectFromHere();
    const auto other = this->connect(kPrivileged);
    for (const auto& client : {one, another, other})
        this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.resetConnectionWithProcessIdentifier(one.processIdentifier);
    EXPECT_TRUE(this->ends(one));
    EXPECT_TRUE(this->ends(another));
    this->pauseAndWait(other);
    EXPECT_FALSE(*other.isOver);
    EXPECT_THAT(this->daemon->departures.copy(), IsEmpty());
    EXPECT_EQ(this->everyone.connectionSet().size(), 3U);
}

TYPED_TEST(EveryClientContract, ResetOfProcessZeroEndsNobody) {
    const auto client = this->connect(kPrivileged);
    this->everyone.handleNewConnection(client.daemonsEnd);
    this->everyone.resetConnectionWithProcessIdentifier(0);
    EXPECT_THAT(this->everyone.connectionSet(), ElementsAre(client.daemonsEnd));
    this->pauseAndWait(client);
    EXPECT_FALSE(*client.isOver);
}

TYPED_TEST(EveryClientContract, ArrivalsResetsAndFanOutsAtOnceLeaveTheSetWhole) {
    constexpr std::size_t kClients = 8;
    constexpr int kRounds = 50;
    std::vector<decltype(this->connect(kPrivileged))> clients;
    for (std::size_t i = 0; i < kClients; ++i)
        clients.push_back(this->connect(kPrivileged));
    std::latch start(4);
    const auto repeat = [&](const std::function<void(const decltype(clients.front())&)>& action) {
        return std::thread([&, action] {
            start.arrive_and_wait();
            for (int round = 0; round < kRounds; ++round)
                action(clients[static_cast<std::size_t>(round) % kClients]);
        });
    };
    std::vector<std::thread> threads;
    threads.push_back(
        repeat([&](const auto& client) { this->everyone.handleNewConnection(client.daemonsEnd); }));
    threads.push_back(repeat([&](const auto& client) {
        this->everyone.recordingTimerDidUpdate("00:01");
        this->everyone.setCurrentConnectionProcessIdentifier(client.processIdentifier);
    }));
    threads.push_back(repeat([&](const auto& client) {
        this->everyone.updateScreenRecordingState();
        EXPECT_LE(this->everyone.connectionSet().size(), kClients);
        static_cast<void>(client);
    }));
    threads.push_back(repeat([&](const auto& client) {
        if (client.processIdentifier == clients.front().processIdentifier)
            this->everyone.resetConnectionWithProcessIdentifier(client.processIdentifier);
    }));
    for (std::thread& thread : threads)
        thread.join();
    this->everyone.resetConnectionWithProcessIdentifier(clients.front().processIdentifier);
    this->everyone.recordingTimerDidUpdate("the last");
    EXPECT_TRUE(this->ends(clients.front()));
    for (std::size_t i = 1; i < kClients; ++i) {
        EXPECT_TRUE(this->world.comesTrue([&] {
            const auto texts = clients[i].callbacks->timerTexts.copy();
            return !texts.empty() && texts.back() == "the last";
        }));
    }
    EXPECT_EQ(this->everyone.connectionSet().size(), kClients);
    EXPECT_THAT(this->daemon->departures.copy(), IsEmpty());
}

}  // namespace
}  // namespace kelvo::test
