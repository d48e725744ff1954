#include "support/KVApplicationStateMonitor.h"

#include "base/KVLog.h"
#include "base/Value.h"

#include <string>
#include <utility>

namespace kelvo {
namespace {

/// Takes screenshots in front of what the user really has in front.
constexpr std::string_view kScreenshotServiceBundleID = "com.quillon.ShotframeServicesService";
constexpr std::int32_t kNoApplication = -1;

bool isForegroundLike(std::int32_t state) {
    return state == kApplicationStateForeground || state == kApplicationStateForegroundObscured;
}

std::string descriptionOf(const std::optional<ApplicationInformation>& information) {
    if (!information) return Value().description();
    return Value(Dictionary{{"applicationState", information->state},
                            {"processIdentifier", information->processIdentifier},
                            {"isFrontmost", information->isFrontmost},
                            {"bundleIdentifier", information->bundleIdentifier}})
        .description();
}

std::string descriptionOf(const std::map<std::int32_t, std::int32_t>& states) {
    Dictionary all;
    for (const auto& [process, state] : states)
        all.set(std::to_string(process), state);
    return Value(all).description();
}

}  // namespace

KVApplicationStateMonitor::~KVApplicationStateMonitor() {
    if (isSubscribed_) source_->setUpdateHandler(nullptr);
}

void KVApplicationStateMonitor::addObserver(std::shared_ptr<KVApplicationStateObserver> observer,
                                            std::int32_t processIdentifier) {
    constexpr const char* kName = "addObserver:processIdentifier:";
    const auto information = source_->informationOfProcess(processIdentifier);
    {
        std::lock_guard lock(mutex_);
        observers_[processIdentifier].swap(observer);
        if (information) {
            previousState_[processIdentifier] = information->state;
        } else {
            previousState_.erase(processIdentifier);
        }
    }
    KVLog("%s processIdentifier %i userInfo %s previousState %s", kName, processIdentifier,
          descriptionOf(information).c_str(), descriptionOf(previousState()).c_str());
    KVLog("%s state %i", kName, information ? information->state : std::int32_t{kApplicationStateUnknown});
    updateSubscription();
}

void KVApplicationStateMonitor::removeObserverWithProcessIdentifier(std::int32_t processIdentifier) {
    std::shared_ptr<KVApplicationStateObserver> removed;  // destroyed after the lock is free
    {
        std::lock_guard lock(mutex_);
        const auto entry = observers_.find(processIdentifier);
        if (entry != observers_.end()) {
            removed = std::move(entry->second);
            observers_.erase(entry);
        }
    }
    updateSubscription();
}

void KVApplicationStateMonitor::addSystemObserver(std::shared_ptr<KVSystemStateObserver> observer) {
    {
        std::lock_guard lock(mutex_);
        systemObserver_.swap(observer);
    }
    updateSubscription();
}

void KVApplicationStateMonitor::removeSystemObserver() {
    addSystemObserver(nullptr);
}

std::size_t KVApplicationStateMonitor::observersCount() const {
    std::lock_guard lock(mutex_);
    return observers_.size() + (systemObserver_ ? 1 : 0);
}

void KVApplicationStateMonitor::updateSubscription() {
    std::lock_guard lock(subscriptionMutex_);
    const bool isWanted = observersCount() > 0;
    if (isWanted == isSubscribed_) return;
    isSubscribed_ = isWanted;
    if (!isWanted) return source_->setUpdateHandler(nullptr);
    source_->setUpdateHandler([weakSelf = weak_from_this()](const ApplicationInformation& update) {
        if (const auto self = weakSelf.lock()) self->applicationStateDidChange(update);
    });
}

void KVApplicationStateMonitor::applicationStateDidChange(const ApplicationInformation& update) {
    KVLog("applicationStateDidChange: userInfo %s previousState %s", descriptionOf(update).c_str(),
          descriptionOf(previousState()).c_str());
    std::shared_ptr<KVSystemStateObserver> systemObserver;
    {
        std::lock_guard lock(mutex_);
        systemObserver = systemObserver_;
    }
    if (systemObserver) handleApplicationStateChange(*systemObserver, update);
    // Looked at now: what the system observer did counts.
    if (hasObservers()) notifyInAppSessionShouldPauseOrResume(update);
}

void KVApplicationStateMonitor::handleApplicationStateChange(KVSystemStateObserver& observer,
                                                             const ApplicationInformation& update) {
    if (update.state == kApplicationStateTerminated)
        observer.frontmostApplicationWasTerminated(update.processIdentifier);
    if (!update.isFrontmost) {
        if (update.state != kApplicationStateForegroundObscured)
            observer.frontmostApplicationDidEnterBackground(update.processIdentifier);
        return;
    }
    if (update.bundleIdentifier == kScreenshotServiceBundleID) return;
    // An update may be late: another application can be in front by now.
    if (source_->frontmostApplicationBundleIdentifier() == update.bundleIdentifier)
        observer.frontmostApplicationDidChange(update.processIdentifier);
}

void KVApplicationStateMonitor::notifyInAppSessionShouldPauseOrResume(const ApplicationInformation& update) {
    constexpr const char* kName = "notifyInAppSessionShouldPauseOrResume:";
    const std::int32_t process = update.processIdentifier;
    std::shared_ptr<KVApplicationStateObserver> observer;
    std::int32_t previous = kApplicationStateUnknown;
    {
        std::lock_guard lock(mutex_);
        if (const auto entry = observers_.find(process); entry != observers_.end()) observer = entry->second;
        if (const auto known = previousState_.find(process); known != previousState_.end())
            previous = known->second;
    }
    KVLog("%s processIdentifer %i observer nonnil %i", kName, process, observer ? 1 : 0);
    if (!observer) return;
    KVLog("%s state %i previousState %i", kName, update.state, previous);
    if (isForegroundLike(update.state) && !isForegroundLike(previous)) {
        KVLog("%s calling clientApplicationDidEnterForeground", kName);
        observer->clientApplicationDidEnterForeground();
    } else if (!isForegroundLike(update.state) && isForegroundLike(previous)) {
        KVLog("%s calling clientApplicationDidEnterBackground", kName);
        observer->clientApplicationDidEnterBackground();
    }
    {
        std::lock_guard lock(mutex_);
        previousState_[process] = update.state;
    }
    KVLog("%s state %i previousState %s", kName, update.state, descriptionOf(previousState()).c_str());
}

bool KVApplicationStateMonitor::hasObservers() const {
    std::lock_guard lock(mutex_);
    return !observers_.empty();
}

KVApplicationStateMonitor::States KVApplicationStateMonitor::previousState() const {
    std::lock_guard lock(mutex_);
    return previousState_;
}

void KVApplicationStateMonitor::frontmostApplicationProcessIdentifier(
    std::function<void(std::int32_t)> completion) {
    const auto frontmost = source_->frontmostApplicationBundleIdentifier();
    if (!frontmost) return completion(kNoApplication);
    source_->informationOfApplication(*frontmost, [completion = std::move(completion)](const auto& found) {
        completion(found ? found->processIdentifier : 0);
    });
}

/// An obscured application does not count here, although its recording goes on.
bool KVApplicationStateMonitor::isApplicationInForegroundWithBundleIdentifier(
    std::string_view bundleIdentifier) const {
    return (source_->stateOfApplication(bundleIdentifier) & kApplicationStateForeground) != 0;
}

}  // namespace kelvo
