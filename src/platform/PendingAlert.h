#pragma once

#include "platform/SystemAlert.h"

#include <condition_variable>
#include <mutex>
#include <optional>

namespace kelvo {

/// An alert whose answer comes from another thread, once. What every way of showing alerts has in common.
/// Thread-safe.
class PendingAlert : public SystemAlert {
  public:
    SystemAlertResponse waitForResponse() override {
        std::unique_lock lock(mutex_);
        answered_.wait(lock, [this] { return response_.has_value(); });
        return *response_;
    }
    void cancel() override { answer(SystemAlertResponse::cancelled); }

    /// The first answer counts. Says whether this one did.
    bool answer(SystemAlertResponse response) {
        const std::lock_guard lock(mutex_);
        if (response_) return false;
        response_ = response;
        answered_.notify_all();
        return true;
    }

  private:
    std::mutex mutex_;
    std::condition_variable answered_;
    std::optional<SystemAlertResponse> response_;
};

}  // namespace kelvo
