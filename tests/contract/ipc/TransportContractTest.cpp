#include "TransportContract.h"

#include <cerrno>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

TYPED_TEST_SUITE(IPCTransportContract, IPCWorlds, IPCWorldNames);

TYPED_TEST(IPCTransportContract, ConnectingWhereNobodyListensFails) {
    EXPECT_FALSE(this->transport->connectToService("com.example.nobody"));
    EXPECT_FALSE(this->transport->connectToEndpoint(nullptr));
}

TYPED_TEST(IPCTransportContract, ListenerTakesNobodyBeforeItIsResumed) {
    const auto other = this->transport->createListener("com.example.other");
    other->setDelegate(this->host);
    EXPECT_FALSE(this->transport->connectToService("com.example.other"));
    other->resume();
    EXPECT_TRUE(this->transport->connectToService("com.example.other"));
}

TYPED_TEST(IPCTransportContract, ConnectionThatIsNotAcceptedEnds) {
    this->host->accepts = false;
    const auto client = this->connect();
    EXPECT_TRUE(this->ends(client));
    EXPECT_THAT(client.events->all(), ElementsAre("interruption", "invalidation"));
}

TYPED_TEST(IPCTransportContract, ListenerWhoseDelegateIsGoneTakesNobody) {
    this->host.reset();
    const ConnectedProcess process = this->world.connectFrom({}, kService);
    const auto client = this->clientOf(process.connection);
    EXPECT_TRUE(this->ends(client));
}

TYPED_TEST(IPCTransportContract, PeerThatIsLostBeforeThisSideIsResumedIsReportedThen) {
    this->host->accepts = false;
    const ConnectedProcess process = this->world.connectFrom({}, kService);
    const auto events = std::make_shared<Events>();
    setUp(*process.connection, std::make_shared<Partner>(*this->transport), events);
    EXPECT_TRUE(this->world.comesTrue([] { return true; }));
    EXPECT_THAT(events->all(), IsEmpty());
    process.connection->resume();
    EXPECT_TRUE(this->world.comesTrue([&] { return events->all().size() == 2; }));
    EXPECT_THAT(events->all(), ElementsAre("interruption", "invalidation"));
}

TYPED_TEST(IPCTransportContract, ListenerThatIsGoneLeavesItsConnections) {
    this->host->keeps = false;
    const auto client = this->connect();
    this->listener.reset();
    client.ask(kAsk, {"still there"});
    EXPECT_TRUE(this->world.comesTrue([&] { return client.answers->copy().size() == 1; }));
    EXPECT_FALSE(this->transport->connectToService(kService));
}

TYPED_TEST(IPCTransportContract, NothingIsServedBeforeTheConnectionIsResumed) {
    this->host->resumes = false;
    const auto client = this->connect();
    client.say("early");
    this->world.comesTrue([] { return true; });
    EXPECT_EQ(this->host->partner->served, 0);
    this->acceptedLast()->resume();
    EXPECT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 1; }));
}

TYPED_TEST(IPCTransportContract, MessagesArriveInTheOrderInWhichTheyWereSent) {
    const auto client = this->connect();
    std::vector<std::string> expected;
    for (int i = 0; i < 500; ++i) {
        expected.push_back(std::to_string(i));
        if (i % 7 == 0) {
            client.ask(kAsk, {expected.back()});
        } else {
            client.say(expected.back());
        }
    }
    EXPECT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 500; }));
    EXPECT_EQ(this->host->partner->said.copy(), expected);
}

TYPED_TEST(IPCTransportContract, MessagesGoBothWaysOnOneConnection) {
    const auto client = this->connect();
    std::atomic<int> answers{0};
    this->acceptedLast()->remoteObjectProxyWithErrorHandler(nullptr)->send(
        kAsk, {"back"}, [&](const Array& values) { answers += values.at(0) == Value("back!"); });
    client.ask(kAsk, {"forth"});
    EXPECT_TRUE(this->world.comesTrue([&] { return answers == 1 && client.answers->copy().size() == 1; }));
    EXPECT_THAT(client.partner->said.copy(), ElementsAre("back"));
    EXPECT_THAT(client.answers->copy(), ElementsAre("forth!"));
}

