#pragma once

#include "support/ChildProcess.h"
#include "support/Eventually.h"
#include "support/SoundServer.h"
#include "support/TemporaryDirectory.h"
#include "support/x11/WindowManager.h"
#include "support/x11/XvfbServer.h"

#include <filesystem>
#include <fstream>
#include <iterator>
#include <memory>
#include <string>
#include <vector>

namespace kelvo::test {

/// The daemon as its own process on a device of the test's own: a root, a screen with a window manager and a
/// sound server. The daemon's log goes to a file, which no test has to empty.
class DaemonWorld {
  public:
    static constexpr int kWidth = 270;
    static constexpr int kHeight = 480;

    DaemonWorld() {
        isSoundThere_ = sound_.start();
        startDaemon();
    }

    /// Whether everything came up.
    bool isUp() const { return isSoundThere_ && windowManager_.isReady() && isListening_; }

    const std::string& root() const { return root_.path(); }
    const std::string& socket() const { return socket_; }
    const std::string& display() const { return screen_.display(); }
    void loseScreen() { screen_.kill(); }
    SoundServer& sound() { return sound_; }
    ChildProcess& daemon() { return *daemon_; }

    /// Starts the daemon, again when it ran, and waits for its socket.
    void startDaemon() {
        daemon_.reset();
        std::error_code ignored;
        std::filesystem::remove(socket_, ignored);
        daemon_ = std::make_unique<ChildProcess>(
            std::vector<std::string>{"sh", "-c", R"(exec "$0" --root "$1" --log stderr 2>>"$1/log")",
                                     KELVOD_PROGRAM, root()},
            std::map<std::string, std::string>{{"DISPLAY", display()},
                                               {"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"},
                                               {"KELVO_SOCKET", ""}});
        isListening_ = eventually([this] { return std::filesystem::exists(socket_); });
    }

    std::string log() const {
        std::ifstream file(root() + "/log");
        return {std::istreambuf_iterator<char>(file), {}};
    }
    bool waitForLog(const std::string& text) const {
        return eventually([&] { return log().find(text) != std::string::npos; }, std::chrono::seconds(20));
    }

    /// The paths of the movies that were saved, and of those that lie in the store.
    std::vector<std::string> library() const { return movies(libraryPath()); }
    std::vector<std::string> store() const { return movies(storePath()); }
    std::string libraryPath() const { return root() + "/private/var/mobile/Media/Videos/Screen Recordings"; }
    std::string storePath() const { return root() + "/private/var/mobile/Library/KelvoKit"; }

  private:
    static std::vector<std::string> movies(const std::string& folder) {
        std::vector<std::string> found;
        std::error_code ignored;
        for (const auto& item : std::filesystem::directory_iterator(folder, ignored)) {
            if (item.path().extension() == ".mp4") found.push_back(item.path().string());
        }
        return found;
    }

    const TemporaryDirectory root_;
    const std::string socket_ = root_.path() + "/run/kelvod/com.quillon.kelvod";
    XvfbServer screen_{kWidth, kHeight};
    const WindowManager windowManager_{screen_.display()};
    SoundServer sound_;
    std::unique_ptr<ChildProcess> daemon_;
    bool isSoundThere_ = false;
    bool isListening_ = false;
};

}  // namespace kelvo::test
