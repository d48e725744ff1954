#pragma once

#include "ClientProcess.h"
#include "ipc/KVUserErrors.h"
#include "support/Eventually.h"
#include "support/SoundServer.h"
#include "support/TemporaryDirectory.h"
#include "support/media/MovieProbe.h"
#include "support/x11/WindowManager.h"
#include "support/x11/XvfbServer.h"
#include "system/kelvoctl/KelvoctlProcess.h"
#include "system/screen/CounterMovie.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

using namespace std::chrono_literals;
using testing::ElementsAre;
using testing::IsEmpty;
using StartAnswer = ClientProcess::StartAnswer;
using Wanted = ClientProcess::Wanted;

/// The real daemon on a root, a display with a window manager and, where it is started, a sound server of its
/// own.
class RecordingFixture : public testing::Test {
  protected:
    static constexpr int kWidth = 320;
    static constexpr int kHeight = 480;
    static constexpr const char* kShellBundle =
        R"({"identifier": "com.quillon.plinth", "executable": "program",
            "entitlements": {"com.quillon.private.kelvo-kit": true}})";

    void startDaemon() {
        // Its log goes to a file: a pipe that nobody reads would hold it up.
        daemon_ = std::make_unique<ChildProcess>(
            std::vector<std::string>{"sh", "-c", "exec \"$0\" --root \"$1\" --log stderr 2>>\"$2\"",
                                     KELVOD_PROGRAM, root_.path(), logPath()},
            std::map<std::string, std::string>{{"DBUS_SYSTEM_BUS_ADDRESS", "unix:path=/nonexistent"},
                                               {"DISPLAY", server_.display()}});
        ASSERT_TRUE(eventually([&] { return std::filesystem::exists(socket()); }, 20s)) << log();
    }

    std::string socket() const { return root_.path() + "/run/kelvod/com.quillon.kelvod"; }
    std::string logPath() const { return root_.path() + "/log"; }
    std::string log() const {
        std::ifstream file(logPath());
        return {std::istreambuf_iterator<char>(file), {}};
    }
    bool logs(const std::string& text) const {
        return eventually([&] { return log().find(text) != std::string::npos; }, 20s);
    }

    std::size_t timesLogged(const std::string& text) const {
        std::size_t times = 0;
        const std::string all = log();
        for (auto at = all.find(text); at != std::string::npos; at = all.find(text, at + 1))
            ++times;
        return times;
    }
    /// How often a client's view of the state was to be brought up to date; to most clients that is a line of
    /// the log.
    std::size_t stateUpdates() const { return timesLogged("ClientProxy:updateScreenRecordingState"); }
    /// How often the user was asked, or would have been but for an exemption.
    std::size_t askedTimes() const { return timesLogged("KVRecordingManager:showAcknowledgementAlert"); }

    /// The system's shell, which may record the whole screen.
    std::unique_ptr<ClientProcess> shell() const {
        return std::make_unique<ClientProcess>(root_.path() + "/Applications/plinth", kShellBundle, socket(),
                                               server_.display(), std::nullopt);
    }
    /// An application with a window, in front once this returns.
    std::unique_ptr<ClientProcess> application(const std::string& name = "First",
                                               const XClient::Place& place = {0, 0, kWidth, kHeight}) const {
        auto made = startApplication(name, place);
        EXPECT_TRUE(eventually([&] { return isInFront(*made); }, 20s)) << name;
        return made;
    }
    std::unique_ptr<ClientProcess> startApplication(const std::string& name,
                                                    const XClient::Place& place) const {
        return std::make_unique<ClientProcess>(
            root_.path() + "/Applications/" + name,
            R"({"identifier": "com.example.)" + name + R"(", "displayName": ")" + name + "\"}", socket(),
            server_.display(), place);
    }
    bool isInFront(const ClientProcess& client) const {
        return outputOf("DISPLAY=" + server_.display() + " xdotool getactivewindow 2>/dev/null") ==
               std::to_string(client.window()) + "\n";
    }
    /// Puts a window beside another one, whatever place the window manager had for it.
    void placeBeside(const ClientProcess& client, const XClient::Place& place) const {
        XClient mover(server_.display());
        mover.place(client.window(), place);
        EXPECT_TRUE(eventually(
            [&] {
                const std::string told =
                    outputOf("DISPLAY=" + server_.display() + " xdotool getwindowgeometry --shell " +
                             std::to_string(client.window()) + " | grep ^X= | cut -c3-");
                return std::abs(std::atoi(told.c_str()) - place.x) < 8;
            },
            20s));
    }
    /// Somebody who answers every alert with this button.
    std::unique_ptr<KelvoctlProcess> user(const std::string& answer) const {
        auto made = std::make_unique<KelvoctlProcess>(socket(),
                                                      std::vector<std::string>{"shell", "--answer", answer});
        EXPECT_TRUE(made->waitForLine("showing alerts")) << made->output();
        return made;
    }

    static std::vector<std::string> moviesIn(const std::string& folder) {
        std::vector<std::string> found;
        std::error_code ignored;
        for (const auto& entry : std::filesystem::directory_iterator(folder, ignored))
            if (entry.path().extension() == ".mp4") found.push_back(entry.path());
        return found;
    }
    std::string storePath() const { return root_.path() + "/private/var/mobile/Library/KelvoKit"; }
    std::vector<std::string> store() const { return moviesIn(storePath()); }
    std::vector<std::string> library() const {
        return moviesIn(root_.path() + "/private/var/mobile/Media/Videos/Screen Recordings");
    }
    bool storeGetsEmpty() const {
        return eventually([&] { return store().empty(); }, 20s);
    }

    /// How many different numbers of the counter stand in the movie, in their order.
    static std::size_t countedIn(const std::string& movie) {
        EXPECT_EQ(decodingComplaints(movie), "") << movie;
        std::size_t count = 0;
        std::uint32_t last = 0;
        for (const CounterFrame& frame : readCounterMovie(movie)) {
            if (!frame.number) continue;
            EXPECT_GE(*frame.number, last) << "out of order";
            if (*frame.number > last) ++count;
            last = *frame.number;
        }
        return count;
    }
    static double secondsOf(const std::string& movie) {
        return std::strtod(probeFormat(movie, "duration").c_str(), nullptr);
    }
    static std::vector<std::int64_t> stopCodes(const ClientProcess& client) {
        std::vector<std::int64_t> codes;
        for (const auto& stop : client.told().stops.copy())
            codes.push_back(stop.error ? stop.error->code() : 0);
        return codes;
    }

    static Wanted wholeScreen() { return {{}, false, false, true, false}; }
    static Wanted ownWindow(const ClientProcess& client) {
        return {{client.window()}, false, false, false, false};
    }
    /// Starts what is refused with `code` and leaves everything as it was: nothing records, nothing is
    /// stored, nobody is told, but for `updates` of the client's view of the state. Every error but that of a
    /// broadcast without a set-up has a text for the user.
    void expectRefusal(const ClientProcess& client, const Wanted& wanted, std::int64_t code,
                       std::size_t updates) const {
        const auto stored = store();
        const auto saved = library();
        const auto messages = client.told().messages();
        const std::size_t updatesBefore = stateUpdates();
        ASSERT_EQ(client.start(wanted), (StartAnswer{code, false, false})) << log();
        ASSERT_TRUE(client.startError());
        EXPECT_EQ(client.startError()->domain(), KVRecordingErrorDomain);
        EXPECT_EQ(client.startError()->localizedDescription().empty(), code == -5808);
        EXPECT_EQ(client.flag("isRecording"), false);
        // The answer comes before the update; the question after both.
        EXPECT_TRUE(eventually([&] { return stateUpdates() >= updatesBefore + updates; }, 20s)) << code;
        EXPECT_EQ(stateUpdates(), updatesBefore + updates) << code;
        EXPECT_EQ(store(), stored);
        EXPECT_EQ(library(), saved);
        EXPECT_EQ(client.told().messages(), messages);
    }
    void expectNothingKept() const {
        EXPECT_TRUE(storeGetsEmpty()) << log();
        EXPECT_THAT(library(), IsEmpty());
    }

    static void pass(std::chrono::milliseconds time) { std::this_thread::sleep_for(time); }

    const TemporaryDirectory root_;
    XvfbServer server_{kWidth, kHeight};
    WindowManager manager_{server_.display()};
    std::unique_ptr<ChildProcess> daemon_;
};

}  // namespace kelvo::test
