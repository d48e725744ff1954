#pragma once

#include <atomic>
#include <thread>

namespace scene {

/// Seconds from one bounce of the ball to the next; each one sounds.
constexpr double kBouncePeriod = 0.8;

/// Plays a note at each bounce, on a thread of its own, for as long as it lives. Silent where there is no
/// sound server.
class Chimes {
  public:
    Chimes();
    ~Chimes();
    Chimes(const Chimes&) = delete;
    Chimes& operator=(const Chimes&) = delete;

  private:
    void play() const;

    std::atomic<bool> isOver_ = false;
    std::thread player_;
};

}  // namespace scene
