/// Makes movies out of movies, and prints what it took.
///
///     movie_export_bench trim SOURCE OUTPUT START SECONDS
///     movie_export_bench mix SOURCE OUTPUT
///     movie_export_bench finish OUTPUT SECONDS    (writes a movie of that length, without encoding, and
///     finishes it)

#include "ProcessorTime.h"
#include "platform/linux/media/LavMediaService.h"
#include "platform/linux/media/MovieFile.h"
#include "platform/linux/media/MovieReader.h"
#include "support/media/HostFileSystem.h"

#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <future>
#include <string>
#include <unistd.h>

namespace kelvo::test {
namespace {

using SteadyClock = std::chrono::steady_clock;

double secondsSince(SteadyClock::time_point begin) {
    return std::chrono::duration<double>(SteadyClock::now() - begin).count();
}

long residentKilobytes(const char* field) {
    std::ifstream status("/proc/self/status");
    for (std::string line; std::getline(status, line);) {
        if (line.starts_with(field)) return std::atol(line.substr(std::string(field).size() + 1).c_str());
    }
    return 0;
}

int exportMovie(ExportPreset preset, char** arguments, int count) {
    const auto begin = SteadyClock::now();
    LavMediaService service(std::make_shared<HostFileSystem>());
    const auto session = service.createExportSession(service.openAsset(URL::file(arguments[2])), preset);
    session->setOutputURL(URL::file(arguments[3]));
    if (count == 6) {
        session->setTimeRange({MediaTime::fromSeconds(std::atof(arguments[4]), 1000),
                               MediaTime::fromSeconds(std::atof(arguments[5]), 1000)});
    }
    std::promise<void> done;
    session->exportAsynchronously([&] { done.set_value(); });
    done.get_future().wait();
    std::printf("{\"seconds\": %.3f, \"processor\": %.3f}\n", secondsSince(begin), processorSeconds());
    return session->status() == ExportSession::Status::completed ? 0 : 1;
}

/// Half a second of a track at `rate` samples a second.
SampleRun run(std::uint32_t timescale, std::int64_t duration, std::size_t size, std::int64_t& time) {
    SampleRun made;
    for (const std::int64_t end = time + timescale / 2; time < end; time += duration) {
        made.samples.push_back({{time, 0, static_cast<std::uint32_t>(duration), made.empty()},
                                static_cast<std::uint32_t>(size)});
    }
    made.data.resize(made.samples.size() * size);
    return made;
}

int finishMovie(char** arguments) {
    TrackFormat video{
        .type = MediaType::video, .codecConfiguration = Bytes(30), .width = 1080, .height = 1920};
    TrackFormat audio{.type = MediaType::audio, .timescale = 44100, .codecConfiguration = Bytes(2)};
    auto file = MovieFile::create(arguments[2], {video, audio, audio}, MovieFile::Durability::synced);
    if (!file) return 1;
    std::array<std::int64_t, 3> times{};
    const int fragments = std::atoi(arguments[3]) * 2;
    for (int i = 0; i < fragments; ++i) {
        const std::array runs{run(90000, 1500, 10417, times[0]), run(44100, 1024, 371, times[1]),
                              run(44100, 1024, 371, times[2])};
        if ((*file)->appendFragment(runs)) return 1;
    }
    ::sync();  // a recording's early fragments lie on the disk long before it ends
    const long before = residentKilobytes("VmRSS:");
    const auto begin = SteadyClock::now();
    if ((*file)->finish(MediaTime::invalid())) return 1;
    std::printf("{\"seconds\": %.3f, \"kilobytes\": %ld}\n", secondsSince(begin),
                residentKilobytes("VmHWM:") - before);
    return 0;
}

}  // namespace
}  // namespace kelvo::test

int main(int count, char** arguments) {
    const std::string verb = count > 3 ? arguments[1] : "";
    if (verb == "trim" && count == 6) {
        return kelvo::test::exportMovie(kelvo::ExportPreset::passThrough, arguments, count);
    }
    if (verb == "mix") return kelvo::test::exportMovie(kelvo::ExportPreset::highestQuality, arguments, count);
    return verb == "finish" ? kelvo::test::finishMovie(arguments) : 2;
}
