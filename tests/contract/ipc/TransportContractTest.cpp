#include "IPCWorlds.h"
#include "base/Guarded.h"
#include "platform/IPCBounds.h"
#include "support/LogRecorder.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr const char* kService = "com.example.contract";

/// What both sides of a connection understand.
enum Method : std::size_t { kSay, kAsk, kKeep, kDrop, kGive };

std::shared_ptr<const IPCInterface> contractInterface() {
    static const auto interface = std::make_shared<const IPCInterface>(
        IPCInterface{"com.example.Contract",
                     {{"say", {{"text", "s"}}, {}},
                      {"ask", {{"text", "s"}}, std::vector<IPCArgument>{{"text", "s"}}},
                      {"keep", {}, std::vector<IPCArgument>{{"text", "s"}}},
                      {"drop", {}, std::vector<IPCArgument>{{"text", "s"}}},
                      {"give", {{"endpoint", "ah", IPCObjects::endpoints}}, {}}}});
    return interface;
}

/// One side's object. Remembers what it served and for whom.
class Partner : public IPCExportedObject {
  public:
    explicit Partner(IPCTransport& transport) : transport_(transport) {}

    bool serve(std::size_t method, const Array& arguments, IPCReply reply) override {
        if (method == kSay && arguments.at(0) == Value("unacceptable")) return false;
        const auto connection = transport_.currentConnection();
        servedFor.with([&](auto& all) { all.push_back(connection ? connection->processIdentifier() : 0); });
        if (method == kSay || method == kAsk)
            said.with([&](auto& all) { all.push_back(*arguments.at(0).asString()); });
        if (method == kAsk && !reply) ++repliesNotWanted;
        if (method == kAsk && reply) reply({*arguments.at(0).asString() + "!"});
        if (method == kKeep) kept.with([&](auto& all) { all.push_back(reply); });
        if (method == kGive) {
            const auto handle = arguments.at(0).asArray()->at(0).template as<std::shared_ptr<ObjectHandle>>();
            endpoint.set(std::dynamic_pointer_cast<IPCEndpoint>(*handle));
        }
        ++served;
        return true;
    }

    std::atomic<int> served{0};
    std::atomic<int> repliesNotWanted{0};
    Guarded<std::vector<std::string>> said;
    Guarded<std::vector<std::int32_t>> servedFor;
    Guarded<std::vector<IPCReply>> kept;
    Guarded<std::shared_ptr<IPCEndpoint>> endpoint;

  private:
    IPCTransport& transport_;
};

/// What happens to one end of a connection, in order.
struct Events {
    Guarded<std::vector<std::string>> list;
    void note(const std::string& event) {
        list.with([&](auto& all) { all.push_back(event); });
    }
    std::vector<std::string> all() const { return list.copy(); }
};

void setUp(IPCConnection& connection, const std::shared_ptr<Partner>& partner,
           const std::shared_ptr<Events>& events) {
    connection.setExported(contractInterface(), partner);
    connection.setRemoteInterface(contractInterface());
    connection.setInterruptionHandler([events] { events->note("interruption"); });
    connection.setInvalidationHandler([events] { events->note("invalidation"); });
}

/// Accepts everyone, or nobody.
class Host : public IPCListenerDelegate {
  public:
    explicit Host(IPCTransport& transport) : partner(std::make_shared<Partner>(transport)) {}

    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        if (!accepts) return false;
        const auto itsEvents = std::make_shared<Events>();
        setUp(*connection, partner, itsEvents);
        if (resumes) connection->resume();
        events.with([&](auto& all) { all.push_back(itsEvents); });
        if (keeps) accepted.with([&](auto& all) { all.push_back(connection); });
        ++arrivals;
        return true;
    }

    std::atomic<bool> accepts{true};
    std::atomic<bool> resumes{true};
    std::atomic<bool> keeps{true};
    std::atomic<int> arrivals{0};
    const std::shared_ptr<Partner> partner;
    Guarded<std::vector<IPCConnectionRef>> accepted;
    Guarded<std::vector<std::shared_ptr<Events>>> events;
};

template <typename World>
class IPCTransportContract : public testing::Test {
  protected:
    struct Client {
        std::int32_t processIdentifier = 0;
        IPCConnectionRef connection;
        std::shared_ptr<Partner> partner;
        std::shared_ptr<Events> events = std::make_shared<Events>();
        std::shared_ptr<Guarded<std::vector<std::int64_t>>> errors =
            std::make_shared<Guarded<std::vector<std::int64_t>>>();
        std::shared_ptr<Guarded<std::vector<std::string>>> answers =
            std::make_shared<Guarded<std::vector<std::string>>>();

        void send(Method method, Array arguments = {}, IPCReply handler = nullptr) const {
            connection
                ->remoteObjectProxyWithErrorHandler([all = errors](const KVError& error) {
                    all->with([&](auto& codes) { codes.push_back(error.code()); });
                })
                ->send(method, std::move(arguments), std::move(handler));
        }
        void say(const std::string& text) const { send(kSay, {text}); }
        void ask(Method method, Array arguments = {}) const {
            send(method, std::move(arguments), [all = answers](const Array& values) {
                all->with([&](auto& texts) { texts.push_back(*values.at(0).asString()); });
            });
        }
    };

