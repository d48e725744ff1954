#pragma once

#include "base/Guarded.h"
#include "platform/ScreenCapture.h"
#include "platform/linux/x11/WakeEvent.h"

#include <cstdint>
#include <memory>
#include <set>
#include <vector>

namespace kelvo::x11 {

/// What is mirrored now.
struct Mirroring {
    MirroringMode mode = MirroringMode::off;
    std::set<std::uint32_t> contexts;

    friend bool operator==(const Mirroring&, const Mirroring&) = default;
};

/// The mirroring that all screen sources of one display share. Thread-safe.
class MirroringState {
  public:
    Mirroring current() const;

    /// Changes what is mirrored and wakes everyone who listens, if that made a difference.
    void setMode(MirroringMode mode);
    void setContexts(std::set<std::uint32_t> contexts);

    /// `listener` is set at each change from now on, for as long as it lives.
    void addListener(const std::shared_ptr<WakeEvent>& listener);

  private:
    struct Shared {
        Mirroring mirroring;
        std::vector<std::weak_ptr<WakeEvent>> listeners;
    };
    template <typename Change>
    void change(Change apply);

    Guarded<Shared> shared_;
};

}  // namespace kelvo::x11
