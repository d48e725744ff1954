#include "support/x11/XClient.h"

#include <chrono>
#include <cinttypes>
#include <condition_variable>
#include <cstdio>
#include <cstdlib>
#include <mutex>
#include <pulse/simple.h>
#include <queue>
#include <span>
#include <thread>
#include <vector>

namespace {

using namespace std::chrono_literals;
using Time = std::chrono::steady_clock::time_point;

constexpr int kRate = 44100;
constexpr auto kLength = 60ms;  // of a beep, and of a flash
constexpr auto kBlock = 10ms;

std::int64_t inNanoseconds(Time time) {
    return std::chrono::nanoseconds(time.time_since_epoch()).count();
}

/// The moments at which the sound server will let beeps be heard.
class Moments {
  public:
    void put(Time moment) {
        const std::lock_guard lock(mutex_);
        moments_.push(moment);
        comes_.notify_one();
    }
    Time take() {
        std::unique_lock lock(mutex_);
        comes_.wait(lock, [this] { return !moments_.empty(); });
        const Time moment = moments_.front();
        moments_.pop();
        return moment;
    }

  private:
    std::mutex mutex_;
    std::condition_variable comes_;
    std::queue<Time> moments_;
};

class Beeper {
  public:
    Beeper() {
        const pa_sample_spec spec{PA_SAMPLE_S16NE, kRate, 1};
        constexpr auto kWhatever = static_cast<std::uint32_t>(-1);
        const pa_buffer_attr attributes{kWhatever, kRate / 5, kWhatever, kWhatever, kWhatever};
        player_ = pa_simple_new(nullptr, "flash", PA_STREAM_PLAYBACK, nullptr, "beep", &spec, nullptr,
                                &attributes, nullptr);
    }

    bool isConnected() const { return player_ != nullptr; }

    /// Beeps once every `interval`, and says ahead when. Returns when the server is gone.
    void run(std::chrono::milliseconds interval, Moments& moments) {
        Time next = std::chrono::steady_clock::now() + 500ms;
        for (int number = 0;; ++number) {
            while (std::chrono::steady_clock::now() < next)
                if (!write(kBlock, 0)) return;
            const Time begin = heardNext();
            moments.put(begin);
            if (!write(kLength, 20000)) return;
            // The server has changed its mind when this is not the same: it ran dry in between.
            const Time again = heardNext() - kLength;
            std::fprintf(stderr, "beep %d %" PRId64 " %" PRId64 "\n", number, inNanoseconds(begin),
                         inNanoseconds(again));
            next += interval;
        }
    }

  private:
    /// When what is written next will be heard.
    Time heardNext() {
        int error = 0;
        const pa_usec_t latency = pa_simple_get_latency(player_, &error);
        return std::chrono::steady_clock::now() + std::chrono::microseconds(latency);
    }

    bool write(std::chrono::milliseconds length, std::int16_t loudness) {
        std::vector<std::int16_t> samples(static_cast<std::size_t>(kRate * length.count() / 1000));
        for (std::size_t i = 0; i < samples.size(); ++i)
            samples[i] = (i / 22) % 2 == 0 ? loudness : static_cast<std::int16_t>(-loudness);
        int error = 0;
        return pa_simple_write(player_, samples.data(), samples.size() * sizeof(std::int16_t), &error) >= 0;
    }

    pa_simple* player_ = nullptr;
};

void flashForEver(const char* display, int width, int height, Moments& moments) {
    kelvo::test::XClient client(display);
    const auto window = client.createWindow({0, 0, width, height}, 0, true);
    client.movePointer(0, 0);
    // Without a window manager the focus says whose sound is recorded.
    xcb_set_input_focus(client.raw(), XCB_INPUT_FOCUS_PARENT, window, XCB_CURRENT_TIME);
    for (int number = 0;; ++number) {
        const Time moment = moments.take();
        std::this_thread::sleep_until(moment);
        const Time begun = std::chrono::steady_clock::now();
        client.fill(window, {0, 0, width, height}, 0xFFFFFF);
        const Time done = std::chrono::steady_clock::now();
        std::this_thread::sleep_until(moment + kLength);
        client.fill(window, {0, 0, width, height}, 0);
        std::fprintf(stderr, "flash %d %" PRId64 " %" PRId64 "\n", number, inNanoseconds(begun),
                     inNanoseconds(done));
    }
}

}  // namespace

/// flash_program DISPLAY WIDTH HEIGHT MILLISECONDS: lets the screen flash, and beeps at the same instant,
/// once every so often until it is killed or the sound server is. Standard error tells of each beep when the
/// server said that it would be heard, before and after it was written, and of each flash between which times
/// of the host's monotonic clock it was drawn.
int main(int argumentCount, char** arguments) {
    const std::span<char*> all(arguments, static_cast<std::size_t>(argumentCount));
    if (all.size() != 5) return 2;
    Beeper beeper;
    if (!beeper.isConnected()) return 1;
    Moments moments;
    std::thread([&] { flashForEver(all[1], std::atoi(all[2]), std::atoi(all[3]), moments); }).detach();
    std::fputs("ready\n", stderr);
    beeper.run(std::chrono::milliseconds(std::atoi(all[4])), moments);
    std::fputs("silent\n", stderr);
    std::quick_exit(0);
}
