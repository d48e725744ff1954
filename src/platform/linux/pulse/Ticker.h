#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace kelvo::pulse {

/// Calls a function again and again on a thread of its own, from construction until destruction, which waits
/// for the call that runs. Not to be destroyed by that call.
class Ticker {
  public:
    Ticker(std::string label, std::chrono::milliseconds interval, std::function<void()> tick);
    ~Ticker();
    Ticker(const Ticker&) = delete;
    Ticker& operator=(const Ticker&) = delete;

  private:
    void run(const std::string& label, std::chrono::milliseconds interval, const std::function<void()>& tick);

    std::mutex mutex_;
    std::condition_variable stops_;
    bool isStopping_ = false;
    std::thread thread_;
};

}  // namespace kelvo::pulse
