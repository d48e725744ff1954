#pragma once

#include <cstddef>
#include <span>

namespace kelvo {

/// Where random bytes come from. Implemented by the kernel's generator and by the simulated device, which
/// repeats the same sequence in every run. Thread-safe; never fails.
class Random {
  public:
    virtual ~Random() = default;
    virtual void fill(std::span<std::byte> bytes) = 0;
};

}  // namespace kelvo
