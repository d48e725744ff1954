#pragma once

#include "platform/Random.h"

namespace kelvo {

/// The kernel's random generator. Thread-safe.
class KernelRandom : public Random {
  public:
    void fill(std::span<std::byte> bytes) override;
};

}  // namespace kelvo
