#include "support/KVStatusBarAssertion.h"

#include "base/KVLog.h"

namespace kelvo {

void KVStatusBarAssertion::invalidateDoubleHeightStatusBar() {
    if (!assertion_) return;
    KVLog("KVStatusBarAssertion: double height status bar assertion released");
    assertion_->invalidate();
    assertion_.reset();
    if (coordinator_) coordinator_->setRegisteredStyleOverrides(0, nullptr);
    coordinator_.reset();
    if (timer_) timer_->invalidate();
    timer_.reset();
}

}  // namespace kelvo
