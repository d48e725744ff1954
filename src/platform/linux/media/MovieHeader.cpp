#include "platform/linux/media/MovieHeader.h"

namespace kelvo {
namespace {

constexpr std::int64_t kSecondsFrom1904To1970 = 2082844800;
constexpr std::uint16_t kUndeterminedLanguage = 0x55C4;
constexpr std::uint32_t kSyncSampleFlags = 0x02000000;

std::uint64_t fileTime(std::int64_t secondsSince1970) {
    return static_cast<std::uint64_t>(secondsSince1970 + kSecondsFrom1904To1970);
}

void writeMatrix(BoxWriter& writer, const TrackFormat::Matrix& matrix) {
    for (const std::int32_t number : matrix)
        writer.u32(static_cast<std::uint32_t>(number));
}

void writeVideoEntry(BoxWriter& writer, const TrackFormat& track) {
    writer.box("avc1", [&] {
        writer.zeros(6);
        writer.u16(1);  // data reference
        writer.zeros(16);
        writer.u16(track.width);
        writer.u16(track.height);
        writer.u32(0x00480000);  // 72 dots an inch, both ways
        writer.u32(0x00480000);
        writer.u32(0);
        writer.u16(1);     // one frame a sample
        writer.zeros(32);  // compressor name
        writer.u16(0x18);  // depth
        writer.u16(0xFFFF);
        writer.box("avcC", [&] { writer.bytes(track.codecConfiguration); });
        if (!track.hasOwnColours) return;
        writer.box("colr", [&] {
            writer.type("nclx");
            for (int i = 0; i < 3; ++i)
                writer.u16(6);  // SMPTE 170M primaries, transfer and matrix
            writer.u8(0);       // limited range
        });
    });
}

void writeDescriptor(BoxWriter& writer, std::uint8_t tag, std::size_t size) {
    writer.u8(tag);
    for (int shift = 21; shift > 0; shift -= 7)
        writer.u8(static_cast<std::uint8_t>(0x80 | (size >> shift & 0x7F)));
    writer.u8(static_cast<std::uint8_t>(size & 0x7F));
}

/// The elementary stream descriptor: nested descriptors, each with a tag and a size in front.
void writeStreamDescriptor(BoxWriter& writer, const TrackFormat& track) {
    constexpr std::size_t kHead = 5;  // tag and size
    const std::size_t specific = track.codecConfiguration.size();
    const std::size_t decoder = 13 + kHead + specific;
    writer.fullBox("esds", 0, 0, [&] {
        writeDescriptor(writer, 0x03, 3 + kHead + decoder + kHead + 1);
        writer.u16(0);
        writer.u8(0);
        writeDescriptor(writer, 0x04, decoder);
        writer.u8(0x40);  // MPEG-4 audio
        writer.u8(0x15);  // audio stream
        writer.u24(0);
        writer.u32(track.bitRate);
        writer.u32(track.bitRate);
        writeDescriptor(writer, 0x05, specific);
        writer.bytes(track.codecConfiguration);
        writeDescriptor(writer, 0x06, 1);
        writer.u8(2);
    });
}

void writeAudioEntry(BoxWriter& writer, const TrackFormat& track) {
    writer.box("mp4a", [&] {
        writer.zeros(6);
        writer.u16(1);  // data reference
        writer.zeros(8);
        writer.u16(track.channelCount);
        writer.u16(16);
        writer.u32(0);
        // 16.16 fixed point; what does not fit is told by the codec configuration alone.
        writer.u32(track.sampleRate <= 0xFFFF ? track.sampleRate << 16 : 0);
        writeStreamDescriptor(writer, track);
    });
}

void writeEmptyTables(BoxWriter& writer) {
    writer.fullBox("stts", 0, 0, [&] { writer.u32(0); });
    writer.fullBox("stsc", 0, 0, [&] { writer.u32(0); });
    writer.fullBox("stsz", 0, 0, [&] { writer.u64(0); });
    writer.fullBox("stco", 0, 0, [&] { writer.u32(0); });
}

void writeFragmentedTrack(BoxWriter& writer, const TrackFormat& track, std::uint32_t identifier,
                          std::int64_t creationTime) {
    writer.box("trak", [&] {
        writeTrackHeader(writer, track, identifier, creationTime, 0);
        if (track.lead > 0) {
            writer.box("edts", [&] {
                writer.fullBox("elst", 1, 0, [&] {
                    writer.u32(1);
                    writer.u64(0);  // as long as the fragments go
                    writer.u64(static_cast<std::uint64_t>(track.lead));
                    writer.u32(0x10000);
                });
            });
        }
        writer.box("mdia", [&] {
            writeMediaHeader(writer, track, 0);
            writeHandler(writer, track);
            writer.box("minf", [&] {
                writeMediaInformation(writer, track);
                writer.box("stbl", [&] {
                    writeSampleDescription(writer, track);
                    writeEmptyTables(writer);
                });
            });
        });
    });
}

}  // namespace

void writeFileType(BoxWriter& writer) {
    writer.box("ftyp", [&] {
        writer.type("isom");
        writer.u32(0x200);
        writer.type("isom");
        writer.type("iso5");
        writer.type("avc1");
        writer.type("mp41");
    });
}

void writeMovieHeader(BoxWriter& writer, std::int64_t creationTime, std::uint64_t duration,
                      std::size_t trackCount) {
    writer.fullBox("mvhd", 1, 0, [&] {
        writer.u64(fileTime(creationTime));
        writer.u64(fileTime(creationTime));
        writer.u32(kMovieTimescale);
        writer.u64(duration);
        writer.u32(0x10000);  // rate
        writer.u16(0x100);    // volume
        writer.zeros(10);
        writeMatrix(writer, TrackFormat::kUpright);
        writer.zeros(24);
        writer.u32(static_cast<std::uint32_t>(trackCount + 1));  // next track
    });
}

void writeTrackHeader(BoxWriter& writer, const TrackFormat& track, std::uint32_t identifier,
                      std::int64_t creationTime, std::uint64_t duration) {
    constexpr std::uint32_t kEnabledInMovie = 3;
    writer.fullBox("tkhd", 1, kEnabledInMovie, [&] {
        writer.u64(fileTime(creationTime));
        writer.u64(fileTime(creationTime));
        writer.u32(identifier);
        writer.u32(0);
        writer.u64(duration);
        writer.zeros(12);
        writer.u16(track.type == MediaType::audio ? 0x100 : 0);  // volume
        writer.u16(0);
        writeMatrix(writer, track.matrix);
        writer.u32(std::uint32_t{track.width} << 16);
        writer.u32(std::uint32_t{track.height} << 16);
    });
}

void writeMediaHeader(BoxWriter& writer, const TrackFormat& track, std::uint64_t duration) {
    writer.fullBox("mdhd", 1, 0, [&] {
        writer.zeros(16);
        writer.u32(track.timescale);
        writer.u64(duration);
        writer.u16(kUndeterminedLanguage);
        writer.u16(0);
    });
}

void writeHandler(BoxWriter& writer, const TrackFormat& track) {
    writer.fullBox("hdlr", 0, 0, [&] {
        writer.u32(0);
        if (track.type == MediaType::video) {
            writer.type("vide");
        } else {
            writer.type("soun");
        }
        writer.zeros(12);
        writer.u8(0);  // no name
    });
}

void writeMediaInformation(BoxWriter& writer, const TrackFormat& track) {
    if (track.type == MediaType::video) {
        writer.fullBox("vmhd", 0, 1, [&] { writer.u64(0); });
    } else {
        writer.fullBox("smhd", 0, 0, [&] { writer.u32(0); });
    }
    writer.box("dinf", [&] {
        writer.fullBox("dref", 0, 0, [&] {
            writer.u32(1);
            writer.fullBox("url ", 0, 1, [] {});  // the data lie in this file
        });
    });
}

void writeSampleDescription(BoxWriter& writer, const TrackFormat& track) {
    writer.fullBox("stsd", 0, 0, [&] {
        writer.u32(1);
        if (track.type == MediaType::video) {
            writeVideoEntry(writer, track);
        } else {
            writeAudioEntry(writer, track);
        }
    });
}

void writeFragmentedHeader(BoxWriter& writer, const std::vector<TrackFormat>& tracks,
                           std::int64_t creationTime) {
    writer.box("moov", [&] {
        writeMovieHeader(writer, creationTime, 0, tracks.size());
        for (std::size_t i = 0; i < tracks.size(); ++i)
            writeFragmentedTrack(writer, tracks[i], static_cast<std::uint32_t>(i + 1), creationTime);
        writer.box("mvex", [&] {
            for (std::size_t i = 0; i < tracks.size(); ++i) {
                writer.fullBox("trex", 0, 0, [&] {
                    writer.u32(static_cast<std::uint32_t>(i + 1));
                    writer.u32(1);
                    writer.u64(0);
                    writer.u32(kSyncSampleFlags);
                });
            }
        });
    });
}

}  // namespace kelvo
