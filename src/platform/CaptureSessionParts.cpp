#include "platform/CaptureSessionParts.h"

#include "platform/AudioErrors.h"

#include <algorithm>

namespace kelvo {
namespace {

template <typename Element>
bool contains(const std::vector<Element>& elements, const Element& element) {
    return std::ranges::find(elements, element) != elements.end();
}

}  // namespace

bool CaptureSessionParts::canAddInput(const CaptureInputRef& input) {
    return input && parts_.with([&](const Parts& parts) { return !contains(parts.inputs, input); });
}

void CaptureSessionParts::addInput(const CaptureInputRef& input) {
    if (!canAddInput(input)) return;
    parts_.with([&](Parts& parts) { parts.inputs.push_back(input); });
    partsChanged();
}

void CaptureSessionParts::removeInput(const CaptureInputRef& input) {
    parts_.with([&](Parts& parts) { std::erase(parts.inputs, input); });
    partsChanged();
}

bool CaptureSessionParts::canAddOutput(const CaptureOutputRef& output) {
    return output && parts_.with([&](const Parts& parts) { return !contains(parts.outputs, output); });
}

void CaptureSessionParts::addOutput(const CaptureOutputRef& output) {
    if (!canAddOutput(output)) return;
    parts_.with([&](Parts& parts) { parts.outputs.push_back(output); });
    partsChanged();
}

void CaptureSessionParts::removeOutput(const CaptureOutputRef& output) {
    parts_.with([&](Parts& parts) { std::erase(parts.outputs, output); });
    partsChanged();
}

void CaptureSessionParts::addObserver(std::weak_ptr<CaptureSessionObserver> observer,
                                      std::string_view keyPath) {
    const CaptureSessionObserver* key = observer.lock().get();
    parts_.with([&](Parts& parts) {
        parts.observations.push_back({std::string(keyPath), key, std::move(observer)});
    });
}

OptionalError CaptureSessionParts::removeObserver(const CaptureSessionObserver* observer,
                                                  std::string_view keyPath) {
    return parts_.with([&](Parts& parts) -> OptionalError {
        const auto found = std::ranges::find_if(parts.observations, [&](const Observation& observation) {
            return observation.key == observer && observation.keyPath == keyPath;
        });
        if (found == parts.observations.end()) {
            return audioError(kAudioInvalidParameter, "remove an observer that does not observe");
        }
        parts.observations.erase(found);
        return std::nullopt;
    });
}

void CaptureSessionParts::notifyObservers(std::string_view keyPath) {
    const auto observations = parts_.with([](const Parts& parts) { return parts.observations; });
    for (const Observation& observation : observations) {
        const auto observer = observation.keyPath == keyPath ? observation.observer.lock() : nullptr;
        if (observer) observer->observeValueForKeyPath(keyPath, *this);
    }
}

bool CaptureSessionParts::yieldsTo(const CaptureOutputRef& output) {
    return isRunning() && parts_.with([&](const Parts& parts) {
        return !parts.inputs.empty() && contains(parts.outputs, output);
    });
}

std::vector<CaptureOutputRef> CaptureSessionParts::outputs() const {
    return parts_.with([](const Parts& parts) { return parts.outputs; });
}
std::size_t CaptureSessionParts::inputCount() const {
    return parts_.with([](const Parts& parts) { return parts.inputs.size(); });
}
std::size_t CaptureSessionParts::outputCount() const {
    return parts_.with([](const Parts& parts) { return parts.outputs.size(); });
}
std::size_t CaptureSessionParts::observerCount() const {
    return parts_.with([](const Parts& parts) { return parts.observations.size(); });
}

}  // namespace kelvo
