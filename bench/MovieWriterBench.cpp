/// Writes test pictures and two tones as a movie, as the daemon does, and prints what it cost.
///
///     movie_writer_bench RAW_VIDEO RAW_AUDIO WIDTH HEIGHT FRAMES BIT_RATE OUTPUT
///
/// RAW_VIDEO holds BGRx frames at 60 a second, RAW_AUDIO 16-bit stereo at 44100 Hz. bench/movies.py
/// makes them and runs the peer.

#include "CodecTime.h"
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
#include <memory>
#include <span>
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

/// The processor time of what this program does beside the movie: reading its input and waiting for its turn.
class Aside {
  public:
    template <typename Work>
    auto operator()(Work work) {
        const double begin = threadSeconds();
        auto result = work();
        seconds_ += threadSeconds() - begin;
        return result;
    }
    double seconds() const { return seconds_; }

  private:
    double seconds_ = 0;
};

bool readInto(std::span<std::byte> bytes, std::ifstream& file) {
    file.read(reinterpret_cast<char*>(bytes.data()), static_cast<std::streamsize>(bytes.size()));
    return !file.fail();
}

bool waitFor(const WriterInput& input) {
    while (!input.isReadyForMoreMediaData())
        ::usleep(200);
    return true;
}

int run(char** arguments) {
    const Size size{std::atof(arguments[3]), std::atof(arguments[4])};
    const int frames = std::atoi(arguments[5]);
    std::ifstream video(arguments[1], std::ios::binary);
    std::ifstream audio(arguments[2], std::ios::binary);
    Aside aside;
    LavMediaService service(std::make_shared<HostFileSystem>());
    TestMovie::Options options{.size = size};
    options.videoSettings = videoSettings(size, std::atoll(arguments[6]));
    const double before = processorSeconds();
    auto movie = std::make_unique<TestMovie>(service, arguments[7], options);
    if (!movie->start()) return 1;
    Pool pool(size);
    for (int i = 0; i < frames; ++i) {
        const double time = i / 60.0;
        const VideoSurfaceRef& surface = pool.next();
        const bool hasFrame =
            aside([&] { return waitFor(movie->video()) && readInto(surface->writablePixels(), video); });
        if (!hasFrame) return 2;
        TimingRecord timing;
        timing.presentationTime = MediaTime::make(movie->timeAt(time), 1000000000);
        movie->video().append(SampleBuffer::video(surface, timing));
        constexpr std::int64_t kSamples = 735;  // of a frame's time
        Bytes bytes(kSamples * 4);
        aside([&] { return readInto(bytes, audio) && waitFor(movie->audio1()) && waitFor(movie->audio2()); });
        const auto sound =
            SampleBuffer::audio(AudioFormatRecord::signed16(44100, 2), bytes, kSamples, timing);
        movie->audio1().append(sound);
        movie->audio2().append(sound);
    }
    const auto finishing = std::chrono::steady_clock::now();
    const bool isDone = movie->finish() == MediaFileWriter::Status::completed;
    const std::chrono::duration<double> finish = std::chrono::steady_clock::now() - finishing;
    movie.reset();  // closes the encoders, which tells what their threads took
    rusage usage{};
    ::getrusage(RUSAGE_SELF, &usage);
    const CodecTime codecs = codecTime();
    const double total = processorSeconds() - before;
    const double own = total - aside.seconds() - codecs.conversion - codecs.encoding;
    std::printf(
        "{\"processor\": %.3f, \"kilobytes\": %ld, \"finish\": %.3f, \"conversion\": %.3f, "
        "\"encoding\": %.3f, \"own\": %.3f}\n",
        total, usage.ru_maxrss, finish.count(), codecs.conversion, codecs.encoding, own);
    return isDone ? 0 : 1;
}

}  // namespace
}  // namespace kelvo::test

int main(int argumentCount, char** arguments) {
    return argumentCount == 8 ? kelvo::test::run(arguments) : 2;
}
