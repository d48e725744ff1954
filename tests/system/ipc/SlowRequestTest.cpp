#include "base/Guarded.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/Eventually.h"
#include "support/TemporaryDirectory.h"

#include <atomic>
#include <future>
#include <set>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::eventually;

enum Method : std::size_t { kWait, kAsk };

std::shared_ptr<const IPCInterface> slowInterface() {
    static const auto interface = std::make_shared<const IPCInterface>(
        IPCInterface{"com.example.Slow",
                     {{"wait", {}, std::vector<IPCArgument>{}}, {"ask", {}, std::vector<IPCArgument>{}}}});
    return interface;
}

/// Serves `wait` only when it is let go, and `ask` at once.
class SlowObject : public IPCExportedObject {
  public:
    bool serve(std::size_t method, const Array&, IPCReply reply) override {
        threads.with([](auto& all) { all.insert(std::this_thread::get_id()); });
        if (method == kWait) {
            ++waiting;
            released.wait();
        }
        if (reply) reply({});
        return true;
    }
    Guarded<std::set<std::thread::id>> threads;
    std::atomic<int> waiting{0};
    std::promise<void> release;
    std::shared_future<void> released = release.get_future().share();
};

class SlowRequestTest : public testing::Test, public IPCListenerDelegate {
  protected:
    SlowRequestTest() {
        listener->setDelegate(std::shared_ptr<IPCListenerDelegate>(anchor, this));
        listener->resume();
    }
    ~SlowRequestTest() override {
        for (const IPCConnectionRef& each : clients)
            each->invalidate();
    }
    bool listenerShouldAcceptNewConnection(IPCListener&, const IPCConnectionRef& connection) override {
        connection->setExported(slowInterface(), object);
        connection->resume();
        return true;
    }
    IPCConnectionRef connect() {
        clients.push_back(*transport.connectToService("slow"));
        clients.back()->setRemoteInterface(slowInterface());
        clients.back()->resume();
        return clients.back();
    }
    static std::shared_ptr<std::atomic<int>> send(const IPCConnectionRef& client, Method method) {
        auto answers = std::make_shared<std::atomic<int>>(0);
        client->remoteObjectProxyWithErrorHandler(nullptr)->send(method, {},
                                                                 [answers](const Array&) { ++*answers; });
        return answers;
    }

    const test::TemporaryDirectory root;
    const std::shared_ptr<SlowObject> object = std::make_shared<SlowObject>();
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
    std::shared_ptr<int> anchor = std::make_shared<int>(0);
    std::shared_ptr<IPCListener> listener = transport.createListener("slow");
    std::vector<IPCConnectionRef> clients;
};

TEST_F(SlowRequestTest, HoldsUpNobodyElse) {
    std::vector<std::shared_ptr<std::atomic<int>>> slow;
    for (int i = 0; i < 3; ++i) {
        slow.push_back(send(connect(), kWait));
        ASSERT_TRUE(eventually([&] { return object->waiting == i + 1; }));
    }
    const auto other = connect();
    for (int i = 0; i < 20; ++i) {
        const auto answers = send(other, kAsk);
        ASSERT_TRUE(eventually([&] { return *answers == 1; })) << i;
    }
    object->release.set_value();
    for (const auto& each : slow)
        EXPECT_TRUE(eventually([&] { return *each == 1; }));
}

TEST_F(SlowRequestTest, IsServedBeforeWhatItsClientSentBehindIt) {
    const auto client = connect();
    const auto first = send(client, kWait);
    ASSERT_TRUE(eventually([&] { return object->waiting == 1; }));
    const auto second = send(client, kAsk);
    const auto other = send(connect(), kAsk);
    ASSERT_TRUE(eventually([&] { return *other == 1; }));
    EXPECT_EQ(*second, 0);
    object->release.set_value();
    EXPECT_TRUE(eventually([&] { return *first == 1 && *second == 1; }));
}

TEST_F(SlowRequestTest, DoesNotOutliveItsConnectionsEnd) {
    const auto client = connect();
    send(client, kWait);
    ASSERT_TRUE(eventually([&] { return object->waiting == 1; }));
    client->invalidate();
    const auto other = send(connect(), kAsk);
    EXPECT_TRUE(eventually([&] { return *other == 1; }));
    object->release.set_value();
}

}  // namespace
}  // namespace kelvo