    IPCTransportContract() {
        listener->setDelegate(host);
        listener->resume();
    }

    Client clientOf(IPCConnectionRef connection, std::int32_t processIdentifier = 0) {
        Client client;
        client.processIdentifier = processIdentifier;
        client.connection = std::move(connection);
        client.partner = std::make_shared<Partner>(*transport);
        setUp(*client.connection, client.partner, client.events);
        client.connection->resume();
        return client;
    }
    Client connect(const ClientProgram& program = {}) {
        const int before = host->arrivals;
        const ConnectedProcess process = world.connectFrom(program, kService);
        Client client = clientOf(process.connection, process.processIdentifier);
        EXPECT_TRUE(world.comesTrue([&] { return !host->accepts || host->arrivals > before; }));
        return client;
    }
    IPCConnectionRef acceptedLast() { return host->accepted.copy().back(); }
    std::vector<std::string> eventsOfAcceptedLast() { return host->events.copy().back()->all(); }
    std::size_t cutOffs() const {
        const auto lines = log.texts();
        return static_cast<std::size_t>(std::ranges::count_if(
            lines, [](const std::string& line) { return line.find("cut off") != std::string::npos; }));
    }
    bool ends(const Client& client) {
        return world.comesTrue(
            [&] { return !client.events->all().empty() && client.events->all().back() == "invalidation"; });
    }

    LogRecorder log;
    World world;
    std::shared_ptr<IPCTransport> transport = world.transport();
    std::shared_ptr<Host> host = std::make_shared<Host>(*transport);
    std::shared_ptr<IPCListener> listener = transport->createListener(kService);
};

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

TYPED_TEST(IPCTransportContract, DroppedReplyIsSilenceUntilTheConnectionEnds) {
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

TYPED_TEST(IPCTransportContract, ReplyThatIsNotWantedIsNotOffered) {
    const auto client = this->connect();
    client.send(kAsk, {"no answer please"});
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->served == 1; }));
    EXPECT_EQ(this->host->partner->repliesNotWanted, 1);
}

TYPED_TEST(IPCTransportContract, ReplyAfterTheEndIsIgnored) {
    const auto client = this->connect();
    client.ask(kKeep);
    ASSERT_TRUE(this->world.comesTrue([&] { return this->host->partner->kept.copy().size() == 1; }));
    client.connection->invalidate();
    EXPECT_TRUE(this->ends(client));
    this->host->partner->kept.copy()[0]({"too late"});
    EXPECT_TRUE(this->world.comesTrue([&] { return client.errors->copy().size() == 1; }));
    EXPECT_THAT(client.answers->copy(), IsEmpty());
}

TYPED_TEST(IPCTransportContract, LostPeerIsAnInterruptionAndThenAnInvalidation) {
    const auto client = this->connect();
    client.connection->invalidate();
    client.connection->invalidate();
    EXPECT_TRUE(this->ends(client));
    EXPECT_THAT(client.events->all(), ElementsAre("invalidation")) << "what one asked for is no interruption";
    ASSERT_TRUE(this->world.comesTrue([&] { return this->eventsOfAcceptedLast().size() == 2; }));
    EXPECT_THAT(this->eventsOfAcceptedLast(), ElementsAre("interruption", "invalidation"));
}

TYPED_TEST(IPCTransportContract, WhatWasSentBeforeTheEndIsServedBeforeIt) {
    const auto client = this->connect();
    client.say("last words");
    client.connection->invalidate();
    ASSERT_TRUE(this->world.comesTrue([&] { return this->eventsOfAcceptedLast().size() == 2; }));
    EXPECT_THAT(this->host->partner->said.copy(), ElementsAre("last words"));
}

TYPED_TEST(IPCTransportContract, RemovedHandlersDoNotRun) {
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

TYPED_TEST(IPCTransportContract, SendingOverAConnectionThatEndedFailsAtOnce) {
    const auto client = this->connect();
    client.connection->invalidate();
    client.say("one way");
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN));
    client.ask(kAsk, {"with a reply"});
    EXPECT_TRUE(this->ends(client));
    EXPECT_TRUE(this->world.comesTrue([&] { return client.errors->copy().size() == 2; }));
    EXPECT_THAT(client.errors->copy(), ElementsAre(ENOTCONN, ENOTCONN));
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

TYPED_TEST(IPCTransportContract, ArgumentsThatAreNotTakenEndThatConnectionAlone) {
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

TYPED_TEST(IPCTransportContract, TooManyOutstandingRequestsEndTheConnection) {
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

TYPED_TEST(IPCTransportContract, RequestsThatWereSettledDoNotCount) {
    const auto client = this->connect();
    for (std::size_t i = 0; i < ipc_bounds::kMostOwedReplies * 2; ++i) {
        client.ask(i % 2 == 0 ? kAsk : kDrop, i % 2 == 0 ? Array{"x"} : Array{});
        if (i % 16 == 0) this->world.comesTrue([&, i] { return this->host->partner->served > int(i); });
    }
    EXPECT_TRUE(
        this->world.comesTrue([&] { return client.answers->copy().size() == ipc_bounds::kMostOwedReplies; }));
    EXPECT_EQ(this->cutOffs(), 0U);
}

}  // namespace
}  // namespace kelvo::test
