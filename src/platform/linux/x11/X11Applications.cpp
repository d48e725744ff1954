#include "platform/linux/x11/X11Applications.h"

#include <utility>

namespace kelvo::x11 {
namespace {

std::int32_t stateOf(const DesktopApplication& application) {
    if (application.isActive) return kApplicationStateForeground;
    return application.isVisible ? kApplicationStateForegroundObscured : kApplicationStateBackground;
}

/// The better one is what a person would mean who asks for an application of several processes.
int rank(std::int32_t state) {
    if (state == kApplicationStateForeground) return 2;
    return state == kApplicationStateForegroundObscured ? 1 : 0;
}

}  // namespace

X11Applications::X11Applications(std::string display, std::shared_ptr<BundleService> bundles)
    : display_(std::move(display)), bundles_(std::move(bundles)), watch_(display_) {}

X11Applications::~X11Applications() = default;

void X11Applications::setUpdateHandler(UpdateHandler handler) {
    const int order = handler_.with([](Installed& installed) {
        installed.handler.reset();
        return ++installed.order;
    });
    if (!handler) return watch_.setHandler(nullptr);
    const DesktopView seen = currentView();
    // In its turn, so that it hears nothing of what the one before it was still to hear.
    queue_.async([this, order, handler = std::move(handler), known = applicationsIn(seen, {})]() mutable {
        known_ = std::move(known);
        handler_.with([&](Installed& installed) {
            if (installed.order == order)
                installed.handler = std::make_shared<UpdateHandler>(std::move(handler));
        });
    });
    watch_.setHandler([this](const DesktopView& view) { queue_.async([this, view] { viewChanged(view); }); },
                      seen);
}

std::optional<ApplicationInformation> X11Applications::informationOfProcess(std::int32_t processIdentifier) {
    const Known known = currentApplications();
    const auto found = known.find(processIdentifier);
    return found != known.end() ? std::optional(found->second) : std::nullopt;
}

void X11Applications::informationOfApplication(std::string_view bundleIdentifier,
                                               InformationHandler handler) {
    if (!handler) return;
    queue_.async([this, identifier = std::string(bundleIdentifier), handler = std::move(handler)] {
        handler(find(identifier));
    });
}

std::int32_t X11Applications::stateOfApplication(std::string_view bundleIdentifier) {
    const auto found = find(bundleIdentifier);
    return found ? found->state : kApplicationStateUnknown;
}

std::optional<std::string> X11Applications::frontmostApplicationBundleIdentifier() {
    for (const auto& [process, information] : currentApplications()) {
        if (information.isFrontmost && !information.bundleIdentifier.empty())
            return information.bundleIdentifier;
    }
    return std::nullopt;
}

std::optional<ApplicationInformation> X11Applications::find(std::string_view bundleIdentifier) {
    std::optional<ApplicationInformation> best;
    for (const auto& [process, information] : currentApplications()) {
        const bool isMeant = !bundleIdentifier.empty() && information.bundleIdentifier == bundleIdentifier;
        if (isMeant && (!best || rank(information.state) > rank(best->state))) best = information;
    }
    return best;
}

DesktopView X11Applications::currentView() {
    const std::lock_guard lock(connectionMutex_);
    // A server that stands still would let what it is asked pile up.
    if (!reader_ || connection_->isBroken() || connection_->hasGivenUp()) {
        reader_.reset();
        connection_ = XConnection::open(display_);
        if (connection_) reader_ = DesktopReader::open(*connection_);
    }
    if (!reader_) return {};
    return reader_->read().value_or(DesktopView());
}

X11Applications::Known X11Applications::currentApplications() {
    return applicationsIn(currentView(), {});
}

/// What is known of a process's bundle is not asked again: a process that ends can no longer be asked.
X11Applications::Known X11Applications::applicationsIn(const DesktopView& view, const Known& before) const {
    Known known;
    for (const DesktopApplication& application : view.applications) {
        const auto earlier = before.find(application.processIdentifier);
        known[application.processIdentifier] = {
            stateOf(application), application.processIdentifier, application.isActive,
            earlier != before.end() ? earlier->second.bundleIdentifier
                                    : identifierOf(application.processIdentifier)};
    }
    return known;
}

std::string X11Applications::identifierOf(std::int32_t processIdentifier) const {
    const auto program = bundles_->executablePath(processIdentifier);
    if (!program) return {};
    const auto folder = bundles_->folderOfBundleOwning(*program);
    const BundleRef bundle = folder ? bundles_->bundleAtPath(*folder) : nullptr;
    const std::string identifier = bundle ? bundle->bundleIdentifier() : std::string();
    return identifier.empty() ? *program : identifier;
}

/// Tells of those that lost something before it tells who is in front now.
void X11Applications::viewChanged(const DesktopView& view) {
    const Known before = std::exchange(known_, applicationsIn(view, known_));
    std::vector<ApplicationInformation> changes;
    for (const auto& [process, information] : before) {
        if (known_.contains(process)) continue;
        changes.push_back({kApplicationStateTerminated, process, false, information.bundleIdentifier});
    }
    for (const bool isFrontmost : {false, true}) {
        for (const auto& [process, information] : known_) {
            const auto earlier = before.find(process);
            const bool isOld = earlier != before.end() && earlier->second.state == information.state &&
                               earlier->second.isFrontmost == information.isFrontmost;
            if (!isOld && information.isFrontmost == isFrontmost) changes.push_back(information);
        }
    }
    for (const ApplicationInformation& change : changes) {
        if (const auto handler = handler_.copy().handler) (*handler)(change);
    }
}

}  // namespace kelvo::x11
