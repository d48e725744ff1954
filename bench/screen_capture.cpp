// What capturing an X screen costs: a frame against a bare shared-memory grab of the same frame, a still
// screen, held frames, many starts and stops, and how long a picture takes from the display to the consumer.
// Starts an Xvfb of its own. `screen_capture [SECONDS]`: how long the still screen is watched (10).

#include "platform/linux/x11/RootPicture.h"
#include "platform/linux/x11/ShmSurfacePool.h"
#include "platform/linux/x11/X11Screen.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <functional>
#include <string>
#include <sys/resource.h>
#include <thread>
#include <vector>
#include <xcb/damage.h>
#include <xcb/xfixes.h>

namespace {

using namespace kelvo;
using namespace std::chrono_literals;
using Clock = std::chrono::steady_clock;

constexpr int kWidth = 1080;
constexpr int kHeight = 1920;
constexpr auto kInterval = 1s / 60.0;

/// A consumer that notes when frames come and holds them if it is told to.
class Consumer : public ScreenCaptureDelegate {
  public:
    void screenCaptureControllerDidReceiveSampleBuffer(ScreenCaptureSource&, const SampleBufferRef& sample,
                                                       const ScreenTransform&) override {
        lastArrival = Clock::now().time_since_epoch().count();
        if (holds) held.push_back(sample->surface());
        ++frames;
    }
    void screenCaptureControllerDidFailWithStatus(ScreenCaptureSource&, ScreenCaptureStatus) override {
        std::puts("the display failed");
        std::exit(1);
    }
    void screenCaptureControllerWasPreempted(ScreenCaptureSource&) override {}
    void screenCaptureControllerMediaServicesWereReset(ScreenCaptureSource&) override {}

    void awaitFrames(int count) const {
        while (frames < count)
            std::this_thread::sleep_for(100us);
    }

