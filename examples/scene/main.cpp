// Something worth recording: a moving scene over the whole screen, with a chime whenever the ball bounces.
#include "Chimes.h"
#include "Picture.h"

#include <chrono>
#include <cstdio>
#include <thread>

int main() {
    using namespace std::chrono;
    Display* const display = XOpenDisplay(nullptr);
    if (display == nullptr) return std::puts("no display"), 1;
    scene::Picture picture(display);
    const scene::Chimes chimes;
    const auto beginning = steady_clock::now();
    for (auto next = beginning;; next += microseconds(16'667)) {
        std::this_thread::sleep_until(next);
        picture.draw(duration<double>(steady_clock::now() - beginning).count());
        next = std::max(next, steady_clock::now() - microseconds(16'667));  // what was missed is not made up
    }
}
