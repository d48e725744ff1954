#include "platform/simulated/SimulatedApplications.h"

#include <utility>

namespace kelvo {

std::optional<ApplicationInformation> SimulatedApplications::informationOfProcess(
    std::int32_t processIdentifier) {
    return applications_.with([&](const Applications& all) -> std::optional<ApplicationInformation> {
        const auto entry = all.find(processIdentifier);
        if (entry == all.end()) return std::nullopt;
        return entry->second;
    });
}

std::optional<ApplicationInformation> SimulatedApplications::find(std::string_view bundleIdentifier) const {
    return applications_.with([&](const Applications& all) -> std::optional<ApplicationInformation> {
        for (const auto& [process, information] : all) {
            if (information.bundleIdentifier == bundleIdentifier) return information;
        }
        return std::nullopt;
    });
}

void SimulatedApplications::informationOfApplication(std::string_view bundleIdentifier,
                                                     InformationHandler handler) {
    deliver([information = find(bundleIdentifier), handler = std::move(handler)] { handler(information); });
}

std::int32_t SimulatedApplications::stateOfApplication(std::string_view bundleIdentifier) {
    const auto information = find(bundleIdentifier);
    return information ? information->state : std::int32_t{kApplicationStateUnknown};
}

std::optional<std::string> SimulatedApplications::frontmostApplicationBundleIdentifier() {
    return frontmost_.copy();
}

void SimulatedApplications::change(const ApplicationInformation& information) {
    applications_.with([&](Applications& all) {
        if (information.state == kApplicationStateTerminated) {
            all.erase(information.processIdentifier);
        } else {
            all[information.processIdentifier] = information;
        }
    });
    if (information.isFrontmost) frontmost_.set(information.bundleIdentifier);
    report(information);
}

void SimulatedApplications::report(const ApplicationInformation& information) {
    deliver([handler = handler_, information] {
        if (const UpdateHandler current = handler->copy()) current(information);
    });
}

void SimulatedApplications::deliver(Task task) {
    ++delivered_;
    queue_.async(std::move(task));
}

bool SimulatedApplications::settle() {
    const bool anything = delivered_.exchange(0) > 0;
    queue_.sync([] {});
    return anything;
}

}  // namespace kelvo
