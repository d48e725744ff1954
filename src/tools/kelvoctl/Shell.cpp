#include "ipc/KVAlertProtocols.h"
#include "platform/SystemAlert.h"
#include "tools/kelvoctl/Commands.h"
#include "tools/kelvoctl/DaemonSocket.h"
#include "tools/kelvoctl/Keys.h"

#include <array>
#include <cctype>
#include <deque>

namespace kelvo::ctl {
namespace {

struct ShownAlert {
    std::int64_t identifier = 0;
    std::string header;
    std::string message;
    std::array<std::string, 3> buttons;  // in the order of the numbers with which alerts answer
};

constexpr std::array<std::string_view, 4> kResponseNames{"default", "alternate", "other", "cancelled"};

/// Calls of the daemon, handed to the main thread.
class AlertCalls : public KVAlertShellProtocol {
  public:
    AlertCalls(std::function<void(const ShownAlert&)> show, std::function<void(std::int64_t)> cancel)
        : show_(std::move(show)), cancel_(std::move(cancel)) {}

    void showAlert(std::int64_t identifier, const std::string& header, const std::string& message,
                   const std::string& defaultButton, const std::string& alternateButton,
                   const std::string& otherButton) override {
        show_({identifier, header, message, {defaultButton, alternateButton, otherButton}});
    }
    void cancelAlert(std::int64_t identifier) override { cancel_(identifier); }

  private:
    const std::function<void(const ShownAlert&)> show_;
    const std::function<void(std::int64_t)> cancel_;
};

/// Shows alerts one after the other, and answers them. Main thread.
class Shell {
  public:
    explicit Shell(Program& program) : program_(program) {}

    bool connect() {
        calls_ = std::make_shared<AlertCalls>(
            program_.onMain([this](const ShownAlert& alert) { show(alert); }),
            program_.onMain([this](std::int64_t identifier) { cancel(identifier); }));
        const auto connection =
            program_.open(alertSocket(program_.line().socket), interfaceOf<KVAlertShellProtocol>(),
                          std::make_shared<ProtocolDispatcher<KVAlertShellProtocol>>(calls_),
                          interfaceOf<KVAlertServiceProtocol>());
        if (!connection) return false;
        service_ = std::make_unique<RemoteAlertService>(*connection, program_.deliveryErrorHandler());
        return true;
    }

    void begin() {
        service_->registerAlertShell(program_.onMain([this](const OptionalError& error) {
            if (error) return refused(*error);
            program_.remark("showing alerts; Ctrl-C ends");
            if (!program_.line().answer)
                keys_ = std::make_unique<Keys>(program_.onMain([this](char key) { typed(key); }));
        }));
    }

  private:
    void refused(const KVError& error) {
        if (error.code() == EBUSY) return program_.fail("another shell shows the alerts", kRefused);
        program_.fail("the daemon does not take this program for the system shell", kRefused);
    }

    void show(const ShownAlert& alert) {
        waiting_.push_back(alert);
        if (waiting_.size() == 1) showFirst();
    }

    void showFirst() {
        while (!waiting_.empty()) {
            print(waiting_.front());
            if (!program_.line().answer) return;
            answer(*program_.line().answer);
        }
    }

    void print(const ShownAlert& alert) {
        std::string text = "\n" + alert.header + "\n" + alert.message + "\n";
        Array buttons;
        for (std::size_t i = 0; i < alert.buttons.size(); ++i) {
            buttons.emplace_back(alert.buttons[i]);
            if (!alert.buttons[i].empty())
                text += "  [" + std::string(kResponseNames[i].substr(0, 1)) + "] " + alert.buttons[i] + "\n";
        }
        program_.answer(text, Dictionary{{"alert", alert.identifier},
                                         {"header", alert.header},
                                         {"message", alert.message},
                                         {"buttons", buttons}});
    }

    /// The key of a button is its role's first letter. A button that is not shown cannot be pressed.
    void typed(char key) {
        if (waiting_.empty()) return;
        for (std::size_t i = 0; i < kResponseNames.size(); ++i) {
            if (std::tolower(static_cast<unsigned char>(key)) != kResponseNames[i].front()) continue;
            if (i < 3 && waiting_.front().buttons[i].empty()) return;
            answer(static_cast<SystemAlertResponse>(i));
            return showFirst();
        }
    }

    void answer(SystemAlertResponse response) {
        const ShownAlert alert = std::move(waiting_.front());
        waiting_.pop_front();
        const auto number = static_cast<std::size_t>(response);
        // A script that presses a button which this alert lacks has not agreed to anything.
        const bool isThere = number < 3 && !alert.buttons[number].empty();
        const auto counted = isThere ? response : SystemAlertResponse::cancelled;
        service_->alertDidEnd(alert.identifier, static_cast<std::int32_t>(counted));
        const std::string name(kResponseNames[static_cast<std::size_t>(counted)]);
        program_.answer("answered: " + (isThere ? alert.buttons[number] : name),
                        Dictionary{{"answered", alert.identifier}, {"response", name}});
    }

    void cancel(std::int64_t identifier) {
        const bool wasFirst = !waiting_.empty() && waiting_.front().identifier == identifier;
        if (std::erase_if(waiting_, [&](const auto& each) { return each.identifier == identifier; }) == 0)
            return;
        program_.answer("withdrawn", Dictionary{{"withdrawn", identifier}});
        if (wasFirst) showFirst();
    }

    Program& program_;
    std::shared_ptr<AlertCalls> calls_;
    std::unique_ptr<RemoteAlertService> service_;
    std::unique_ptr<Keys> keys_;
    std::deque<ShownAlert> waiting_;
};

}  // namespace

std::shared_ptr<void> beginShell(Program& program) {
    const auto shell = std::make_shared<Shell>(program);
    if (shell->connect()) shell->begin();
    return shell;
}

}  // namespace kelvo::ctl
