#pragma once

#include "IPCWorlds.h"
#include "base/Guarded.h"
#include "support/LogRecorder.h"

#include <algorithm>
#include <atomic>
#include <functional>
#include <memory>
#include <string>
#include <vector>

#include <gtest/gtest.h>

/// What every transport promises: both sides of connections, in the worlds of the transports.
namespace kelvo::test {

inline constexpr const char* kService = "com.example.contract";

/// What both sides of a connection understand.
enum Method : std::size_t { kSay, kAsk, kKeep, kDrop, kGive };

inline std::shared_ptr<const IPCInterface> contractInterface() {
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
        if (onServe) onServe();
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

    /// Runs with each message, on the connection's queue. Before the first one.
    std::function<void()> onServe;
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

inline void setUp(IPCConnection& connection, const std::shared_ptr<Partner>& partner,
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

}  // namespace kelvo::test
