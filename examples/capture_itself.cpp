// Captures its own window and sound, and prints once a second what came. Draws, so that there is something to
// see.
#include <X11/Xlib.h>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <kelvokit/KelvoKit.h>
#include <thread>

namespace {

constexpr unsigned kWidth = 540;
constexpr unsigned kHeight = 960;

/// A window whose colour changes sixty times a second.
class FlashingWindow {
  public:
    FlashingWindow() = default;
    ~FlashingWindow() {
        if (display_ != nullptr) XCloseDisplay(display_);
    }
    FlashingWindow(const FlashingWindow&) = delete;
    FlashingWindow& operator=(const FlashingWindow&) = delete;

    bool open() {
        display_ = XOpenDisplay(nullptr);
        if (display_ == nullptr) return false;
        window_ = XCreateSimpleWindow(display_, DefaultRootWindow(display_), 0, 0, kWidth, kHeight, 0, 0, 0);
        XMapWindow(display_, window_);
        XSync(display_, False);
        std::this_thread::sleep_for(std::chrono::seconds(1));  // until the window manager has put it in front
        return true;
    }
    std::uint32_t identifier() const { return static_cast<std::uint32_t>(window_); }
    void draw(unsigned picture) {
        XSetWindowBackground(display_, window_, picture * 0x010307U & 0xffffffU);
        XClearWindow(display_, window_);
        XFlush(display_);
    }

  private:
    Display* display_ = nullptr;
    Window window_ = 0;
};

struct Counts {
    std::atomic<int> frames{0};
    std::atomic<std::int64_t> heard{0};  ///< samples of the application's sound
    std::atomic<bool> isOver{false};
};

}  // namespace

int main(int count, char** arguments) {
    const int seconds = count > 1 ? std::atoi(arguments[1]) : 10;
    FlashingWindow window;
    if (!window.open()) return std::puts("no display"), 1;

    Counts counts;  // before the recorder, whose handlers use it
    kelvokit::Recorder recorder;
    recorder.onFrame([&](const kelvokit::Frame&) { ++counts.frames; });
    recorder.onAudio([&](const kelvokit::AudioBuffer& sound) { counts.heard += sound.frameCount(); });
    recorder.onStop([&](const auto&, const auto& error) {
        std::printf("the capture ended: %s\n", error ? error->description.c_str() : "");
        counts.isOver = true;
    });
    recorder.onConnectionLost([&](const kelvokit::Error& error) {
        std::printf("%s\n", error.description.c_str());
        counts.isOver = true;
    });
    recorder.startCapture({{window.identifier()}, kWidth, kHeight}, [&](const auto& error, bool, bool) {
        if (!error) return;
        std::printf("%s %s\n", error->description.c_str(), error->detail.c_str());
        counts.isOver = true;
    });
    for (int second = 0; second < seconds && !counts.isOver; ++second) {
        for (unsigned picture = 0; picture < 60 && !counts.isOver; ++picture) {
            window.draw(static_cast<unsigned>(second) * 60 + picture);
            std::this_thread::sleep_for(std::chrono::microseconds(16'667));
        }
        std::printf("%d frames, %lld samples of sound\n", counts.frames.exchange(0),
                    static_cast<long long>(counts.heard.exchange(0)));
    }
    const bool hasFailed = counts.isOver;
    recorder.stop();
    return hasFailed ? 1 : 0;
}
