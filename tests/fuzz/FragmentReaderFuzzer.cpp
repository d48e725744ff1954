#include "MemoryFile.h"
#include "platform/linux/media/FragmentReader.h"
#include "platform/linux/media/MovieIndex.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>

/// Any bytes are fragments that lie within the file, or an error; and an index of them can be made.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using namespace kelvo;
    const test::MemoryFile file(data, size);
    if (!file) return 0;
    FragmentReader reader(file.descriptor(), 0, size);
    std::size_t samples = 0;
    const auto count = [&](const FragmentReader::Run& run) { samples += run.samples.size(); };
    static_cast<void>(reader.forEachRun(count));
    if (samples > size) std::abort();

    const std::vector<TrackFormat> tracks{
        {.codecConfiguration = Bytes(30), .width = 16, .height = 16},
        {.type = MediaType::audio, .timescale = 44100, .lead = 1024, .codecConfiguration = Bytes(2)}};
    for (const MediaTime& end : {MediaTime::invalid(), MediaTime::make(1, 2)}) {
        BoxWriter writer;
        static_cast<void>(MovieIndex(reader, tracks, end).write(writer, 0));
        // Each sample has at most this much in the tables.
        if (writer.bytes().size() > 4096 + 64 * size) std::abort();
    }
    return 0;
}
