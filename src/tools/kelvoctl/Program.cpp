#include "tools/kelvoctl/Program.h"

#include "ipc/KVClientProtocolTable.h"
#include "tools/kelvoctl/Commands.h"
#include "tools/kelvoctl/DaemonSocket.h"
#include "tools/kelvoctl/JsonText.h"

#include <csignal>
#include <cstdio>

namespace kelvo::ctl {

Program::~Program() {
    if (!connection_) return;
    connection_->setInvalidationHandler(nullptr);
    connection_->invalidate();
}

int Program::run(TerminationSignals& signals) {
    if (!connect()) return status_;
    signals.watch([this] { mainQueue_.async([this] { interrupted(); }); });
    command_ = beginCommand(*this);
    if (!isFinished_) mainQueue_.run();
    return status_;
}

bool Program::connect() {
    const std::string path = daemonSocket(line_.socket);
    const auto made = transport_.connectToSocket(path);
    if (!made) {
        fail("no daemon answers: " + made.error().localizedDescription() + "\n" + howToStart(), kNoDaemon);
        return false;
    }
    connection_ = *made;
    callbacks_ = std::make_shared<Callbacks>([this](const std::string& name, const Dictionary& arguments) {
        mainQueue_.async([this, name, arguments] {
            if (callbackHandler_) callbackHandler_(name, arguments);
        });
    });
    connection_->setExported(interfaceOf<KVClientProtocol>(),
                             std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks_));
    connection_->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
    connection_->setInvalidationHandler(onMain([this] { lost(); }));
    // A request that cannot be delivered means that the connection ends, which is told there.
    daemon_ = std::make_unique<KVRemoteDaemon>(*connection_, onMain([this](const KVError& error) {
        if (error.code() != ENOTCONN) fail(error);
    }));
    connection_->resume();
    return true;
}

void Program::interrupted() {
    // The second signal ends the program at once, as if it had no handler. The first one is still pending.
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, SIGINT);
    sigaddset(&set, SIGTERM);
    const timespec atOnce{};
    while (::sigtimedwait(&set, nullptr, &atOnce) > 0) {
    }
    ::pthread_sigmask(SIG_UNBLOCK, &set, nullptr);
    if (interruptHandler_) return interruptHandler_();
    finish(kDone);
}

void Program::lost() {
    fail("the daemon went away", kNoDaemon);
}

void Program::finish(int status) {
    if (isFinished_) return;
    isFinished_ = true;
    status_ = status;
    mainQueue_.stop();
}

void Program::fail(const KVError& error) {
    if (isFinished_) return;
    if (line_.isJson) {
        answer("", Dictionary{{"error", error}});
    } else {
        const std::string text = error.localizedDescription();
        std::fprintf(stderr, "kelvoctl: %s (%s %lld)\n", text.empty() ? "the daemon refused" : text.c_str(),
                     error.domain().c_str(), static_cast<long long>(error.code()));
    }
    finish(kRefused);
}

void Program::fail(const std::string& why, int status) {
    if (isFinished_) return;
    if (line_.isJson) {
        answer("", Dictionary{{"error", Dictionary{{"description", why}}}});
    } else {
        std::fprintf(stderr, "kelvoctl: %s\n", why.c_str());
    }
    finish(status);
}

void Program::answer(const std::string& text, const Value& json) {
    const std::string line = line_.isJson ? jsonText(json) : text;
    if (std::printf("%s\n", line.c_str()) < 0 || std::fflush(stdout) != 0) finish(kRefused);
}

void Program::remark(const std::string& text) const {
    if (!line_.isJson) std::fprintf(stderr, "%s\n", text.c_str());
}

}  // namespace kelvo::ctl
