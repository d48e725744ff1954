#include "platform/simulated/SimulatedDevice.h"

#include <cerrno>
#include <charconv>
#include <cmath>
#include <functional>
#include <map>
#include <optional>
#include <sstream>

namespace kelvo {
namespace {

using Words = std::vector<std::string>;
/// Does what a line says; false when its arguments make no sense.
using Command = std::function<bool(SimulatedDevice&, const Words& arguments)>;

template <typename Number>
std::optional<Number> numberFrom(const std::string& word) {
    Number number{};
    const auto [end, error] = std::from_chars(word.data(), word.data() + word.size(), number);
    if (error != std::errc() || end != word.data() + word.size()) return std::nullopt;
    return number;
}

Command simple(void (SimulatedDevice::*verb)()) {
    return [verb](SimulatedDevice& device, const Words& arguments) {
        if (arguments.empty()) (device.*verb)();
        return arguments.empty();
    };
}

Command allowRecording(bool isAllowed) {
    return [isAllowed](SimulatedDevice& device, const Words& arguments) {
        if (arguments.empty()) device.setScreenRecordingAllowed(isAllowed);
        return arguments.empty();
    };
}

bool setLayout(SimulatedDevice& device, const Words& arguments) {
    std::vector<int> levels;
    for (const std::string& word : arguments) {
        const auto level = numberFrom<int>(word);
        if (!level) return false;
        levels.push_back(*level);
    }
    device.setLayout(levels);
    return true;
}

bool setFreeSpace(SimulatedDevice& device, const Words& arguments) {
    const auto bytes = arguments.size() == 1 ? numberFrom<std::uint64_t>(arguments[0]) : std::nullopt;
    if (bytes) device.setFreeSpace(*bytes);
    return bytes.has_value();
}

/// The one argument as an interval of at most `longest` seconds.
std::optional<std::chrono::nanoseconds> intervalFrom(const Words& arguments, double longest) {
    const auto seconds = arguments.size() == 1 ? numberFrom<double>(arguments[0]) : std::nullopt;
    if (!seconds || !(*seconds >= 0 && *seconds <= longest)) return std::nullopt;
    return std::chrono::nanoseconds(std::llround(*seconds * 1e9));
}

bool advance(SimulatedDevice& device, const Words& arguments) {
    constexpr double kLongest = 1e9;  // some thirty years, well inside what nanoseconds can count
    const auto interval = intervalFrom(arguments, kLongest);
    if (interval) device.advance(*interval);
    return interval.has_value();
}

bool sound(SimulatedDevice& device, const Words& arguments) {
    constexpr double kLongest = 60;  // all of it is in memory at once
    const auto interval = intervalFrom(arguments, kLongest);
    if (!interval) return false;
    device.advance(*interval);
    device.audio->play(*interval);
    return true;
}

bool answer(SimulatedDevice& device, const Words& arguments) {
    static const std::map<std::string, SystemAlertResponse> kAnswers{
        {"default", SystemAlertResponse::defaultButton},
        {"alternate", SystemAlertResponse::alternateButton},
        {"other", SystemAlertResponse::otherButton},
        {"cancelled", SystemAlertResponse::cancelled},
    };
    const auto found = arguments.size() == 1 ? kAnswers.find(arguments[0]) : kAnswers.end();
    if (found == kAnswers.end()) return false;
    device.answerAlert(found->second);
    return true;
}

bool failNext(SimulatedDevice& device, const Words& arguments) {
    const auto code = arguments.size() == 2 ? numberFrom<int>(arguments[1]) : std::nullopt;
    if (code) device.failNext(arguments[0], *code);
    return code.has_value();
}

bool purge(SimulatedDevice& device, const Words& arguments) {
    const auto urgency = arguments.size() == 1 ? numberFrom<int>(arguments[0]) : std::nullopt;
    if (urgency) device.storagePurge->purge(*urgency);
    return urgency.has_value();
}

const std::map<std::string, Command>& commands() {
    static const std::map<std::string, Command> kCommands{
        {"lock", simple(&SimulatedDevice::lock)},
        {"unlock", simple(&SimulatedDevice::unlock)},
        {"ring", simple(&SimulatedDevice::ring)},
        {"dial", simple(&SimulatedDevice::dial)},
        {"hang-up", simple(&SimulatedDevice::hangUp)},
        {"settle", simple(&SimulatedDevice::settle)},
        {"forbid-recording", allowRecording(false)},
        {"allow-recording", allowRecording(true)},
        {"layout", setLayout},
        {"free-space", setFreeSpace},
        {"advance", advance},
        {"answer", answer},
        {"fail", failNext},
        {"purge", purge},
        {"take-microphone", simple(&SimulatedDevice::takeMicrophone)},
        {"give-microphone-back", simple(&SimulatedDevice::giveMicrophoneBack)},
        {"sound", sound},
    };
    return kCommands;
}

}  // namespace

OptionalError SimulatedDevice::perform(std::string_view line) {
    std::istringstream stream{std::string(line)};
    std::string verb;
    stream >> verb;
    Words arguments;
    for (std::string word; stream >> word;)
        arguments.push_back(word);
    const auto command = commands().find(verb);
    if (command == commands().end()) return KVError::posix(EINVAL, "unknown command \"" + verb + "\"");
    if (!command->second(*this, arguments))
        return KVError::posix(EINVAL, "arguments of \"" + std::string(line) + "\"");
    return std::nullopt;
}

}  // namespace kelvo
