#pragma once

#include <mutex>
#include <utility>

namespace kelvo {

/// A value that several threads touch, reachable only under its lock. The lock never outlives one access:
/// work on a copy when something else must be called. Thread-safe.
template <typename T>
class Guarded {
  public:
    Guarded() = default;
    explicit Guarded(T value) : value_(std::move(value)) {}

    /// Runs `access` with the value under the lock and returns what it returns. `access` must not call out.
    template <typename Access>
    auto with(Access&& access) {
        std::lock_guard lock(mutex_);
        return std::forward<Access>(access)(value_);
    }
    template <typename Access>
    auto with(Access&& access) const {
        std::lock_guard lock(mutex_);
        return std::forward<Access>(access)(value_);
    }

    T copy() const {
        std::lock_guard lock(mutex_);
        return value_;
    }

    /// Stores `value` and returns what stood there before (so that it is destroyed outside the lock).
    T exchange(T value) {
        std::lock_guard lock(mutex_);
        return std::exchange(value_, std::move(value));
    }

    void set(T value) { exchange(std::move(value)); }

  private:
    mutable std::mutex mutex_;
    T value_{};
};

}  // namespace kelvo
