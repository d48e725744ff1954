#pragma once

#include "ipc/KVClientProtocolTable.h"
#include "kit/RecorderCore.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeDaemon.h"

#include <deque>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvokit {

using kelvo::Guarded;

/// A daemon that says yes.
struct WillingDaemon : kelvo::test::FakeDaemon {
    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windows,
                                             const kelvo::Size& size, bool microphone, bool camera,
                                             bool broadcast, bool system, bool capture,
                                             const std::shared_ptr<kelvo::IPCEndpoint>& listener,
                                             StartHandler handler) override {
        const StartHandler answer = [&](const kelvo::OptionalError& error, bool, bool) {
            handler(isWilling ? std::nullopt : error, isWilling && microphone, false);
        };
        FakeDaemon::startRecordingWindowLayerContextIDs(windows, size, microphone, camera, broadcast, system,
                                                        capture, listener, answer);
    }
    void connectionManagerDidAcceptNewConnection(const kelvo::IPCConnectionRef& connection,
                                                 const std::optional<std::string>& bundle) override {
        FakeDaemon::connectionManagerDidAcceptNewConnection(connection, bundle);
        client.set(connection);
    }
    std::atomic<bool> isWilling{true};
    Guarded<kelvo::IPCConnectionRef> client;
};

/// A recorder before a fake daemon on a simulated device; its executor and its timer run when the test says
/// so.
class RecorderFixture : public testing::Test {
  protected:
    using Task = std::function<void()>;

    RecorderFixture() {
        startDaemon();
        recorder->onState([this](const RecorderState& state) { states.push_back(state); });
        recorder->onConnectionLost([this](const Error& error) { losses.push_back(error.code); });
        recorder->onConnectionRestored([this] { ++restorations; });
        recorder->onStop([this](const auto& movie, const auto& error) {
            stops.emplace_back(movie.value_or(""), error ? error->code : 0);
        });
    }

    void startDaemon() {
        listener = device.ipc->createListener("com.quillon.kelvod");
        isDaemonUp = true;
        manager->setDelegate(daemon);
        listener->setDelegate(manager);
        listener->resume();
    }
    /// Every connection of the daemon ends, and nobody listens any more.
    void killDaemon() {
        isDaemonUp = false;
        if (const auto client = daemon->client.exchange(nullptr)) client->invalidate();
        settle();
    }
    kelvo::Result<kelvo::IPCConnectionRef> connect() {
        ++attempts;
        if (!isDaemonUp) return kelvo::KVError::posix(ECONNREFUSED, "/run/socket");
        auto connection = device.ipc->connectToService("com.quillon.kelvod");
        if (afterConnecting) afterConnecting();
        return connection;
    }

    /// Everything that follows from what was done has happened, on the executor too.
    void settle() {
        do {
            device.settle();
        } while (runExecutor() > 0);
    }
    int runExecutor() {
        int ran = 0;
        for (auto next = nextTask(); next; next = nextTask(), ++ran)
            next();
        return ran;
    }
    Task nextTask() {
        return tasks.with([](auto& all) {
            if (all.empty()) return Task();
            Task first = std::move(all.front());
            all.pop_front();
            return first;
        });
    }
    /// The pause that the timer waits for; its task runs now.
    std::chrono::milliseconds fireTimer() {
        auto [pause, task] = timers.with([](auto& all) {
            auto first = std::move(all.front());
            all.pop_front();
            return first;
        });
        task();
        settle();
        return pause;
    }

    template <typename Use>
    void asDaemon(Use use) {
        const auto connection = daemon->client.copy();
        kelvo::RemoteClient client = kelvo::remoteClient(*connection, "client");
        use(client);
        settle();
    }
    Recorder::StartHandler noteStart() {
        return [this](const std::optional<Error>& error, bool microphone, bool) {
            answers.emplace_back((error ? std::to_string(error->code) : "started") +
                                 (microphone ? "+mic" : ""));
        };
    }
    Recorder::DoneHandler noteDone() {
        return [this](const std::optional<Error>& error) {
            answers.push_back(error ? std::to_string(error->code) : "done");
        };
    }
    Recorder::MovieHandler noteMovie() {
        return [this](const std::optional<std::string>& movie, const std::optional<Error>& error) {
            answers.push_back(movie.value_or("") + (error ? std::to_string(error->code) : ""));
        };
    }
    void startRecording() {
        recorder->start({{7}, 100, 200, true, false});
        settle();
    }

    kelvo::SimulatedDevice device;
    std::shared_ptr<WillingDaemon> daemon = std::make_shared<WillingDaemon>();
    std::shared_ptr<kelvo::KVLocalization> localization =
        std::make_shared<kelvo::KVLocalization>(device.bundles, device.languages);
    std::shared_ptr<kelvo::KVConnectionManager> manager =
        std::make_shared<kelvo::KVConnectionManager>(device.ipc, localization);
    std::shared_ptr<kelvo::IPCListener> listener;
    bool isDaemonUp = false;
    int attempts = 0;
    std::function<void()> afterConnecting;
    Guarded<std::deque<Task>> tasks;
    Guarded<std::deque<std::pair<std::chrono::milliseconds, Task>>> timers;
    std::vector<RecorderState> states;
    std::vector<std::int64_t> losses;
    int restorations = 0;
    std::vector<std::pair<std::string, std::int64_t>> stops;
    std::vector<std::string> answers;
    std::unique_ptr<Recorder> recorder = RecorderTestAccess::make(
        {[this] { return connect(); },
         [this](auto pause, auto task) {
             timers.with([&](auto& all) { all.emplace_back(pause, std::move(task)); });
         },
         [this](auto task) { tasks.with([&](auto& all) { all.push_back(std::move(task)); }); },
         std::make_shared<kelvo::KVUserErrors>(localization)});
};

}  // namespace kelvokit
