// What a small request costs a client: from sending it to having its reply, between two processes, through
// the whole of our transport and the connection manager, against a bare echo of sd-bus on a socket of its
// own. The two take turns, so that a noisy machine disturbs both alike.

#include "base/KVLog.h"
#include "ipc/KVConnectionManager.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeDaemon.h"
#include "support/TemporaryDirectory.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <future>
#include <sys/prctl.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <unistd.h>
#include <vector>

#include <systemd/sd-bus.h>
#include <systemd/sd-id128.h>

namespace {

using namespace kelvo;
using Clock = std::chrono::steady_clock;

constexpr int kRounds = 60;
constexpr int kCallsARound = 250;
constexpr const char* kText = "com.example.extension";

/// A process that ends with this one.
template <typename Body>
pid_t forkServer(const Body& body) {
    const pid_t child = ::fork();
    if (child != 0) return child;
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    body();
    ::_exit(0);
}

int answer(sd_bus_message* message, void*, sd_bus_error*) {
    const char* text = nullptr;
    if (sd_bus_message_read(message, "s", &text) < 0) return -1;
    return sd_bus_reply_method_return(message, "b", text[0] == 'c');
}

/// The peer: a process that answers one method of one object.
void serveBare(int socket) {
    static const sd_bus_vtable kTable[] = {
        SD_BUS_VTABLE_START(0),
        SD_BUS_METHOD("echo", "s", "b", answer, SD_BUS_VTABLE_UNPRIVILEGED),
        SD_BUS_VTABLE_END,
    };
    sd_bus* bus = nullptr;
    sd_id128_t identity{};
    sd_id128_randomize(&identity);
    sd_bus_new(&bus);
    sd_bus_set_fd(bus, socket, socket);
    sd_bus_set_server(bus, 1, identity);
    sd_bus_set_anonymous(bus, 1);
    sd_bus_start(bus);
    sd_bus_add_object_vtable(bus, nullptr, "/echo", "com.example.Echo", kTable, nullptr);
    while (true) {
        const int done = sd_bus_process(bus, nullptr);
        if (done < 0) return;
        if (done == 0) sd_bus_wait(bus, UINT64_MAX);
    }
}

class Bare {
  public:
    Bare() {
        std::array<int, 2> ends{-1, -1};
        if (::socketpair(AF_UNIX, SOCK_STREAM | SOCK_NONBLOCK, 0, ends.data()) != 0) std::abort();
        child_ = forkServer([&] {
            ::close(ends[0]);
            serveBare(ends[1]);
        });
        ::close(ends[1]);
        sd_bus_new(&bus_);
        sd_bus_set_fd(bus_, ends[0], ends[0]);
        sd_bus_set_anonymous(bus_, 1);
        sd_bus_start(bus_);
    }
    ~Bare() {
        sd_bus_unref(bus_);
        ::kill(child_, SIGKILL);
        ::waitpid(child_, nullptr, 0);
    }
    void call() {
        sd_bus_message* reply = nullptr;
        int value = 0;
        if (sd_bus_call_method(bus_, nullptr, "/echo", "com.example.Echo", "echo", nullptr, &reply, "s",
                               kText) < 0 ||
            sd_bus_message_read(reply, "b", &value) < 0 || value == 0)
            std::abort();
        sd_bus_message_unref(reply);
    }
    double microseconds() {
        const auto start = Clock::now();
        call();
        return std::chrono::duration<double, std::micro>(Clock::now() - start).count();
    }

  private:
    pid_t child_ = 0;
    sd_bus* bus_ = nullptr;
};

std::shared_ptr<SocketTransport> transportAt(const std::string& root) {
    return std::make_shared<SocketTransport>(std::make_shared<const DeviceRoot>(root, root), nullptr);
}

/// A daemon that forgets what it is asked.
struct QuickDaemon : test::FakeDaemon {
    void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                         BooleanHandler handler) override {
        handler(preferredExtension.front() == 'c');
    }
};

/// Our daemon's door, without a recording behind it.
void serveOurs(const std::string& root, int ready) {
    setLogSink(nullptr);
    const auto transport = transportAt(root);
    SimulatedDevice device;
    const auto manager = std::make_shared<KVConnectionManager>(
        transport, std::make_shared<KVLocalization>(device.bundles, device.languages));
    const auto daemon = std::make_shared<QuickDaemon>();
    manager->setDelegate(daemon);
    const auto listener = transport->createListener("com.quillon.kelvod");
    listener->setDelegate(manager);
    listener->resume();
    static_cast<void>(::write(ready, "r", 1) == 1);
    ::pause();
}

class Ours {
  public:
    Ours() {
        std::array<int, 2> pipe{-1, -1};
        if (::pipe(pipe.data()) != 0) std::abort();
        child_ = forkServer([&] { serveOurs(root_.path(), pipe[1]); });
        char ready = 0;
        if (::read(pipe[0], &ready, 1) != 1) std::abort();
        transport_ = transportAt(root_.path());
        connection_ = *transport_->connectToService("com.quillon.kelvod");
        connection_->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        connection_->resume();
        daemon_ = std::make_unique<KVRemoteDaemon>(*connection_, [](const KVError&) { std::abort(); });
    }
    ~Ours() {
        connection_->invalidate();
        ::kill(child_, SIGKILL);
        ::waitpid(child_, nullptr, 0);
    }
    /// Each request is sent by the handler of the one before, as a client does that has more to ask.
    void measure(int count, std::vector<double>& microseconds) {
        std::promise<void> done;
        ask(count, microseconds, done);
        done.get_future().wait();
    }

  private:
    void ask(int count, std::vector<double>& microseconds, std::promise<void>& done) {
        const auto start = Clock::now();
        daemon_->synchronousIsBroadcastingWithPreferredExtension(kText, [this, start, count, &microseconds,
                                                                         &done](bool value) {
            microseconds.push_back(std::chrono::duration<double, std::micro>(Clock::now() - start).count());
            if (!value) std::abort();
            count > 1 ? ask(count - 1, microseconds, done) : done.set_value();
        });
    }

    const test::TemporaryDirectory root_;
    pid_t child_ = 0;
    std::shared_ptr<SocketTransport> transport_;
    IPCConnectionRef connection_;
    std::unique_ptr<KVRemoteDaemon> daemon_;
};

double percentile(std::vector<double> values, double part) {
    const auto place = static_cast<std::ptrdiff_t>(static_cast<double>(values.size() - 1) * part);
    std::ranges::nth_element(values, values.begin() + place);
    return values[static_cast<std::size_t>(place)];
}

void print(const char* name, double part, const std::vector<double>& bare, const std::vector<double>& ours) {
    const double theirs = percentile(bare, part);
    const double mine = percentile(ours, part);
    std::printf("%-16s  bare sd-bus %7.1f us   ours %7.1f us   ratio %.3f\n", name, theirs, mine,
                mine / theirs);
}

}  // namespace

int main() {
    Bare bare;  // both servers are forked while this process has one thread
    Ours ours;
    std::vector<double> theirs;
    std::vector<double> mine;
    std::vector<double> warm;
    for (int i = 0; i < kCallsARound; ++i)
        bare.call();
    ours.measure(kCallsARound, warm);
    for (int round = 0; round < kRounds; ++round) {
        for (int i = 0; i < kCallsARound; ++i)
            theirs.push_back(bare.microseconds());
        ours.measure(kCallsARound, mine);
    }
    std::printf("%d round trips of each, two processes\n", kRounds * kCallsARound);
    print("median", 0.5, theirs, mine);
    print("99th percentile", 0.99, theirs, mine);
    return 0;
}
