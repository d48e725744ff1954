#include "platform/linux/pulse/Ticker.h"

#include "base/ThreadName.h"

#include <utility>

namespace kelvo::pulse {

Ticker::Ticker(std::string label, std::chrono::milliseconds interval, std::function<void()> tick)
    : thread_([this, label = std::move(label), interval, tick = std::move(tick)] {
          run(label, interval, tick);
      }) {}

Ticker::~Ticker() {
    {
        const std::lock_guard lock(mutex_);
        isStopping_ = true;
        wakes_.notify_all();
    }
    thread_.join();
}

void Ticker::wake() {
    {
        const std::lock_guard lock(mutex_);
        isWoken_ = true;
    }
    wakes_.notify_one();
}

void Ticker::run(const std::string& label, std::chrono::milliseconds interval,
                 const std::function<void()>& tick) {
    nameCurrentThread(label);
    std::unique_lock lock(mutex_);
    while (true) {
        wakes_.wait_for(lock, interval, [this] { return isWoken_ || isStopping_; });
        if (isStopping_) return;
        isWoken_ = false;
        lock.unlock();
        tick();
        lock.lock();
    }
}

}  // namespace kelvo::pulse
