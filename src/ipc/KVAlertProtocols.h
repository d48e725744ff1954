#pragma once

#include "ipc/ProtocolTable.h"

#include <cstdint>
#include <string>

namespace kelvo {

/// The socket of the alerts' service beside the daemon's.
inline constexpr std::string_view kAlertServiceName = "com.quillon.kelvod.alerts";

/// What a shell that shows alerts says to the daemon.
class KVAlertServiceProtocol {
  public:
    virtual ~KVAlertServiceProtocol() = default;

    /// From now on this connection's process shows the alerts, until the connection ends. Refused to a client
    /// without the right "com.quillon.private.kelvo-kit" (EPERM) and while another shell does it (EBUSY).
    virtual void registerAlertShell(ErrorHandler handler) = 0;
    /// How an alert ended, in the numbers of `SystemAlertResponse`. One that is unknown, or has ended
    /// already, is passed over; any other number counts as cancelled.
    virtual void alertDidEnd(std::int64_t identifier, std::int32_t response) = 0;
};

template <>
struct ProtocolTable<KVAlertServiceProtocol> {
    using P = KVAlertServiceProtocol;
    static constexpr std::string_view kName = "com.quillon.KelvoKit.KVAlertServiceProtocol";
    static constexpr std::tuple kMessages{
        Message<&P::registerAlertShell>{
            {"registerAlertShell",
             "From now on this connection's process shows the alerts. Needs the right "
             "com.quillon.private.kelvo-kit."},
            {},
            {Named{"error", "none; or EPERM without the right, EBUSY while another shell shows them"}}},
        Message<&P::alertDidEnd>{
            {"alertDidEnd", "An alert was answered."},
            {Named{"identifier", "the alert's number"},
             Named{"response", "0 default, 1 alternate, 2 other; any other: cancelled"}}},
    };
};

/// What the daemon says to that shell. Buttons without a title are not shown.
class KVAlertShellProtocol {
  public:
    virtual ~KVAlertShellProtocol() = default;

    virtual void showAlert(std::int64_t identifier, const std::string& header, const std::string& message,
                           const std::string& defaultButton, const std::string& alternateButton,
                           const std::string& otherButton) = 0;
    /// The alert is no longer wanted; its answer would not count.
    virtual void cancelAlert(std::int64_t identifier) = 0;
};

template <>
struct ProtocolTable<KVAlertShellProtocol> {
    using P = KVAlertShellProtocol;
    static constexpr std::string_view kName = "com.quillon.KelvoKit.KVAlertShellProtocol";
    static constexpr std::tuple kMessages{
        Message<&P::showAlert>{{"showAlert", "Show an alert. Buttons without a title are not shown."},
                               {
                                   Named{"identifier", "the alert's number, for the answer"},
                                   Named{"header", "the title"},
                                   Named{"message", "the text below it"},
                                   Named{"defaultButton", "title of the button that answers 0"},
                                   Named{"alternateButton", "title of the button that answers 1"},
                                   Named{"otherButton", "title of the button that answers 2"},
                               }},
        Message<&P::cancelAlert>{{"cancelAlert", "The alert is no longer wanted."},
                                 {Named{"identifier", "the alert's number"}}},
    };
};

/// Either side as the other one sees it. Thread-safe.
class RemoteAlertService : public KVAlertServiceProtocol {
  public:
    using P = KVAlertServiceProtocol;
    RemoteAlertService(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : sender_(connection, std::move(errorHandler)) {}

    void registerAlertShell(ErrorHandler handler) override { sender_.send<&P::registerAlertShell>(handler); }
    void alertDidEnd(std::int64_t identifier, std::int32_t response) override {
        sender_.send<&P::alertDidEnd>(identifier, response);
    }

  private:
    const RemoteSender sender_;
};

class RemoteAlertShell : public KVAlertShellProtocol {
  public:
    using P = KVAlertShellProtocol;
    RemoteAlertShell(IPCConnection& connection, std::function<void(const KVError&)> errorHandler)
        : sender_(connection, std::move(errorHandler)) {}

    void showAlert(std::int64_t identifier, const std::string& header, const std::string& message,
                   const std::string& defaultButton, const std::string& alternateButton,
                   const std::string& otherButton) override {
        sender_.send<&P::showAlert>(identifier, header, message, defaultButton, alternateButton, otherButton);
    }
    void cancelAlert(std::int64_t identifier) override { sender_.send<&P::cancelAlert>(identifier); }

  private:
    const RemoteSender sender_;
};

}  // namespace kelvo
