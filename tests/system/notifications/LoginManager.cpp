#include "LoginManager.h"

namespace kelvo::test {

LoginManager::LoginManager(const std::string& folder)
    : address_("unix:path=" + folder + "/bus"),
      bus_({"dbus-daemon", "--session", "--nofork", "--nopidfile", "--address=" + address_,
            "--print-address=2"}) {
    if (!bus_.waitForLine("unix:")) return;
    manager_.emplace(
        std::vector<std::string>{"/usr/bin/python3", "-m", "dbusmock", "--system", "--template", "logind"},
        std::map<std::string, std::string>{{"DBUS_SYSTEM_BUS_ADDRESS", address_}});
    isRunning_ =
        waitUntilItAnswers() && send("/org/freedesktop/login1", "org.freedesktop.DBus.Mock.AddSession",
                                     "string:c1 string:seat0 uint32:1000 string:user boolean:true");
}

bool LoginManager::setLocked(bool isLocked) const {
    return send("/org/freedesktop/login1/session/c1", "org.freedesktop.login1.Session.SetLockedHint",
                isLocked ? "boolean:true" : "boolean:false");
}

bool LoginManager::waitUntilItAnswers() const {
    for (int attempt = 0; attempt < 200; ++attempt) {
        if (send("/org/freedesktop/login1", "org.freedesktop.login1.Manager.CanReboot", "")) return true;
        ChildProcess({"sleep", "0.1"}).waitForExit();
    }
    return false;
}

bool LoginManager::send(const std::string& path, const std::string& method,
                        const std::string& arguments) const {
    std::string line = "dbus-send --bus=" + address_ + " --print-reply --reply-timeout=2000";
    line += " --dest=org.freedesktop.login1 " + path + " " + method + " " + arguments + " >/dev/null 2>&1";
    return ChildProcess({"sh", "-c", line}).waitForExit() == 0;
}

}  // namespace kelvo::test
