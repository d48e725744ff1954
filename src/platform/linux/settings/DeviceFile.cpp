#include "platform/linux/settings/DeviceFile.h"

#include "base/KVLog.h"
#include "platform/linux/settings/JsonFile.h"

#include <cmath>
#include <map>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kPath = "/etc/kelvod/device.json";

std::optional<DeviceIdiom> idiomFrom(const Value& value) {
    static const std::map<std::string, DeviceIdiom> kIdioms{
        {"phone", DeviceIdiom::phone}, {"tablet", DeviceIdiom::tablet}, {"desktop", DeviceIdiom::desktop}};
    const std::string* name = value.asString();
    const auto found = name != nullptr ? kIdioms.find(*name) : kIdioms.end();
    return found != kIdioms.end() ? std::optional(found->second) : std::nullopt;
}

std::optional<float> orientationFrom(const Value& value) {
    const auto number = value.asDouble();
    return number && std::isfinite(*number) ? std::optional(static_cast<float>(*number)) : std::nullopt;
}

/// The property under `key` as `convert` reads it; none, with a line in the log, when that fails.
template <typename Convert>
auto property(const Dictionary& file, std::string_view key, Convert convert) -> decltype(convert(Value())) {
    const Value* value = file.find(key);
    if (value == nullptr) return std::nullopt;
    auto converted = convert(*value);
    if (!converted)
        KVLogError("device file: %s is wrong: %s", std::string(key).c_str(), value->description().c_str());
    return converted;
}

}  // namespace

DeviceFile::DeviceFile(const DeviceRoot& root, AskScreen askScreen) : askScreen_(std::move(askScreen)) {
    const Result<Dictionary> file = readJsonFile(root.hostPath(kPath));
    if (!file) {
        KVLogError("cannot read the device file: %s", file.error().localizedDescription().c_str());
        return;
    }
    const auto asBool = [](const Value& value) { return value.asBool(); };
    const auto asInteger = [](const Value& value) { return value.asInteger(); };
    idiom_ = property(*file, "idiom", idiomFrom).value_or(idiom_);
    isInternalBuild_ = property(*file, "internalBuild", asBool).value_or(isInternalBuild_);
    chipIdentifier_ = property(*file, "chipIdentifier", asInteger).value_or(chipIdentifier_);
    orientation_.set(property(*file, "mainScreenOrientation", orientationFrom));
    shutterClick_ = property(*file, "regionalBehaviorShutterClick", asBool);
}

std::optional<float> DeviceFile::mainScreenOrientation() {
    const std::optional<float> known = orientation_.copy();
    if (known || !askScreen_) return known;
    const std::optional<float> answer = askScreen_();
    if (answer) orientation_.set(answer);
    return answer;
}

}  // namespace kelvo
