#pragma once

#include <atomic>
#include <fstream>
#include <functional>
#include <string>
#include <sys/types.h>
#include <thread>
#include <unistd.h>

namespace kelvo::test {

/// A thread that is about to make one call that blocks. For tests that must act while it waits.
class BlockingCaller {
  public:
    explicit BlockingCaller(std::function<void()> call)
        : thread_([this, call = std::move(call)] {
              identifier_ = ::gettid();
              call();
          }) {}
    ~BlockingCaller() {
        if (thread_.joinable()) thread_.join();
    }

    /// Returns when the kernel says that the thread waits inside its call, or has ended.
    void awaitBlocked() const {
        while (!isBlockedOrGone())
            std::this_thread::yield();
    }
    void join() { thread_.join(); }

  private:
    bool isBlockedOrGone() const {
        if (identifier_ == 0) return false;
        std::ifstream file("/proc/self/task/" + std::to_string(identifier_) + "/stat");
        std::string text;
        if (!std::getline(file, text)) return true;
        return text.find(") S ") != std::string::npos;
    }

    std::atomic<pid_t> identifier_{0};
    std::thread thread_;
};

}  // namespace kelvo::test
