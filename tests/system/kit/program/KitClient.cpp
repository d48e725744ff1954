// An application as a test wants it: a window that is painted all the time, recorded or captured through
// KelvoKit. Says on standard error what happens, line by line.
//
//   kit_client record|capture
#include "support/x11/XClient.h"

#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <kelvokit/KelvoKit.h>
#include <thread>

namespace {

constexpr int kWidth = 200;
constexpr int kHeight = 300;

/// Asks for a recording until it is granted: the window is not in front at once.
class Client {
  public:
    Client(bool isCapture, std::uint32_t window)
        : isCapture_(isCapture), options_{{window}, kWidth, kHeight, false, false} {
        recorder_.onFrame([this](const kelvokit::Frame& frame) {
            static_cast<void>(frame.pixels().front());
            if (++frames_ % 10 == 0) std::fprintf(stderr, "%s %d\n", name_.load(), frames_.load());
        });
        recorder_.onStop([](const auto&, const auto& error) {
            std::fprintf(stderr, "ended %lld\n", error ? static_cast<long long>(error->code) : 0);
        });
        recorder_.onConnectionLost([](const kelvokit::Error& error) {
            std::fprintf(stderr, "lost %lld\n", static_cast<long long>(error.code));
        });
        recorder_.onConnectionRestored([this] {
            std::fprintf(stderr, "restored\n");
            name_ = "frames again";
            frames_ = 0;
            isWanted_ = true;
        });
    }

    /// Called again and again.
    void askIfWanted() {
        if (!isWanted_.exchange(false)) return;
        std::fprintf(stderr, "asking\n");
        const auto answered = [this](const auto& error, bool, bool) {
            if (!error) {
                std::fprintf(stderr, "started\n");
                return;
            }
            std::fprintf(stderr, "refused %lld\n", static_cast<long long>(error->code));
            isWanted_ = error->is(kelvokit::ErrorCode::failedToStart);
        };
        if (isCapture_) {
            recorder_.startCapture(options_, answered);
        } else {
            recorder_.start(options_, answered);
        }
    }

  private:
    const bool isCapture_;
    const kelvokit::RecordingOptions options_;
    std::atomic<bool> isWanted_ = true;
    std::atomic<const char*> name_ = "frames";
    std::atomic<int> frames_ = 0;
    kelvokit::Recorder recorder_;  // goes first: its handlers use the rest
};

}  // namespace

int main(int count, char** arguments) {
    if (count != 2) return 2;
    const char* const display = std::getenv("DISPLAY");  // NOLINT(concurrency-mt-unsafe)
    kelvo::test::XClient screen(display != nullptr ? display : "");
    const xcb_window_t window = screen.createWindow({0, 0, kWidth, kHeight}, 0x2060a0, true);
    Client client(std::strcmp(arguments[1], "capture") == 0, window);
    for (std::uint32_t picture = 0;; ++picture) {
        screen.fill(window, {0, 0, kWidth, kHeight}, picture * 0x010307U & 0xffffffU);
        if (picture % 10 == 0) client.askIfWanted();
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
}
