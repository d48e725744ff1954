/// Writes test pictures and two tones as a movie, as the daemon does, and prints what it cost.
///
///     movie_writer_bench RAW_VIDEO RAW_AUDIO WIDTH HEIGHT FRAMES BIT_RATE OUTPUT
///
/// RAW_VIDEO holds BGRx frames at 60 a second, RAW_AUDIO 16-bit stereo at 44100 Hz. bench/movies.py
/// makes them and runs the peer.

#include "ProcessorTime.h"
#include "platform/MediaSettings.h"
#include "platform/linux/media/LavMediaService.h"
#include "support/media/HostFileSystem.h"
#include "support/media/TestMovie.h"

#include <array>
#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <sys/resource.h>
#include <unistd.h>

namespace kelvo::test {
namespace {

/// A bounded pool of surfaces, as a screen source has one.
class Pool {
  public:
    explicit Pool(const Size& size) {
        const auto geometry = VideoSurface::Geometry::packed(static_cast<std::uint32_t>(size.width),
                                                             static_cast<std::uint32_t>(size.height));
        for (VideoSurfaceRef& surface : surfaces_)
            surface = VideoSurface::create(geometry).valueOr(nullptr);
    }
    const VideoSurfaceRef& next() { return surfaces_[index_++ % surfaces_.size()]; }

  private:
    std::array<VideoSurfaceRef, 4> surfaces_;  // one to draw into while three wait to be encoded
    std::size_t index_ = 0;
};

int run(char** arguments) {
    const Size size{std::atof(arguments[3]), std::atof(arguments[4])};
    const int frames = std::atoi(arguments[5]);
    std::ifstream video(arguments[1], std::ios::binary);
    std::ifstream audio(arguments[2], std::ios::binary);
    LavMediaService service(std::make_shared<HostFileSystem>());
    TestMovie::Options options{.size = size};
    options.videoSettings = videoSettings(size, std::atoll(arguments[6]));
    TestMovie movie(service, arguments[7], options);
    if (!movie.start()) return 1;
    Pool pool(size);
    const double before = processorSeconds();
    for (int i = 0; i < frames; ++i) {
        const double time = i / 60.0;
        const VideoSurfaceRef& surface = pool.next();
        while (!movie.video().isReadyForMoreMediaData())
            ::usleep(200);
        const auto pixels = surface->writablePixels();
        video.read(reinterpret_cast<char*>(pixels.data()), static_cast<std::streamsize>(pixels.size()));
        if (!video) return 2;
        TimingRecord timing;
        timing.presentationTime = MediaTime::make(movie.timeAt(time), 1000000000);
        movie.video().append(SampleBuffer::video(surface, timing));
        constexpr std::int64_t kSamples = 735;  // of a frame's time
        Bytes bytes(kSamples * 4);
        audio.read(reinterpret_cast<char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
        const auto sound =
            SampleBuffer::audio(AudioFormatRecord::signed16(44100, 2), bytes, kSamples, timing);
        movie.appendWhenReady(movie.audio1(), sound);
        movie.appendWhenReady(movie.audio2(), sound);
    }
    const auto finishing = std::chrono::steady_clock::now();
    const bool isDone = movie.finish() == MediaFileWriter::Status::completed;
    rusage usage{};
    ::getrusage(RUSAGE_SELF, &usage);
    std::printf("{\"processor\": %.3f, \"kilobytes\": %ld, \"finish\": %.3f}\n", processorSeconds() - before,
                usage.ru_maxrss,
                std::chrono::duration<double>(std::chrono::steady_clock::now() - finishing).count());
    return isDone ? 0 : 1;
}

}  // namespace
}  // namespace kelvo::test

int main(int argumentCount, char** arguments) {
    return argumentCount == 8 ? kelvo::test::run(arguments) : 2;
}
