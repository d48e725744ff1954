#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "platform/ApplicationState.h"

#include <atomic>
#include <map>
#include <memory>

namespace kelvo {

/// Applications whose states a test sets. Updates and answers come on a queue of the source. Thread-safe.
class SimulatedApplications : public ApplicationStateSource {
  public:
    void setUpdateHandler(UpdateHandler handler) override { handler_->set(std::move(handler)); }
    std::optional<ApplicationInformation> informationOfProcess(std::int32_t processIdentifier) override;
    void informationOfApplication(std::string_view bundleIdentifier, InformationHandler handler) override;
    std::int32_t stateOfApplication(std::string_view bundleIdentifier) override;
    std::optional<std::string> frontmostApplicationBundleIdentifier() override;

    /// Changes what is known of an application (by its process) and tells the handler. One that is frontmost
    /// takes that place from whoever had it, of which the handler hears nothing by itself.
    void change(const ApplicationInformation& information);
    /// Tells the handler, without anything being changed: a stale update.
    void report(const ApplicationInformation& information);
    /// Nobody is in front.
    void clearFrontmost() { frontmost_.set(std::nullopt); }

    bool hasUpdateHandler() const { return handler_->copy() != nullptr; }

    /// Waits until the queue is empty, and says whether anything ran since the last call.
    bool settle();

  private:
    using Applications = std::map<std::int32_t, ApplicationInformation>;
    std::optional<ApplicationInformation> find(std::string_view bundleIdentifier) const;
    void deliver(Task task);

    // Shared with the tasks, which outlive nothing else of the source.
    const std::shared_ptr<Guarded<UpdateHandler>> handler_ = std::make_shared<Guarded<UpdateHandler>>();
    Guarded<Applications> applications_;
    Guarded<std::optional<std::string>> frontmost_;
    std::atomic<int> delivered_{0};
    SerialQueue queue_{"com.quillon.kelvod.simulated-applications"};
};

}  // namespace kelvo
