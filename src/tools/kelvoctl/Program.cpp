#include "tools/kelvoctl/Program.h"

#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVUserErrors.h"
#include "tools/kelvoctl/Commands.h"
#include "tools/kelvoctl/DaemonSocket.h"
#include "tools/kelvoctl/JsonText.h"

#include <csignal>
#include <cstdio>

namespace kelvo::ctl {
namespace {

/// The daemon's own words for it do not say that it was started where there is no display.
constexpr const char* kNoDisplayHint =
    "the daemon has no display, or lost it. Where systemd runs it: `systemctl --user import-environment "
    "DISPLAY "
    "XAUTHORITY`, then `systemctl --user restart kelvod`; else start it where DISPLAY is set. Its log says "
    "what "
    "is missing.";

bool isAboutTheDisplay(const KVError& error) {
    return error.domain() == KVRecordingErrorDomain && error.code() == kRecordingErrorMediaServicesFailed;
}

}  // namespace

Program::~Program() {
    if (!connection_) return;
    connection_->setInvalidationHandler(nullptr);
    connection_->invalidate();
}

int Program::run(TerminationSignals& signals) {
    const bool hasSocketOfItsOwn = line_.command == Command::shell || line_.command == Command::library;
    if (!hasSocketOfItsOwn && !connect()) return status_;
    signals.watch([this] { mainQueue_.async([this] { interrupted(); }); });
    command_ = beginCommand(*this);
    if (!isFinished_) mainQueue_.run();
    return status_;
}

IPCConnectionRef Program::open(const std::string& path, std::shared_ptr<const IPCInterface> exported,
                               std::shared_ptr<IPCExportedObject> object,
                               std::shared_ptr<const IPCInterface> remote) {
    const auto made = transport_.connectToSocket(path);
    if (!made) {
        fail("no daemon answers: " + made.error().localizedDescription() + "\n" + howToStart(), kNoDaemon);
        return nullptr;
    }
    connection_ = *made;
    connection_->setExported(std::move(exported), std::move(object));
    connection_->setRemoteInterface(std::move(remote));
    connection_->setInvalidationHandler(onMain([this] { lost(); }));
    connection_->resume();
    return connection_;
}

/// A request that cannot be delivered because the connection ended is told there.
std::function<void(const KVError&)> Program::deliveryErrorHandler() {
    return onMain([this](const KVError& error) {
        if (error.code() != ENOTCONN) fail(error);
    });
}

bool Program::connect() {
    callbacks_ = std::make_shared<Callbacks>([this](const std::string& name, const Dictionary& arguments) {
        mainQueue_.async([this, name, arguments] {
            if (callbackHandler_) callbackHandler_(name, arguments);
        });
    });
    if (!open(daemonSocket(line_.socket), interfaceOf<KVClientProtocol>(),
              std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks_),
              interfaceOf<KVDaemonProtocol>()))
        return false;
    daemon_ = std::make_unique<KVRemoteDaemon>(*connection_, deliveryErrorHandler());
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
        if (isAboutTheDisplay(error)) remark(kNoDisplayHint);
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
