#include "tools/kelvoctl/DaemonSocket.h"

#include "platform/linux/ipc/UsualSocket.h"

namespace kelvo::ctl {

std::string daemonSocket(const std::string& given) {
    return given.empty() ? usualDaemonSocket() : given;
}

std::string alertSocket(const std::string& given) {
    return daemonSocket(given) + ".alerts";
}

std::string librarySocket(const std::string& given) {
    return daemonSocket(given) + ".library";
}

std::string howToStart() {
    return "Start it with `kelvod --root DIR` and give --socket DIR/run/kelvod/com.quillon.kelvod (or set "
           "KELVO_SOCKET),\nor `systemctl --user start kelvod.socket` where it is installed.";
}

}  // namespace kelvo::ctl