    std::atomic<int> frames{0};
    std::atomic<Clock::rep> lastArrival{0};
    std::atomic<bool> holds{false};
    std::vector<VideoSurfaceRef> held;
};

double percentile(std::vector<double> values, double part) {
    std::ranges::sort(values);
    return values[static_cast<std::size_t>(part * static_cast<double>(values.size() - 1))];
}

double milliseconds(const std::function<void()>& work) {
    const auto begin = Clock::now();
    work();
    return std::chrono::duration<double, std::milli>(Clock::now() - begin).count();
}

double processorSeconds() {
    rusage usage{};
    ::getrusage(RUSAGE_SELF, &usage);
    const auto seconds = [](const timeval& time) {
        return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
    };
    return seconds(usage.ru_utime) + seconds(usage.ru_stime);
}

double residentMegabytes() {
    std::ifstream statm("/proc/self/statm");
    long total = 0;
    long resident = 0;
    statm >> total >> resident;
    return static_cast<double>(resident) * 4096 / 1e6;
}

std::ptrdiff_t entriesIn(const char* directory) {
    return std::distance(std::filesystem::directory_iterator(directory),
                         std::filesystem::directory_iterator());
}

std::shared_ptr<ScreenCaptureSource> makeSource(x11::X11Screen& screen,
                                                const std::shared_ptr<Consumer>& consumer) {
    screen.setMode(MirroringMode::wholeScreen);
    auto source = screen.createSource({kWidth, kHeight}, MediaTime::make(1, 60));
    source->setDelegate(consumer);
    return source;
}

/// One frame as the source takes it, against the grab alone, in turns.
void measureFrames(const std::string& display) {
    const auto connection = x11::XConnection::open(display);
    xcb_connection_t* const c = connection->raw();
    connection->hasExtension(xcb_damage_id);
    connection->await<xcb_damage_query_version_reply_t>(xcb_damage_query_version(c, 1, 1));
    connection->await<xcb_xfixes_query_version_reply_t>(xcb_xfixes_query_version(c, 4, 0));
    x11::RootPicture picture(*connection, {kWidth, kHeight});
    picture.watch();
    x11::ShmSurfacePool pool(*connection, picture.refresh(), 8);
    const VideoSurfaceRef bareSurface = *pool.take();
    const auto bareGrab = [&] {
        std::free(xcb_shm_get_image_reply(
            c,
            xcb_shm_get_image(c, connection->root(), 0, 0, kWidth, kHeight, ~0U, XCB_IMAGE_FORMAT_Z_PIXMAP,
                              pool.segmentOf(*bareSurface), 0),
            nullptr));
    };
    const auto ourFrame = [&] {
        picture.refresh();
        const VideoSurfaceRef surface = *pool.take();
        picture.rearm();
        picture.grab({*surface, pool.segmentOf(*surface)});
        const auto sample = SampleBuffer::video(surface, {});
        while (const x11::XOwned<xcb_generic_event_t> event{xcb_poll_for_event(c)})
            picture.handle(*event);
    };
    std::vector<double> bare;
    std::vector<double> ours;
    for (int i = 0; i < 600; ++i) {
        bare.push_back(milliseconds(bareGrab));
        ours.push_back(milliseconds(ourFrame));
    }
    std::printf("bare grab of %dx%d          median %6.3f ms\n", kWidth, kHeight, percentile(bare, 0.5));
    std::printf("our frame                      median %6.3f ms   ratio %.2f  (bound 1.3)\n",
                percentile(ours, 0.5), percentile(ours, 0.5) / percentile(bare, 0.5));
}

void measureStillScreen(x11::X11Screen& screen, std::chrono::seconds duration) {
    const auto consumer = std::make_shared<Consumer>();
    const auto source = makeSource(screen, consumer);
    source->startCapture();
    consumer->awaitFrames(1);
    std::this_thread::sleep_for(500ms);
    const int framesBefore = consumer->frames;
    const double before = processorSeconds();
    std::this_thread::sleep_for(duration);
    const double used = processorSeconds() - before;
    source->stopCapture();
    std::printf("still screen                   %6.3f %% of a core, %d frames over %ld s  (bound 0.5 %%)\n",
                100 * used / static_cast<double>(duration.count()), consumer->frames - framesBefore,
                static_cast<long>(duration.count()));
}

void measureHeldFrames(x11::X11Screen& screen, test::XClient& client, xcb_window_t window) {
    const auto consumer = std::make_shared<Consumer>();
    consumer->holds = true;
    const auto source = makeSource(screen, consumer);
    const double before = residentMegabytes();
    source->startCapture();
    for (std::uint32_t number = 0; number < 60; ++number) {
        client.showNumber(window, number);
        std::this_thread::sleep_for(kInterval);
    }
    source->stopCapture();
    std::printf("consumer that holds all        %d frames, %.0f MB more, %lu skipped  (bound 8 frames)\n",
                consumer->frames.load(), residentMegabytes() - before,
                static_cast<unsigned long>(source->skippedFrameCount()));
}

void measureStarts(x11::X11Screen& screen) {
    const auto consumer = std::make_shared<Consumer>();
    const auto source = makeSource(screen, consumer);
    const auto cycle = [&] {
        const int before = consumer->frames;
        source->startCapture();
        consumer->awaitFrames(before + 1);
        source->stopCapture();
    };
    for (int i = 0; i < 20; ++i)
        cycle();
    const auto descriptors = entriesIn("/proc/self/fd");
    const auto threads = entriesIn("/proc/self/task");
    const double memory = residentMegabytes();
    const double took = milliseconds([&] {
        for (int i = 0; i < 1000; ++i)
            cycle();
    });
    std::printf("1000 starts and stops          %+ld descriptors, %+ld threads, %+.1f MB; %.1f ms each\n",
                static_cast<long>(entriesIn("/proc/self/fd") - descriptors),
                static_cast<long>(entriesIn("/proc/self/task") - threads), residentMegabytes() - memory,
                took / 1000);
}

/// The peer: how long a bare loop of waiting for damage and grabbing takes from drawing to grabbed.
class BareLoop {
  public:
    explicit BareLoop(const std::string& display)
        : connection_(x11::XConnection::open(display)),
          pool_(*connection_, kGeometry, 1),
          surface_(*pool_.take()) {
        xcb_connection_t* const c = connection_->raw();
        connection_->hasExtension(xcb_damage_id);
        connection_->await<xcb_damage_query_version_reply_t>(xcb_damage_query_version(c, 1, 1));
        xcb_damage_create(c, damage_, connection_->root(), XCB_DAMAGE_REPORT_LEVEL_NON_EMPTY);
        grab();
        thread_ = std::thread([this] {
            while (const x11::XOwned<xcb_generic_event_t> event{xcb_wait_for_event(connection_->raw())}) {
                if (isEnding_) return;
                grab();
                lastArrival = Clock::now().time_since_epoch().count();
                ++frames;
            }
        });
    }

