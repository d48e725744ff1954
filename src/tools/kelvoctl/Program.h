#pragma once

#include "base/MainQueue.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/linux/system/TerminationSignals.h"
#include "tools/kelvoctl/Callbacks.h"
#include "tools/kelvoctl/CommandLine.h"
#include "tools/kelvoctl/ExitStatus.h"

#include <functional>
#include <memory>
#include <string>

namespace kelvo::ctl {

/// What every command has: the daemon, the main loop, the signals and the ways out. A command is begun, does
/// its work in handlers that run on the main thread, and calls `finish`. Main thread, but for `onMain`'s
/// results.
class Program {
  public:
    explicit Program(const CommandLine& line) : line_(line) {}
    ~Program();
    Program(const Program&) = delete;
    Program& operator=(const Program&) = delete;

    /// Does what the command line asks for; the exit status. `signals` was made before any other thread.
    int run(TerminationSignals& signals);

    const CommandLine& line() const { return line_; }
    /// Connects to a socket of the daemon's, for commands that need another one; ends the program when nobody
    /// answers there, or when the daemon goes away.
    IPCConnectionRef open(const std::string& path, std::shared_ptr<const IPCInterface> exported,
                          std::shared_ptr<IPCExportedObject> object,
                          std::shared_ptr<const IPCInterface> remote);
    /// What ends the program when a request cannot be answered.
    std::function<void(const KVError&)> deliveryErrorHandler();

    /// Only once the daemon is connected, as it is for every command but those that `open` another socket.
    KVRemoteDaemon& daemon() { return *daemon_; }
    MainQueue& mainQueue() { return mainQueue_; }
    const SystemClock& clock() const { return clock_; }

    /// What runs when the daemon tells something, and on the first Ctrl-C, SIGTERM or SIGHUP. Without a
    /// handler the latter ends the program, with success.
    void setCallbackHandler(Callbacks::Handler handler) { callbackHandler_ = std::move(handler); }
    void setInterruptHandler(Task handler) { interruptHandler_ = std::move(handler); }

    /// A handler for the daemon's answers that runs `handler` on the main thread.
    template <typename Handler>
    auto onMain(Handler handler) {
        return [this, handler = std::move(handler)](const auto&... values) {
            mainQueue_.async([handler, ... copies = values] { handler(copies...); });
        };
    }

    /// Ends the program. The first status counts.
    void finish(int status);
    /// Prints an error of the daemon's and ends the program.
    void fail(const KVError& error);
    /// Prints why and ends the program.
    void fail(const std::string& why, int status);

    /// Prints a line of the answer: JSON when that is asked for, else the text. An output that is closed ends
    /// the program.
    void answer(const std::string& text, const Value& json);
    /// Prints a remark for a person, on standard error; nothing with --json.
    void remark(const std::string& text) const;

  private:
    bool connect();
    void interrupted();
    void lost();

    const CommandLine line_;
    const SystemClock clock_;
    MainQueue mainQueue_{clock_};
    SocketTransport transport_{std::make_shared<const DeviceRoot>("/", ""), nullptr};
    std::shared_ptr<Callbacks> callbacks_;
    IPCConnectionRef connection_;
    std::unique_ptr<KVRemoteDaemon> daemon_;
    Callbacks::Handler callbackHandler_;
    Task interruptHandler_;
    std::shared_ptr<void> command_;  // what the command keeps while it runs
    bool isFinished_ = false;
    int status_ = kDone;
};

}  // namespace kelvo::ctl
