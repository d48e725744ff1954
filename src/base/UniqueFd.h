#pragma once

#include <unistd.h>
#include <utility>

namespace kelvo {

/// Owns one file descriptor and closes it when it goes. Caller's thread.
class UniqueFd {
  public:
    UniqueFd() = default;
    explicit UniqueFd(int descriptor) : descriptor_(descriptor) {}
    UniqueFd(UniqueFd&& other) noexcept : descriptor_(other.release()) {}
    UniqueFd& operator=(UniqueFd&& other) noexcept {
        reset(other.release());
        return *this;
    }
    ~UniqueFd() { reset(); }

    int get() const { return descriptor_; }
    explicit operator bool() const { return descriptor_ >= 0; }

    /// Gives the descriptor away; this object then owns nothing.
    int release() { return std::exchange(descriptor_, -1); }

    void reset(int descriptor = -1) {
        if (descriptor_ >= 0 && descriptor_ != descriptor) ::close(descriptor_);
        descriptor_ = descriptor;
    }

  private:
    int descriptor_ = -1;
};

}  // namespace kelvo