    /// The next drawing ends it.
    void endWith(const std::function<void()>& drawing) {
        isEnding_ = true;
        drawing();
        thread_.join();
    }

    std::atomic<int> frames{0};
    std::atomic<Clock::rep> lastArrival{0};

  private:
    static constexpr VideoSurface::Geometry kGeometry{kWidth, kHeight, kWidth * 4};

    void grab() {
        xcb_connection_t* const c = connection_->raw();
        xcb_damage_subtract(c, damage_, XCB_NONE, XCB_NONE);
        std::free(xcb_shm_get_image_reply(
            c,
            xcb_shm_get_image(c, connection_->root(), 0, 0, kWidth, kHeight, ~0U, XCB_IMAGE_FORMAT_Z_PIXMAP,
                              pool_.segmentOf(*surface_), 0),
            nullptr));
    }

    const std::unique_ptr<x11::XConnection> connection_;
    x11::ShmSurfacePool pool_;
    const VideoSurfaceRef surface_;
    const xcb_damage_damage_t damage_ = xcb_generate_id(connection_->raw());
    std::atomic<bool> isEnding_{false};
    std::thread thread_;
};

/// Milliseconds from when the display had each of 300 pictures to when `receiver` had them, unhurried enough
/// that no frame has to wait for its turn.
template <typename Receiver>
std::vector<double> latenciesOf(const Receiver& receiver, test::XClient& client, xcb_window_t window) {
    std::vector<double> latencies;
    for (std::uint32_t number = 0; number < 300; ++number) {
        std::this_thread::sleep_for(40ms);
        const int before = receiver.frames;
        client.showNumber(window, number);
        const auto drawn = Clock::now().time_since_epoch().count();
        while (receiver.frames == before)
            std::this_thread::sleep_for(100us);
        latencies.push_back(static_cast<double>(receiver.lastArrival - drawn) / 1e6);
    }
    return latencies;
}

void printLatencies(const char* name, const std::vector<double>& latencies) {
    std::printf("%-30s median %6.3f ms, 99th percentile %6.3f ms  (bound 2 ms)\n", name,
                percentile(latencies, 0.5), percentile(latencies, 0.99));
}

/// From when the display has a picture to when the consumer has it.
void measureLatency(const std::string& display, x11::X11Screen& screen, test::XClient& client,
                    xcb_window_t window) {
    BareLoop bare(display);
    printLatencies("display to a bare grabbing loop", latenciesOf(bare, client, window));
    bare.endWith([&] { client.showNumber(window, 0); });
    const auto consumer = std::make_shared<Consumer>();
    const auto source = makeSource(screen, consumer);
    source->startCapture();
    consumer->awaitFrames(1);
    printLatencies("display to consumer", latenciesOf(*consumer, client, window));
    source->stopCapture();
}

}  // namespace

int main(int argumentCount, char** arguments) {
    const std::chrono::seconds stillSeconds(argumentCount > 1 ? std::atoi(arguments[1]) : 10);
    const test::XvfbServer server(kWidth, kHeight);
    test::XClient client(server.display());
    const xcb_window_t window = client.createWindow({0, 0, kWidth, kHeight}, 0);
    client.showNumber(window, 1);
    x11::X11Screen screen(server.display());
    measureFrames(server.display());
    measureStillScreen(screen, stillSeconds);
    measureHeldFrames(screen, client, window);
    measureStarts(screen);
    measureLatency(server.display(), screen, client, window);
    return 0;
}
