#pragma once

#include <memory>

namespace kelvo {

/// A phone call, as far as this system looks at it.
struct Call {
    bool isOutgoing = false;
    bool hasEnded = false;
};

class CallObserver;

/// Told about calls, on the main queue.
class CallObserverDelegate {
  public:
    virtual ~CallObserverDelegate() = default;
    virtual void callObserverCallChanged(CallObserver& observer, const Call& call) = 0;
};

/// The device's phone calls. Implemented by a Linux adapter that never reports a call, and by the simulated
/// device.
class CallObserver {
  public:
    virtual ~CallObserver() = default;
    virtual void setDelegate(std::weak_ptr<CallObserverDelegate> delegate) = 0;
};

}  // namespace kelvo
