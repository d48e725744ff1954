// What it costs to hand a captured frame to an application, and how soon the application has it: the daemon's
// side of a capture in this process, an application with KelvoKit in another one, 1080x1920 at 60 frames a
// second. Beside it, with the same rhythm, the least that two processes can do: one small datagram there and
// one back.
#include "ProcessorTime.h"
#include "base/KVLog.h"
#include "base/VideoSurfacePool.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVClientProxy.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/OpenDoor.h"
#include "support/TemporaryDirectory.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <functional>
#include <future>
#include <kelvokit/KelvoKit.h>
#include <sys/socket.h>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using namespace kelvo;
using Clock = std::chrono::steady_clock;

constexpr std::chrono::nanoseconds kInterval{16'666'667};
/// Ten times as often: shows how much of the cost is waking up sleeping threads and cold caches.
constexpr std::chrono::nanoseconds kShortInterval = kInterval / 10;
constexpr int kWarmUp = 60;
constexpr int kFrames = 300;
constexpr int kSpare = 60;
/// What waking up costs changes within a minute on a machine that others share.
constexpr int kTurns = 5;
constexpr double kBoundMicroseconds = 60;
constexpr double kBoundMilliseconds = 2;

std::int64_t now() {
    return Clock::now().time_since_epoch().count();
}

/// What one side saw; goes through a pipe as it is.
struct Report {
    double processor = 0;  ///< microseconds a frame
    double median = 0;     ///< milliseconds from one side to the other
    double late = 0;       ///< the 99th percentile of it
    int frames = 0;
};

/// Gathers the frames behind the first ones.
class Meter {
  public:
    void frame(std::int64_t sentAt) {
        const std::int64_t age = now() - sentAt;
        if (++seen_ == kWarmUp) startedAt_ = test::processorSeconds();
        if (seen_ > kWarmUp && seen_ <= kWarmUp + kFrames) ages_.push_back(age);
        if (seen_ == kWarmUp + kFrames) processor_ = test::processorSeconds() - startedAt_;
    }
    bool isDone() const { return seen_ >= kWarmUp + kFrames; }
    Report report() {
        std::ranges::sort(ages_);
        const auto at = [&](double part) {
            return static_cast<double>(ages_[static_cast<std::size_t>(part * (kFrames - 1))]) / 1e6;
        };
        return {processor_ / kFrames * 1e6, at(0.5), at(0.99), kFrames};
    }

  private:
    std::atomic<int> seen_ = 0;
    double startedAt_ = 0;
    double processor_ = 0;
    std::vector<std::int64_t> ages_;
};

/// Runs `frame` at every `interval`; the processor time of each after the first ones, in microseconds.
/// `spare` more follow, for those that a busy machine skips.
double play(std::chrono::nanoseconds interval, const std::function<bool()>& frame, int spare = 0) {
    auto next = Clock::now();
    double before = 0;
    double after = 0;
    for (int i = 0; i < kWarmUp + kFrames + spare; ++i) {
        if (i == kWarmUp) before = test::processorSeconds();
        std::this_thread::sleep_until(next += interval);
        if (!frame()) std::fprintf(stderr, "frame %d was skipped\n", i);
        if (i + 1 == kWarmUp + kFrames) after = test::processorSeconds();
    }
    return (after - before) / kFrames * 1e6;
}

/// An application that captures itself and looks at nothing.
Report application(const std::string& socket) {
    Meter meter;
    std::promise<void> done;
    bool isTold = false;  // the handlers' thread's
    kelvokit::Recorder recorder({.socketPath = socket, .executor = nullptr});
    recorder.onFrame([&](const kelvokit::Frame& frame) {
        meter.frame(frame.presentationTime()->count());
        if (!isTold && meter.isDone()) {
            isTold = true;
            done.set_value();
        }
    });
    while (!recorder.state().isConnected) {
        recorder.refreshState();
        std::this_thread::sleep_for(std::chrono::milliseconds(20));
    }
    const bool isDone = done.get_future().wait_for(std::chrono::seconds(60)) == std::future_status::ready;
    return isDone ? meter.report() : Report();
}

Report bareReader(int socket) {
    Meter meter;
    std::int64_t sentAt = 0;
    while (!meter.isDone() && ::recv(socket, &sentAt, sizeof(sentAt), 0) == sizeof(sentAt)) {
        meter.frame(sentAt);
        if (::send(socket, "x", 1, MSG_NOSIGNAL) != 1) break;
    }
    return meter.isDone() ? meter.report() : Report();
}

/// A process of its own whose report is read when it ends.
class Other {
  public:
    explicit Other(const std::function<Report()>& work) {
        if (::pipe(pipe_.data()) != 0) std::exit(1);
        process_ = ::fork();
        if (process_ != 0) return;
        const Report report = work();
        ::_exit(::write(pipe_[1], &report, sizeof(report)) == sizeof(report) ? 0 : 1);
    }
    Report end() const {
        Report report;
        if (::read(pipe_[0], &report, sizeof(report)) != sizeof(report)) std::exit(1);
        ::waitpid(process_, nullptr, 0);
        return report;
    }

