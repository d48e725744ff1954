#include "TransportContract.h"
#include "platform/IPCBounds.h"

#include <atomic>
#include <cerrno>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

template <typename World>
class TransportEndContract : public IPCTransportContract<World> {};

TYPED_TEST_SUITE(TransportEndContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(TransportEndContract, DroppedReplyIsSilenceUntilTheConnectionEnds) {
    const auto client = this->connect();
    client.ask(kDrop);
    client.ask(kAsk, {"behind"});
    ASSERT_TRUE(this->world.comesTrue([&] { return !client.answers->copy().empty(); }));
    EXPECT_THAT(client.answers->copy(), ElementsAre("behind!"));
    EXPECT_THAT(client.errors->copy(), IsEmpty());
    this->acceptedLast()->invalidate();
    EXPECT_TRUE(this->ends(client));
    EXPECT_TRUE(this->world.comesTrue([&] { return client.errors->copy().size() == 1; }));
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN));
}

TYPED_TEST(TransportEndContract, ReplyAfterTheEndIsIgnored) {
    const auto client = this->connect();
    client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->kept.copy().size() == 1; }));
    client.connection->invalidate();
    EXPECT_TRUE(this->ends(client));
    this->host->partner->kept.copy()[0]({"too late"});
    EXPECT_TRUE(this->world.comesTrue([&] { return client.errors->copy().size() == 1; }));
    EXPECT_THAT(client.answers->copy(), IsEmpty());
}

TYPED_TEST(TransportEndContract, LostPeerIsAnInterruptionAndThenAnInvalidation) {
    const auto client = this->connect();
    client.connection->invalidate();
    client.connection->invalidate();
    EXPECT_TRUE(this->ends(client));
    EXPECT_THAT(client.events->all(), ElementsAre("invalidation")) << "what one asked for is no interruption";
    ASSERT_TRUE(this->world.comesTrue([&] { return this->eventsOfAcceptedLast().size() == 2; }));
    EXPECT_THAT(this->eventsOfAcceptedLast(), ElementsAre("interruption", "invalidation"));
}

TYPED_TEST(TransportEndContract, WhatWasSentBeforeTheEndIsServedBeforeIt) {
    const auto client = this->connect();
    client.say("last words");
    client.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->eventsOfAcceptedLast().size() == 2; }));
    EXPECT_THAT(this->host->partner->said.copy(), ElementsAre("last words"));
}

TYPED_TEST(TransportEndContract, RemovedHandlersDoNotRun) {
    const auto client = this->connect();
    const auto other = this->connect();
    client.connection->setInterruptionHandler(nullptr);
    client.connection->setInvalidationHandler(nullptr);
    for (const IPCConnectionRef& each : this->host->accepted.copy())
        each->invalidate();
    EXPECT_TRUE(this->ends(other));
    EXPECT_TRUE(this->world.comesTrue([&] {
        client.say("over?");
        return !client.errors->copy().empty();
    }));
    EXPECT_THAT(client.events->all(), IsEmpty());
}

TYPED_TEST(TransportEndContract, SendingOverAConnectionThatEndedFailsAtOnce) {
    const auto client = this->connect();
    client.connection->invalidate();
    client.say("one way");
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN));
    client.ask(kAsk, {"with a reply"});
    EXPECT_TRUE(this->ends(client));
    EXPECT_TRUE(this->world.comesTrue([&] { return client.errors->copy().size() == 2; }));
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN, ENOTCONN));
}

TYPED_TEST(TransportEndContract, ArgumentsThatAreNotTakenEndThatConnectionAlone) {
    const auto hostile = this->connect();
    const auto hostileEnd = this->host->events.copy().back();
    const auto other = this->connect();
    hostile.say("unacceptable");
    EXPECT_TRUE(this->ends(hostile));
    EXPECT_THAT(hostile.events->all(), ElementsAre("interruption", "invalidation"));
    EXPECT_TRUE(this->world.comesTrue([&] { return !hostileEnd->all().empty(); }));
    EXPECT_THAT(hostileEnd->all(), ElementsAre("invalidation")) << "this side ended it";
    EXPECT_EQ(this->cutOffs(), 1U);
    other.ask(kAsk, {"you"});
    EXPECT_TRUE(this->world.comesTrue([&] { return other.answers->copy().size() == 1; }));
    EXPECT_THAT(other.events->all(), IsEmpty());
}

TYPED_TEST(TransportEndContract, TooManyOutstandingRequestsEndTheConnection) {
    const auto client = this->connect();
    for (std::size_t i = 0; i < ipc_bounds::kMostOwedReplies; ++i)
        client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue(
        [&] { return this->host->partner->kept.copy().size() == ipc_bounds::kMostOwedReplies; }));
    this->host->partner->kept.copy()[0]({"one less"});
    client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue([&] { return client.answers->copy().size() == 1; }));
    EXPECT_THAT(client.events->all(), IsEmpty());
    client.ask(kKeep);
    EXPECT_TRUE(this->ends(client));
    EXPECT_EQ(this->cutOffs(), 1U);
    EXPECT_TRUE(this->world.comesTrue(
        [&] { return client.errors->copy().size() == ipc_bounds::kMostOwedReplies + 1; }));
}

TYPED_TEST(TransportEndContract, RequestsThatWereSettledDoNotCount) {
    const auto client = this->connect();
    for (std::size_t i = 0; i < ipc_bounds::kMostOwedReplies * 2; ++i) {
        client.ask(i % 2 == 0 ? kAsk : kDrop, i % 2 == 0 ? Array{"x"} : Array{});
        if (i % 16 == 0) this->world.comesTrue([&, i] { return this->host->partner->served > int(i); });
    }
    EXPECT_TRUE(
        this->world.comesTrue([&] { return client.answers->copy().size() == ipc_bounds::kMostOwedReplies; }));
    EXPECT_EQ(this->cutOffs(), 0U);
}

TYPED_TEST(TransportEndContract, WhatWaitsIsNotServedAfterAnInvalidation) {
    const auto client = this->connect();
    const auto served = std::static_pointer_cast<ConnectionBase>(this->acceptedLast());
    this->host->partner->onServe = [&] {
        EXPECT_TRUE(eventually([&] { return served->waitingCost().messages == 2; }));
        served->invalidate();
    };
    client.say("one");
    client.say("two");
    ASSERT_TRUE(this->world.comesTrue([&] { return this->eventsOfAcceptedLast().size() == 1; }));
    EXPECT_THAT(this->host->partner->said.copy(), ElementsAre("one"));
}

/// The handlers run on the connection's queue, on which its messages were served.
TYPED_TEST(TransportEndContract, NoConnectionIsNamedAtTheEnd) {
    const auto client = this->connect();
    std::atomic<int> named{-1};
    this->acceptedLast()->setInvalidationHandler(
        [&] { named = this->transport->currentConnection() ? 1 : 0; });
    client.say("served");
    client.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return named != -1; }));
    EXPECT_EQ(named, 0);
    EXPECT_EQ(this->host->partner->served, 1);
}

}  // namespace
}  // namespace kelvo::test
