#pragma once

#include "base/UniqueFd.h"

namespace kelvo::x11 {

/// An event that one thread sets and others wait for with poll. Thread-safe.
class WakeEvent {
  public:
    WakeEvent();

    void set();
    void clear();
    /// Readable while the event is set; -1 when the process was out of descriptors.
    int descriptor() const { return descriptor_.get(); }

  private:
    UniqueFd descriptor_;
};

}  // namespace kelvo::x11
