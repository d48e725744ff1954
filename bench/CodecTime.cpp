#include "CodecTime.h"

#include "base/Guarded.h"

#include <atomic>
#include <chrono>
#include <cstdint>
#include <ctime>
#include <filesystem>
#include <fstream>
#include <map>
#include <set>
#include <string>
#include <thread>

// The linker leads the calls of our libraries through the functions below (--wrap).
extern "C" {
#include <libavcodec/avcodec.h>
#include <libswresample/swresample.h>
}
#include <libyuv.h>

namespace kelvo::test {
namespace {

constexpr double kNanosecond = 1e-9;

std::atomic<std::int64_t> conversionNanoseconds{0};
std::atomic<std::int64_t> encodingNanoseconds{0};

/// The threads that each open encoder keeps for itself.
Guarded<std::map<const AVCodecContext*, std::set<std::string>>> encoderThreads;

std::int64_t threadNanoseconds() {
    timespec time{};
    ::clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return std::int64_t{time.tv_sec} * 1000000000 + time.tv_nsec;
}

/// Adds the calling thread's time in one scope.
class Stopwatch {
  public:
    explicit Stopwatch(std::atomic<std::int64_t>& total) : total_(total) {}
    ~Stopwatch() { total_ += threadNanoseconds() - begin_; }
    Stopwatch(const Stopwatch&) = delete;
    Stopwatch& operator=(const Stopwatch&) = delete;

  private:
    std::atomic<std::int64_t>& total_;
    const std::int64_t begin_ = threadNanoseconds();
};

std::set<std::string> threads() {
    std::set<std::string> found;
    for (const auto& entry : std::filesystem::directory_iterator("/proc/self/task"))
        found.insert(entry.path());
    return found;
}

std::int64_t nanosecondsOf(const std::string& thread) {
    std::int64_t nanoseconds = 0;
    std::ifstream(thread + "/schedstat") >> nanoseconds;
    return nanoseconds;
}

}  // namespace

CodecTime codecTime() {
    while (encoderThreads.with([](const auto& all) { return !all.empty(); }))
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    return {static_cast<double>(conversionNanoseconds) * kNanosecond,
            static_cast<double>(encodingNanoseconds) * kNanosecond};
}

double threadSeconds() {
    return static_cast<double>(threadNanoseconds()) * kNanosecond;
}

}  // namespace kelvo::test

// NOLINTBEGIN(bugprone-reserved-identifier,readability-identifier-naming): the linker's names
extern "C" {
using kelvo::test::conversionNanoseconds;
using kelvo::test::encoderThreads;
using kelvo::test::encodingNanoseconds;
using kelvo::test::Stopwatch;

int __real_avcodec_open2(AVCodecContext*, const AVCodec*, AVDictionary**);
int __wrap_avcodec_open2(AVCodecContext* context, const AVCodec* codec, AVDictionary** options) {
    const Stopwatch watch(encodingNanoseconds);
    const auto before = kelvo::test::threads();
    const int result = __real_avcodec_open2(context, codec, options);
    auto added = kelvo::test::threads();
    std::erase_if(added, [&](const auto& thread) { return before.contains(thread); });
    encoderThreads.with([&](auto& all) { all[context] = std::move(added); });
    return result;
}

void __real_avcodec_free_context(AVCodecContext**);
void __wrap_avcodec_free_context(AVCodecContext** context) {
    const AVCodecContext* const closed = *context;
    const auto threads = encoderThreads.with([&](auto& all) { return all[closed]; });
    for (const std::string& thread : threads)
        encodingNanoseconds += kelvo::test::nanosecondsOf(thread);
    {
        const Stopwatch watch(encodingNanoseconds);
        __real_avcodec_free_context(context);
    }
    encoderThreads.with([&](auto& all) { all.erase(closed); });
}

int __real_avcodec_send_frame(AVCodecContext*, const AVFrame*);
int __wrap_avcodec_send_frame(AVCodecContext* context, const AVFrame* frame) {
    const Stopwatch watch(encodingNanoseconds);
    return __real_avcodec_send_frame(context, frame);
}

int __real_avcodec_receive_packet(AVCodecContext*, AVPacket*);
int __wrap_avcodec_receive_packet(AVCodecContext* context, AVPacket* packet) {
    const Stopwatch watch(encodingNanoseconds);
    return __real_avcodec_receive_packet(context, packet);
}

int __real_swr_convert(SwrContext*, std::uint8_t**, int, const std::uint8_t**, int);
int __wrap_swr_convert(SwrContext* context, std::uint8_t** out, int room, const std::uint8_t** in,
                       int count) {
    const Stopwatch watch(conversionNanoseconds);
    return __real_swr_convert(context, out, room, in, count);
}

int __real_ARGBToI420(const std::uint8_t*, int, std::uint8_t*, int, std::uint8_t*, int, std::uint8_t*, int,
                      int, int);
int __wrap_ARGBToI420(const std::uint8_t* from, int stride, std::uint8_t* y, int strideY, std::uint8_t* u,
                      int strideU, std::uint8_t* v, int strideV, int width, int height) {
    const Stopwatch watch(conversionNanoseconds);
    return __real_ARGBToI420(from, stride, y, strideY, u, strideU, v, strideV, width, height);
}
}
// NOLINTEND(bugprone-reserved-identifier,readability-identifier-naming)