TYPED_TEST(IPCTransportContract, RepliesComeLaterFromAnyThreadInAnyOrder) {
    const auto client = this->connect();
    client.ask(kKeep);
    client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->kept.copy().size() == 2; }));
    EXPECT_THAT(client.answers->copy(), IsEmpty());
    const auto kept = this->host->partner->kept.copy();
    std::thread([&] {
        kept[1]({"second"});
        kept[0]({"first"});
    }).join();
    ASSERT_TRUE(this->world.comesTrue([&] { return client.answers->copy().size() == 2; }));
    EXPECT_THAT(client.answers->copy(), ElementsAre("second", "first"));
}

TYPED_TEST(IPCTransportContract, ReplyIsSentOnce) {
    const auto client = this->connect();
    client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->kept.copy().size() == 1; }));
    const IPCReply reply = this->host->partner->kept.copy()[0];
    reply({"once"});
    reply({"twice"});
    client.ask(kAsk, {"behind"});
    ASSERT_TRUE(this->world.comesTrue([&] { return client.answers->copy().size() >= 2; }));
    EXPECT_THAT(client.answers->copy(), ElementsAre("once", "behind!"));
}

TYPED_TEST(IPCTransportContract, ReplyThatIsNotWantedIsNotOffered) {
    const auto client = this->connect();
    client.send(kAsk, {"no answer please"});
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 1; }));
    EXPECT_EQ(this->host->partner->repliesNotWanted, 1);
}

TYPED_TEST(IPCTransportContract, ServedRequestNamesItsConnection) {
    const auto one = this->connect();
    const auto other = this->connect();
    ASSERT_NE(one.processIdentifier, other.processIdentifier);
    one.say("1");
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 1; }));
    other.say("2");
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 2; }));
    EXPECT_THAT(this->host->partner->servedFor.copy(),
                ElementsAre(one.processIdentifier, other.processIdentifier));
    EXPECT_EQ(this->transport->currentConnection(), nullptr) << "this thread serves nobody";
}

TYPED_TEST(IPCTransportContract, PeerIsItsProcessWithTheRightsOfItsBundle) {
    const auto client = this->connect({"com.example.app", {{"right", true}, {"limit", 7}}});
    const auto stranger = this->connect();
    const auto ends = this->host->accepted.copy();
    EXPECT_EQ(ends[0]->processIdentifier(), client.processIdentifier);
    EXPECT_EQ(ends[0]->valueForEntitlement("right"), Value(true));
    EXPECT_EQ(ends[0]->valueForEntitlement("limit"), Value(7));
    EXPECT_TRUE(ends[0]->valueForEntitlement("other").isNothing());
    EXPECT_EQ(ends[1]->processIdentifier(), stranger.processIdentifier);
    EXPECT_TRUE(ends[1]->valueForEntitlement("right").isNothing());
}

TYPED_TEST(IPCTransportContract, EndpointIsTheWayToItsListenerAlone) {
    const auto anonymous = *this->transport->createAnonymousListener();
    const auto itsHost = std::make_shared<Host>(*this->transport);
    anonymous->setDelegate(itsHost);
    anonymous->resume();
    EXPECT_EQ(this->listener->endpoint(), nullptr) << "a named listener is reached by its name";
    const auto client = this->connect();
    client.send(kGive, {Array{std::shared_ptr<ObjectHandle>(anonymous->endpoint())}});
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->endpoint.copy() != nullptr; }));
    const auto endpoint = this->host->partner->endpoint.copy();
    const auto first = this->clientOf(*this->transport->connectToEndpoint(endpoint));
    const auto second = this->clientOf(*this->transport->connectToEndpoint(endpoint));
    first.say("through");
    ASSERT_TRUE(this->world.comesTrue([&] { return itsHost->partner->served == 1; }));
    second.say("the endpoint");
    ASSERT_TRUE(this->world.comesTrue([&] { return itsHost->partner->served == 2; }));
    EXPECT_THAT(itsHost->partner->said.copy(), ElementsAre("through", "the endpoint"));
    EXPECT_THAT(this->host->partner->said.copy(), IsEmpty());
    EXPECT_EQ(this->host->arrivals, 1);
}

TYPED_TEST(IPCTransportContract, EndpointOfAListenerThatIsGoneLeadsNowhere) {
    auto anonymous = *this->transport->createAnonymousListener();
    anonymous->setDelegate(this->host);
    anonymous->resume();
    const auto endpoint = anonymous->endpoint();
    EXPECT_TRUE(this->transport->connectToEndpoint(endpoint));
    anonymous.reset();
    EXPECT_FALSE(this->transport->connectToEndpoint(endpoint));
}

}  // namespace
}  // namespace kelvo::test
