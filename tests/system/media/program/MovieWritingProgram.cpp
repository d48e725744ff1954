/// Records a movie at the pace of the clock: movie_writing_program PATH SECONDS. Says "recording" when the
/// movie's time begins and "finishing" when it ends, on standard error. Made to be killed.

#include "platform/linux/media/LavMediaService.h"
#include "support/media/HostFileSystem.h"
#include "support/media/TestMovie.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <thread>

int main(int argumentCount, char** arguments) {
    using namespace kelvo;
    if (argumentCount != 3) return 2;
    const double length = std::atof(arguments[2]);
    LavMediaService service(std::make_shared<test::HostFileSystem>());
    test::TestMovie movie(service, arguments[1], {.frameRate = 20});
    if (!movie.start()) return 1;
    const auto begin = std::chrono::steady_clock::now();
    std::fputs("recording\n", stderr);
    constexpr double kStep = 0.05;
    for (double time = kStep; time < length + kStep / 2; time += kStep) {
        movie.recordUntil(time);
        std::this_thread::sleep_until(begin + std::chrono::duration<double>(time));
    }
    std::fputs("finishing\n", stderr);
    return movie.finish() == MediaFileWriter::Status::completed ? 0 : 1;
}
