#include "SoundServer.h"

#include "Eventually.h"

#include <cmath>
#include <csignal>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <numbers>
#include <vector>

namespace kelvo::test {
namespace {

/// With which a server that starts on a busy machine is waited for.
constexpr std::chrono::seconds kPatience{30};

/// One minute of a sine as raw little-endian samples.
std::string sine(int frequency) {
    constexpr int kRate = 44100;
    constexpr int kSeconds = 60;
    std::string samples;
    samples.reserve(2UL * kRate * kSeconds);
    for (int i = 0; i < kRate * kSeconds; ++i) {
        const double angle = 2 * std::numbers::pi * frequency * i / kRate;
        const auto value = static_cast<std::uint16_t>(std::lround(16384 * std::sin(angle)));
        samples += static_cast<char>(value & 0xFF);
        samples += static_cast<char>(value >> 8);
    }
    return samples;
}

}  // namespace

SoundServer::SoundServer(Kind kind)
    : kind_(kind), socket_(folder_.path() + (kind == Kind::pipeWire ? "/pulse/native" : "/socket")) {
    const std::string address = "unix:" + socket_;
    // Of the environment that every part of libpulse reads, and that no thread reads at this time.
    ::setenv("PULSE_SERVER", address.c_str(), 1);  // NOLINT(concurrency-mt-unsafe)
    ::setenv("HOME", folder_.path().c_str(), 1);   // NOLINT(concurrency-mt-unsafe)
}

SoundServer::~SoundServer() = default;

bool SoundServer::hasPipeWire() {
    return ChildProcess({"sh", "-c",
                         "for each in pipewire pipewire-pulse wireplumber dbus-daemon; do "
                         "command -v $each >/dev/null || exit 1; done"})
               .waitForExit() == 0;
}

bool SoundServer::start() {
    kill();
    for (const std::string& name : {socket_, folder_.path() + "/bus", folder_.path() + "/pipewire-0"})
        std::filesystem::remove(name);
    if (kind_ == Kind::pipeWire) {
        startPipeWire();
    } else {
        startPulseAudio();
    }
    const auto isReady = [this] {
        return hasDevices() && control("set-default-source mic") && control("set-default-sink speaker");
    };
    return eventually(isReady, kPatience);
}

void SoundServer::startPulseAudio() {
    run({"pulseaudio", "-n", "--daemonize=no", "--exit-idle-time=-1", "--use-pid-file=no",
         "--log-target=stderr", "-L", "module-native-protocol-unix socket=" + socket_ + " auth-anonymous=1",
         "-L", "module-null-sink sink_name=speaker rate=44100 norewinds=1", "-L",
         "module-null-sink sink_name=micfeed rate=44100 norewinds=1", "-L",
         "module-remap-source source_name=mic master=micfeed.monitor"});
}

/// Its session manager, which links programs to devices, does not go without a message bus. Each waits for
/// the one before.
void SoundServer::startPipeWire() {
    run({"dbus-daemon", "--session", "--nofork", "--nopidfile",
         "--address=unix:path=" + folder_.path() + "/bus"});
    awaitFile("bus");
    run({"pipewire"});
    awaitFile("pipewire-0");
    run({"wireplumber"});
    run({"pipewire-pulse"});
}

void SoundServer::awaitFile(const std::string& name) const {
    eventually([&] { return std::filesystem::exists(folder_.path() + "/" + name); }, kPatience);
}

void SoundServer::run(const std::vector<std::string>& command) {
    processes_.push_back(std::make_unique<ChildProcess>(
        command, std::map<std::string, std::string>{
                     {"XDG_RUNTIME_DIR", folder_.path()},
                     {"DBUS_SESSION_BUS_ADDRESS", "unix:path=" + folder_.path() + "/bus"}}));
}

/// PipeWire's are made once it answers.
bool SoundServer::hasDevices() const {
    if (!control("info")) return false;
    return kind_ == Kind::pulseAudio || answer("list short sources").find("\tmic\t") != std::string::npos ||
           makeDevices();
}

bool SoundServer::makeDevices() const {
    return control("load-module module-null-sink sink_name=speaker rate=44100") &&
           control("load-module module-null-sink sink_name=micfeed rate=44100") &&
           control("load-module module-remap-source source_name=mic master=micfeed.monitor");
}

void SoundServer::kill() {
    processes_.clear();
}

bool SoundServer::control(const std::string& command) const {
    return ChildProcess({"sh", "-c", "timeout 20 pactl " + command + " >/dev/null 2>&1"}).waitForExit() == 0;
}

std::string SoundServer::answer(const std::string& command) const {
    ChildProcess client({"sh", "-c", "timeout 20 pactl " + command + " >&2"});
    client.waitForExit();
    return client.output();
}

std::unique_ptr<ChildProcess> SoundServer::play(int frequency, const std::string& sink,
                                                std::optional<int> process) const {
    const std::string name = "tone" + std::to_string(frequency);
    if (!std::filesystem::exists(folder_.path() + "/" + name)) folder_.write(name, sine(frequency));
    std::map<std::string, std::string> environment;
    if (process) environment["PULSE_PROP"] = "application.process.id=" + std::to_string(*process);
    return std::make_unique<ChildProcess>(
        std::vector<std::string>{"pacat", "--playback", "--raw", "--rate=44100", "--channels=1",
                                 "--format=s16le", "--latency-msec=200", "--device=" + sink,
                                 folder_.path() + "/" + name},
        environment);
}

}  // namespace kelvo::test
