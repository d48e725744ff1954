// What a `sync` onto a serial queue costs, against a bare condition-variable round trip between two threads.
// Prints medians of rounds that take turns, so that a noisy machine disturbs both sides alike.

#include "base/SerialQueue.h"

#include <algorithm>
#include <chrono>
#include <condition_variable>
#include <cstdio>
#include <functional>
#include <mutex>
#include <thread>
#include <vector>

namespace {

using namespace kelvo;
using Clock = std::chrono::steady_clock;

constexpr int kRounds = 41;
constexpr int kCallsARound = 2000;

/// The peer: a thread that answers each question through a condition variable.
class BareRoundTrip {
  public:
    BareRoundTrip() : thread_([this] { answer(); }) {}
    ~BareRoundTrip() {
        {
            std::lock_guard lock(mutex_);
            isEnding_ = true;
            changed_.notify_all();
        }
        thread_.join();
    }

    void call() {
        std::unique_lock lock(mutex_);
        isAsked_ = true;
        changed_.notify_all();
        changed_.wait(lock, [this] { return !isAsked_; });
    }

  private:
    void answer() {
        std::unique_lock lock(mutex_);
        while (true) {
            changed_.wait(lock, [this] { return isAsked_ || isEnding_; });
            if (isEnding_) return;
            isAsked_ = false;
            changed_.notify_all();
        }
    }

    std::mutex mutex_;
    std::condition_variable changed_;
    bool isAsked_ = false;
    bool isEnding_ = false;
    std::thread thread_;
};

double nanosecondsACall(const std::function<void()>& call) {
    const auto start = Clock::now();
    for (int i = 0; i < kCallsARound; ++i)
        call();
    return std::chrono::duration<double, std::nano>(Clock::now() - start).count() / kCallsARound;
}

double median(std::vector<double> values) {
    std::ranges::nth_element(values, values.begin() + static_cast<std::ptrdiff_t>(values.size() / 2));
    return values[values.size() / 2];
}

}  // namespace

int main() {
    BareRoundTrip peer;
    SerialQueue idleQueue("bench.idle");
    SerialQueue busyQueue("bench.busy");
    long ran = 0;
    std::vector<double> bare;
    std::vector<double> idle;
    std::vector<double> behindATask;
    for (int round = 0; round < kRounds; ++round) {
        bare.push_back(nanosecondsACall([&] { peer.call(); }));
        idle.push_back(nanosecondsACall([&] { idleQueue.sync([&] { ++ran; }); }));
        behindATask.push_back(nanosecondsACall([&] {
            busyQueue.async([&] { ++ran; });
            busyQueue.sync([&] { ++ran; });
        }));
    }
    std::printf("bare condition-variable round trip  %8.0f ns\n", median(bare));
    std::printf("sync onto an idle queue             %8.0f ns   ratio %.3f\n", median(idle),
                median(idle) / median(bare));
    std::printf("sync behind a task of the queue     %8.0f ns   ratio %.3f\n", median(behindATask),
                median(behindATask) / median(bare));
    return ran > 0 ? 0 : 1;
}
