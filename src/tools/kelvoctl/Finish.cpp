#include "tools/kelvoctl/Finish.h"

#include "tools/kelvoctl/DaemonSocket.h"
#include "tools/kelvoctl/MovieOutput.h"

#include <array>
#include <cstdio>

namespace kelvo::ctl {
namespace {

/// " 5.0 s", or nothing.
std::string lengthText(std::optional<double> seconds) {
    if (!seconds) return "";
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), " %.1f s", *seconds);
    return text.data();
}

void tellKept(Program& program, const std::string& where, Dictionary json, std::optional<double> seconds) {
    if (seconds) json.set("seconds", *seconds);
    program.answer("saved" + lengthText(seconds) + " to " + where, json);
    program.finish(kDone);
}

/// Mixing takes more than half of the time that was recorded.
void save(Program& program, const URL& movie, std::optional<double> seconds) {
    program.remark("saving; this takes a while after a long recording");
    program.daemon().saveVideoToCameraRoll(
        movie, program.onMain([&program, seconds](const OptionalError& error) {
            if (error) return program.fail(*error);
            tellKept(program, "the library", {{"saved", "library"}}, seconds);
        }));
}

void put(Program& program, const URL& movie, std::optional<double> seconds) {
    const std::string& output = program.line().output;
    if (const OptionalError error = takeMovie(movie, daemonSocket(program.line().socket), output)) {
        // Better in the library than lost.
        program.remark("kelvoctl: cannot put it there: " + error->localizedDescription());
        return save(program, movie, seconds);
    }
    // The session lets go of what it kept for this client.
    program.daemon().discardRecordingWithHandler(program.onMain([&program, seconds] {
        tellKept(program, program.line().output, {{"saved", program.line().output}}, seconds);
    }));
}

}  // namespace

void stopAndKeep(Program& program, std::optional<double> seconds) {
    program.daemon().stopRecordingWithHandler(
        program.onMain([&program, seconds](const std::optional<URL>& movie, const OptionalError& error) {
            if (!movie && error) return program.fail(*error);
            if (!movie) return program.fail("the recording had been stopped already", kRefused);
            if (program.line().output.empty()) return save(program, *movie, seconds);
            put(program, *movie, seconds);
        }));
}

}  // namespace kelvo::ctl
