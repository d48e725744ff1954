#pragma once

#include <chrono>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <string>
#include <thread>

namespace kelvo::pulse {

/// Calls a function on a thread of its own whenever it is woken, and when that has not happened for an
/// interval, from construction until destruction, which waits for the call that runs. Not to be destroyed by
/// that call.
class Ticker {
  public:
    Ticker(std::string label, std::chrono::milliseconds interval, std::function<void()> tick);
    ~Ticker();
    Ticker(const Ticker&) = delete;
    Ticker& operator=(const Ticker&) = delete;

    /// There is something to do: the function is called soon. Neither waits for it nor allocates; any thread.
    void wake();

  private:
    void run(const std::string& label, std::chrono::milliseconds interval, const std::function<void()>& tick);

    std::mutex mutex_;
    std::condition_variable wakes_;
    bool isWoken_ = false;
    bool isStopping_ = false;
    std::thread thread_;
};

}  // namespace kelvo::pulse