  private:
    std::array<int, 2> pipe_{-1, -1};
    pid_t process_ = -1;
};

std::pair<double, Report> measureCapture(std::chrono::nanoseconds interval) {
    const test::TemporaryDirectory root;
    const Other client([&] { return application(root.path() + "/run/kelvod/com.quillon.kelvod"); });
    SocketTransport transport(std::make_shared<const DeviceRoot>(root.path(), ""), nullptr);
    const auto door = std::make_shared<test::OpenDoor>();
    const auto listener = transport.createListener("com.quillon.kelvod");
    listener->setDelegate(door);
    listener->resume();
    while (!door->client.copy())
        std::this_thread::sleep_for(std::chrono::milliseconds(5));
    std::this_thread::sleep_for(std::chrono::milliseconds(200));
    KVClientProxy proxy(door->client.copy());
    VideoSurfacePool pool(VideoSurface::Geometry::packed(1080, 1920), 8);
    const double processor = play(
        interval,
        [&] {
            const auto surface = pool.take();
            if (!surface) return false;
            const auto object = std::make_shared<KVIOSurfaceObject>();
            object->setIOSurface(*surface);
            TimingRecord timing;
            timing.presentationTime = MediaTime::make(now(), 1'000'000'000);
            proxy.captureHandlerWithSample(object, bytesOfRecord(timing));
            return true;
        },
        kSpare);
    return {processor, client.end()};
}

std::pair<double, Report> measureBare() {
    std::array<int, 2> ends{-1, -1};
    if (::socketpair(AF_UNIX, SOCK_SEQPACKET, 0, ends.data()) != 0) std::exit(1);
    const Other reader([&] { return bareReader(ends[1]); });
    std::thread releases([&] {
        char byte = 0;
        for (int i = 0; i < kWarmUp + kFrames && ::recv(ends[0], &byte, 1, 0) == 1; ++i) {
        }
    });
    const double processor = play(kInterval, [&] {
        const std::int64_t sentAt = now();
        return ::send(ends[0], &sentAt, sizeof(sentAt), MSG_NOSIGNAL) == sizeof(sentAt);
    });
    releases.join();
    return {processor, reader.end()};
}

/// One turn: what both sides took for each frame, beyond what the sender's rhythm takes by itself.
struct Turn {
    double sender = 0;
    Report receiver;

    double cost() const { return sender + receiver.processor; }
};

double rhythm(std::chrono::nanoseconds interval) {
    return play(interval, [] { return true; });
}

/// The rhythm is measured before and after, as close to `measure` as can be.
Turn measureTurn(std::chrono::nanoseconds interval,
                 const std::function<std::pair<double, Report>()>& measure) {
    const double before = rhythm(interval);
    const auto [whole, receiver] = measure();
    const double after = rhythm(interval);
    if (receiver.frames == 0) {
        std::puts("not every frame arrived");
        std::exit(1);
    }
    return {whole - (before + after) / 2, receiver};
}

void print(const char* name, const Turn& turn) {
    std::printf(
        "%-9s %6.1f us sender + %6.1f us receiver = %6.1f us a frame; arrives after %.3f ms, 99th percentile "
        "%.3f ms\n",
        name, turn.sender, turn.receiver.processor, turn.cost(), turn.receiver.median, turn.receiver.late);
}

/// The turn in the middle, by what `measure` says of each.
template <typename Measure>
double median(const std::vector<Turn>& turns, const Measure& measure) {
    std::vector<double> values;
    for (const Turn& turn : turns)
        values.push_back(measure(turn));
    std::ranges::sort(values);
    return values[values.size() / 2];
}

}  // namespace

int main() {
    setLogsSamples(false);  // as the user's service is started
    std::vector<Turn> bare;
    std::vector<Turn> ours;
    for (int turn = 0; turn < kTurns; ++turn) {
        print("bare", bare.emplace_back(measureTurn(kInterval, measureBare)));
        print("KelvoKit",
              ours.emplace_back(measureTurn(kInterval, [] { return measureCapture(kInterval); })));
    }
    print("10x often", measureTurn(kShortInterval, [] { return measureCapture(kShortInterval); }));
    const auto cost = [](const Turn& turn) { return turn.cost(); };
    const auto late = [](const Turn& turn) { return turn.receiver.late; };
    std::printf(
        "medians of %d turns: processor %.1f us a frame (bound %.0f), %.2f times the bare hand-over; 99th "
        "percentile %.3f ms (bound %.0f), %.2f times\n",
        kTurns, median(ours, cost), kBoundMicroseconds, median(ours, cost) / median(bare, cost),
        median(ours, late), kBoundMilliseconds, median(ours, late) / median(bare, late));
    return median(ours, cost) <= kBoundMicroseconds && median(ours, late) <= kBoundMilliseconds ? 0 : 1;
}
