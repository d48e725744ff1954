#include "platform/linux/media/Fragment.h"

namespace kelvo {
namespace {

constexpr std::uint32_t kKeyFrameFlags = 0x02000000;    // depends on no other sample
constexpr std::uint32_t kOtherFrameFlags = 0x01000000;  // depends on others

/// Returns where the data offset must be filled in.
std::uint64_t writeRun(BoxWriter& writer, const SampleRun& run) {
    std::uint64_t dataOffsetPosition = 0;
    writer.fullBox("trun", 1, kRunContent, [&] {
        writer.u32(static_cast<std::uint32_t>(run.samples.size()));
        dataOffsetPosition = writer.position();
        writer.u32(0);
        for (const auto& [timing, size] : run.samples) {
            writer.u32(timing.duration);
            writer.u32(size);
            writer.u32(timing.isKeyFrame ? kKeyFrameFlags : kOtherFrameFlags | kSampleIsNoKeyFrame);
            writer.u32(static_cast<std::uint32_t>(timing.compositionOffset));
        }
    });
    return dataOffsetPosition;
}

std::uint64_t writeTrackFragment(BoxWriter& writer, const TrackFormat& track, std::uint32_t identifier,
                                 const SampleRun& run) {
    std::uint64_t dataOffsetPosition = 0;
    writer.box("traf", [&] {
        writer.fullBox("tfhd", 0, kBaseIsFragment, [&] { writer.u32(identifier); });
        writer.fullBox("tfdt", 1, 0, [&] {
            writer.u64(static_cast<std::uint64_t>(run.samples.front().timing.decodeTime + track.lead));
        });
        dataOffsetPosition = writeRun(writer, run);
    });
    return dataOffsetPosition;
}

}  // namespace

FragmentHeader makeFragmentHeader(std::uint32_t sequenceNumber, std::span<const TrackFormat> tracks,
                                  std::span<const SampleRun> runs) {
    BoxWriter writer;
    std::vector<std::uint64_t> dataOffsetPositions;
    std::size_t dataSize = 0;
    writer.box("moof", [&] {
        writer.fullBox("mfhd", 0, 0, [&] { writer.u32(sequenceNumber); });
        for (std::size_t i = 0; i < runs.size(); ++i) {
            if (runs[i].empty()) continue;
            dataOffsetPositions.push_back(
                writeTrackFragment(writer, tracks[i], static_cast<std::uint32_t>(i + 1), runs[i]));
        }
    });
    std::size_t dataOffset = writer.position() + 8;
    auto position = dataOffsetPositions.begin();
    for (const SampleRun& run : runs) {
        if (run.empty()) continue;
        writer.patch32(*position++, static_cast<std::uint32_t>(dataOffset + dataSize));
        dataSize += run.data.size();
    }
    const std::size_t padding = (8 - (dataOffset + dataSize) % 8) % 8;
    writer.u32(static_cast<std::uint32_t>(8 + dataSize + padding));
    writer.type("mdat");
    return {writer.bytes(), padding};
}

}  // namespace kelvo
