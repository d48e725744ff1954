#pragma once

#include "base/Guarded.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "support/ChildProcess.h"
#include "support/DescriptorPassing.h"
#include "support/FakeClientProxy.h"
#include "support/x11/XClient.h"

#include <array>
#include <chrono>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <future>
#include <sstream>

#include <gtest/gtest.h>

namespace kelvo::test {

/// What the daemon answers to a request; none when it stays silent for longer than a test waits.
template <typename Answer>
class Answered {
  public:
    void set(Answer answer) { promise_.set_value(std::move(answer)); }
    std::optional<Answer> wait(std::chrono::milliseconds limit = std::chrono::seconds(30)) {
        return future_.wait_for(limit) == std::future_status::ready ? std::optional(future_.get())
                                                                    : std::nullopt;
    }
    bool isSet() const { return future_.wait_for(std::chrono::seconds(0)) == std::future_status::ready; }

  private:
    std::promise<Answer> promise_;
    std::future<Answer> future_ = promise_.get_future();
};

/// A program in a bundle of its own, and the test's hold on its connection: the daemon takes every request
/// that is made here for that process's.
class ClientProcess {
  public:
    struct StartAnswer {
        std::int64_t code = 0;
        bool microphone = false;
        bool camera = false;
        friend bool operator==(const StartAnswer&, const StartAnswer&) = default;
    };
    struct StopAnswer {
        std::string movie;  ///< a path; empty: none
        std::int64_t code = 0;
    };
    /// What a start asks for.
    struct Wanted {
        std::vector<std::uint32_t> windows;
        bool microphone = false;
        bool broadcast = false;
        bool system = false;
        bool capture = false;
    };

    /// Installs the bundle in `folder` and starts its program; with a `place` it shows a window on `display`.
    ClientProcess(const std::string& folder, const std::string& info, const std::string& socketPath,
                  const std::string& display, const std::optional<XClient::Place>& place) {
        install(folder, info);
        std::array<int, 2> ends{-1, -1};
        if (::socketpair(AF_UNIX, SOCK_STREAM, 0, ends.data()) != 0) return;
        const UniqueFd own(ends[0]);
        UniqueFd its(ends[1]);
        std::vector<std::string> command{folder + "/program", socketPath, std::to_string(its.get())};
        if (place) {
            command.push_back(display);
            for (const int number : {place->x, place->y, place->width, place->height})
                command.push_back(std::to_string(number));
        }
        program_ = std::make_unique<ChildProcess>(command);
        its.reset();
        if (program_->waitForLine("window ")) std::istringstream(program_->output().substr(7)) >> window_;
        const timeval patience{20, 0};
        ::setsockopt(own.get(), SOL_SOCKET, SO_RCVTIMEO, &patience, sizeof(patience));
        connect(receiveDescriptor(own.get()));
    }
    ~ClientProcess() {
        if (connection_) connection_->invalidate();
        loop_->stop();
    }
    ClientProcess(const ClientProcess&) = delete;
    ClientProcess& operator=(const ClientProcess&) = delete;

    std::uint32_t window() const { return window_; }
    std::int32_t processIdentifier() const { return program_->processIdentifier(); }
    FakeClientProxy& told() const { return *callbacks_; }
    KVRemoteDaemon& daemon() const { return *daemon_; }
    IPCConnection& connection() const { return *connection_; }

    /// As if it had crashed: its connection is shut with it.
    void kill() {
        program_->signal(SIGKILL);
        program_->waitForExit();
        connection_->invalidate();
    }

    std::optional<StartAnswer> start(const Wanted& wanted, Size size = {320, 480}) const {
        const auto answer = std::make_shared<Answered<StartAnswer>>();
        requestStart(wanted, size, answer);
        return answer->wait();
    }
    /// The same for a test that waits for the answer itself.
    void requestStart(const Wanted& wanted, Size size,
                      const std::shared_ptr<Answered<StartAnswer>>& answer) const {
        daemon_->startRecordingWindowLayerContextIDs(
            wanted.windows, size, wanted.microphone, false, wanted.broadcast, wanted.system, wanted.capture,
            nullptr, [answer, told = startError_](const OptionalError& error, bool microphone, bool camera) {
                told->set(error);
                answer->set({error ? error->code() : 0, microphone, camera});
            });
    }
    /// What the last answer to a start said of it.
    OptionalError startError() const { return startError_->copy(); }
    std::optional<StopAnswer> stop(double startClip = 0, double endClip = 0) const {
        const auto answer = std::make_shared<Answered<StopAnswer>>();
        daemon_->stopRecordingWithStartClipDuration(
            startClip, endClip, [answer](const auto& movieURL, const OptionalError& error) {
                answer->set({movieURL ? movieURL->path() : "", error ? error->code() : 0});
            });
        return answer->wait();
    }
    std::optional<std::int64_t> save(const std::string& movie) const {
        const auto answer = std::make_shared<Answered<std::int64_t>>();
        daemon_->saveVideoToCameraRoll(URL::file(movie), [answer](const OptionalError& error) {
            answer->set(error ? error->code() : 0);
        });
        return answer->wait();
    }
    /// Whether the discard was answered within `limit`.
    bool discard(std::chrono::milliseconds limit) const {
        const auto answer = std::make_shared<Answered<bool>>();
        daemon_->discardRecordingWithHandler([answer] { answer->set(true); });
        return answer->wait(limit).has_value();
    }
    /// The flag of the daemon's state; none when there is no state.
    std::optional<bool> flag(const std::string& name) const {
        const auto answer = std::make_shared<Answered<std::optional<Dictionary>>>();
        daemon_->synchronousGetCurrentState([answer](const auto& state) { answer->set(state); });
        const auto state = answer->wait().value_or(std::nullopt);
        const Value* const value = state ? state->find(name) : nullptr;
        return value != nullptr ? value->asBool() : std::nullopt;
    }

  private:
    static void install(const std::string& folder, const std::string& info) {
        namespace fs = std::filesystem;
        std::error_code ignored;
        fs::create_directories(folder);
        fs::permissions(folder, fs::perms::owner_all);
        std::ofstream(folder + "/Info.json") << info;
        fs::copy_file(CLIENT_PROGRAM, folder + "/program", ignored);  // there, when it is started again
        fs::permissions(folder + "/Info.json", fs::perms::owner_read | fs::perms::owner_write);
        fs::permissions(folder + "/program", fs::perms::owner_all);
    }

    void connect(UniqueFd socket) {
        ASSERT_TRUE(socket) << "no connection: " << program_->output();
        connection_ =
            std::make_shared<SocketConnection>(SocketConnection::Side::client, std::move(socket), loop_,
                                               nullptr, std::make_shared<const DeviceRoot>("/", ""), nullptr);
        connection_->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        connection_->setExported(interfaceOf<KVClientProtocol>(),
                                 std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks_));
        connection_->resume();
        daemon_ = std::make_unique<KVRemoteDaemon>(*connection_, nullptr);
    }

    std::unique_ptr<ChildProcess> program_;
    std::uint32_t window_ = 0;
    const std::shared_ptr<SocketLoop> loop_ = std::make_shared<SocketLoop>();
    const std::shared_ptr<FakeClientProxy> callbacks_ = std::make_shared<FakeClientProxy>();
    const std::shared_ptr<Guarded<OptionalError>> startError_ = std::make_shared<Guarded<OptionalError>>();
    IPCConnectionRef connection_;
    std::unique_ptr<KVRemoteDaemon> daemon_;
};

}  // namespace kelvo::test
