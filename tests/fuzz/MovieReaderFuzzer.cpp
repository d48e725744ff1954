#include "MemoryFile.h"
#include "platform/linux/media/MovieExport.h"
#include "platform/linux/media/MovieReader.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <unistd.h>

/// Any bytes are a movie within the bounds, or an error; and a movie that opens can be trimmed, or fails to
/// be.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    const test::MemoryFile file(data, size);
    if (!file) return 0;
    const auto reader = MovieReader::open(file.path());
    if (!reader) return 0;
    const double duration = (*reader)->duration().seconds();
    if (!(duration >= 0 && duration <= 8.0 * 24 * 60 * 60)) std::abort();
    if ((*reader)->tracks(MediaType::video).empty()) std::abort();
    for (int i = 0; i < 200; ++i) {
        const auto packet = (*reader)->next();
        if (!packet || *packet == nullptr) break;
        if ((*packet)->stream_index >= static_cast<int>((*reader)->context().nb_streams)) std::abort();
    }
    static_cast<void>((*reader)->seek(duration / 2));

    static const std::string kOutput = "/tmp/MovieReaderFuzzer." + std::to_string(::getpid()) + ".mp4";
    ExportControl control;
    static_cast<void>(exportPassThrough({file.path(), kOutput, std::nullopt, std::nullopt}, control));
    ::unlink(kOutput.c_str());
    return 0;
}
