#include "ClientServiceContract.h"

#include <thread>

namespace kelvo::test {
namespace {

using testing::Each;
using testing::ElementsAre;

template <typename World>
class RequestServingContract : public ClientServiceContract<World> {};

TYPED_TEST_SUITE(RequestServingContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(RequestServingContract, RequestsOfAllClientsRunOneAtATimeOnTheManagersQueue) {
    constexpr std::size_t kClients = 8;
    constexpr std::size_t kRounds = 20;
    std::atomic<int> running{0};
    std::atomic<int> overlaps{0};
    std::atomic<int> elsewhere{0};
    this->daemon->onRequest.set([&](const std::string&) {
        overlaps += running++ == 0 ? 0 : 1;
        elsewhere += KVConnectionManager::connectionManagerQueue().isCurrent() ? 0 : 1;
        std::this_thread::yield();
        --running;
    });
    std::vector<decltype(this->connect(kOrdinary))> clients;
    for (std::size_t i = 0; i < kClients; ++i)
        clients.push_back(this->connect(kOrdinary));
    for (std::size_t round = 0; round < kRounds; ++round) {
        for (const auto& client : clients)
            client.daemon->pauseRecording();
    }
    ASSERT_TRUE(this->world.comesTrue([&] { return this->daemon->requests().size() == kClients * kRounds; }));
    this->daemon->onRequest.set(nullptr);
    KVConnectionManager::connectionManagerQueue().sync([] {});  // the last of them has returned
    EXPECT_EQ(overlaps, 0);
    EXPECT_EQ(elsewhere, 0);
}

TYPED_TEST(RequestServingContract, RequestBeingServedNamesItsOwnConnection) {
    Guarded<std::vector<IPCConnectionRef>> seen;
    this->daemon->onRequest.set([&](const std::string&) {
        seen.with([&](auto& all) { all.push_back(this->manager->getCurrentConnection()); });
    });
    const auto a = this->connect(kOrdinary);
    const auto b = this->connect({"com.example.setup", {{kSetupRight, true}}});
    this->pauseAndWait(a);
    this->setUpBroadcast(b, {}, nullptr);
    ASSERT_TRUE(this->world.comesTrue([&] { return seen.copy().size() == 2; }));
    EXPECT_THAT(seen.copy(), ElementsAre(a.daemonsEnd, b.daemonsEnd))
        << "a set-up is served for its client, though it is not remembered";
    EXPECT_EQ(this->manager->getCurrentConnection(), a.daemonsEnd);
}

TYPED_TEST(RequestServingContract, RefusedSetUpLeavesTheCurrentClientAlone) {
    const auto current = this->connect(kOrdinary);
    const auto refused = this->connect(kOrdinary);
    this->pauseAndWait(current);
    std::atomic<int> answers{0};
    this->setUpBroadcast(refused, {}, [&](const OptionalError& error) { answers += error ? 1 : 100; });
    ASSERT_TRUE(this->world.comesTrue([&] { return answers != 0; }));
    EXPECT_EQ(answers, 1);
    EXPECT_EQ(KVMultipleClientProxy::clientProxy()->currentConnectionProcessIdentifier(),
              current.processIdentifier);
    EXPECT_EQ(this->manager->getCurrentConnection(), current.daemonsEnd);
}

TYPED_TEST(RequestServingContract, ClientThatIsGoneReadsAsNoCurrentConnection) {
    auto client = this->connect(kOrdinary);
    this->pauseAndWait(client);
    EXPECT_EQ(this->manager->getCurrentConnection(), client.daemonsEnd);
    client.daemonsEnd.reset();
    this->gate->accepted.set({});
    this->leave(client);
    EXPECT_TRUE(this->world.comesTrue([&] { return this->manager->getCurrentConnection() == nullptr; }));
    EXPECT_EQ(KVMultipleClientProxy::clientProxy()->currentConnectionProcessIdentifier(),
              client.processIdentifier)
        << "a number needs nobody behind it";
}

TYPED_TEST(RequestServingContract, DepartureIsReportedWhileARequestOfAnotherClientHoldsTheQueue) {
    std::atomic<bool> isServing{false};
    std::atomic<bool> wasReportedMeanwhile{false};
    this->daemon->onRequest.set([&](const std::string&) {
        isServing = true;
        wasReportedMeanwhile = eventually([&] { return this->daemon->departures.copy().size() == 2; });
    });
    const auto busy = this->connect(kOrdinary);
    const auto leaving = this->connect(kOrdinary);
    busy.daemon->pauseRecording();
    ASSERT_TRUE(eventually([&] { return isServing.load(); }));
    this->leave(leaving);
    KVConnectionManager::connectionManagerQueue().sync([] {});
    EXPECT_TRUE(wasReportedMeanwhile);
    EXPECT_THAT(this->daemon->departures.copy(),
                Each(testing::Pair("com.example.app", leaving.processIdentifier)));
}

}  // namespace
}  // namespace kelvo::test
