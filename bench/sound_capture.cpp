// What the microphone and a tap together cost, against the sound server's own work in the same seconds, and
// what they allocate for each buffer. Starts a PulseAudio of its own, in which one process plays and one
// speaks.
#include "media/KVCaptureManager.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "platform/linux/system/SystemClock.h"
#include "support/SoundServer.h"

#include <atomic>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <new>
#include <pthread.h>
#include <string_view>
#include <thread>
#include <unistd.h>

namespace {

std::atomic<bool> countsAllocations{false};
std::atomic<long> allAllocations{0};
std::atomic<long> audioThreadAllocations{0};

/// libpulse's thread, on which sound comes in.
bool isAudioThread() {
    thread_local const bool isIt = [] {
        char name[16] = {};
        ::pthread_getname_np(::pthread_self(), name, sizeof(name));
        return std::string_view(name) == "kelvo.pulse";
    }();
    return isIt;
}

}  // namespace

[[gnu::noinline]] void* operator new(std::size_t size) {
    if (countsAllocations) {
        ++allAllocations;
        if (isAudioThread()) ++audioThreadAllocations;
    }
    if (void* memory = std::malloc(size)) return memory;
    std::abort();
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
    std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

namespace kelvo {
namespace {

constexpr std::int32_t kProcess = 5000001;
constexpr int kSeconds = 20;

double seconds(clockid_t clock) {
    timespec time{};
    ::clock_gettime(clock, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) / 1e9;
}

/// Processor seconds that another process has used.
double processorTime(pid_t process) {
    clockid_t clock{};
    return ::clock_getcpuclockid(process, &clock) == 0 ? seconds(clock) : 0;
}

/// Percent of a core that this process and the server use for a while.
struct Load {
    double own;
    double server;
};
Load measure(pid_t server) {
    const double begin = seconds(CLOCK_MONOTONIC);
    const double own = seconds(CLOCK_PROCESS_CPUTIME_ID);
    const double others = processorTime(server);
    std::this_thread::sleep_for(std::chrono::seconds(kSeconds));
    const double elapsed = seconds(CLOCK_MONOTONIC) - begin;
    return {100 * (seconds(CLOCK_PROCESS_CPUTIME_ID) - own) / elapsed,
            100 * (processorTime(server) - others) / elapsed};
}

int run() {
    test::SoundServer server;
    if (!server.start()) return std::fputs("sound_capture: pulseaudio does not start\n", stderr), 1;
    const auto player = server.play(440, "speaker", kProcess);
    const auto voice = server.play(1000, "micfeed");
    std::this_thread::sleep_for(std::chrono::seconds(1));
    const Load idle = measure(server.processIdentifier());

    Platform platform;
    platform.clock = std::make_shared<SystemClock>();
    platform.audio = std::make_shared<pulse::PulseAudioService>(platform.clock);
    const auto manager = KVCaptureManager::create(platform);
    std::atomic<long> buffers{0};
    const auto output = [&](const SampleBufferRef&) { ++buffers; };
    manager->setCaptureStartTime(MediaTime::make(0, 1));
    manager->startMicrophoneCaptureWithOutput(output, nullptr);
    manager->startAppAudioCaptureForProcessID(kProcess, output, nullptr);
    std::this_thread::sleep_for(std::chrono::seconds(3));
    buffers = 0;
    countsAllocations = true;
    const Load capturing = measure(server.processIdentifier());
    countsAllocations = false;
    const long count = buffers;
    manager->stopAllCapture();

    std::printf("PulseAudio: %.2f %% of a core without capture, %.2f %% with it\n", idle.server,
                capturing.server);
    std::printf("microphone and tap: %.2f %% of a core (bound 1.5), %.2f of PulseAudio's own\n",
                capturing.own, capturing.own / capturing.server);
    std::printf(
        "%ld buffers in %d s; allocations of ours on the audio thread: %ld (bound 0); elsewhere %.1f a "
        "buffer\n",
        count, kSeconds, audioThreadAllocations.load(),
        static_cast<double>(allAllocations - audioThreadAllocations) / static_cast<double>(count));
    return count > 0 && capturing.own <= 1.5 && audioThreadAllocations == 0 ? 0 : 1;
}

}  // namespace
}  // namespace kelvo

int main() {
    return kelvo::run();
}
