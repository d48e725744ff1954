#include <X11/Xlib.h>
#include <chrono>
#include <cstdio>
#include <future>
#include <kelvokit/KelvoKit.h>
#include <string>
#include <thread>

int main() {
    Display* const display = XOpenDisplay(nullptr);
    if (display == nullptr) return std::puts("no display"), 1;
    const Window window =
        XCreateSimpleWindow(display, DefaultRootWindow(display), 0, 0, 540, 960, 0, 0, 0xff8800);
    XMapWindow(display, window);
    XSync(display, False);
    std::this_thread::sleep_for(std::chrono::seconds(1));  // until the window manager has put it in front

    kelvokit::Recorder recorder;
    std::promise<std::string> outcome;
    recorder.start({{static_cast<std::uint32_t>(window)}, 540, 960}, [&](const auto& error, bool, bool) {
        if (error) return outcome.set_value(error->description + " " + error->detail);
        std::this_thread::sleep_for(std::chrono::seconds(5));
        recorder.stop([&](const auto& movie, const auto& failure) {
            outcome.set_value(failure ? failure->description : movie.value_or("no movie"));
        });
    });
    std::puts(outcome.get_future().get().c_str());
    XCloseDisplay(display);
}
