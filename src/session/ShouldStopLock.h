#pragma once

#include <atomic>
#include <cstdint>

namespace kelvo {

/// The 32-bit lock word around a session's stop flag. Non-recursive. Thread-safe.
///
/// It has one deliberate oddity: a frame that arrives while the session is paused leaves the lock taken, so
/// that no frame after it is processed before the session starts or resumes. A lock left like that has no
/// holder to wait for. Frames therefore turn away from it instead of waiting (a source that is being stopped
/// waits for its last frame, which would wait for ever), and whoever takes the lock for the session's control
/// takes it over.
///
///     free <--unlock-- held --leaveTaken--> left taken
///      |                 ^                      |
///      +-lock, tryLock---+---------lock---------+
class ShouldStopLock {
  public:
    /// Takes the lock, waiting for its holder; takes over one that was left taken.
    void lock() {
        for (;;) {
            std::uint32_t seen = word_.load();
            if (seen != kHeld && word_.compare_exchange_strong(seen, kHeld)) return;
            word_.wait(kHeld);
        }
    }

    /// Takes the lock, waiting for its holder. False, and not taken, when it was left taken.
    bool lockUnlessLeftTaken() {
        for (;;) {
            std::uint32_t expected = kFree;
            if (word_.compare_exchange_strong(expected, kHeld)) return true;
            if (expected == kLeftTaken) return false;
            word_.wait(kHeld);
        }
    }

    void unlock() { release(kFree); }

    /// The holder goes and the lock stays taken.
    void leaveTaken() { release(kLeftTaken); }

    bool isTaken() const { return word_.load() != kFree; }

  private:
    static constexpr std::uint32_t kFree = 0;
    static constexpr std::uint32_t kHeld = 1;
    static constexpr std::uint32_t kLeftTaken = 2;

    void release(std::uint32_t next) {
        word_.store(next);
        word_.notify_all();
    }

    std::atomic<std::uint32_t> word_{kFree};
};

}  // namespace kelvo
