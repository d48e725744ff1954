#include "platform/linux/media/MovieIndex.h"

#include <algorithm>
#include <limits>

namespace kelvo {
namespace {

constexpr std::int64_t kNoEnd = std::numeric_limits<std::int64_t>::max();

std::uint64_t inMovieTime(std::int64_t time, std::uint32_t timescale) {
    const MediaTime converted =
        MediaTime::make(time, static_cast<std::int32_t>(timescale)).convertedTo(kMovieTimescale);
    return static_cast<std::uint64_t>(std::max<std::int64_t>(converted.value, 0));
}

}  // namespace

MovieIndex::MovieIndex(FragmentReader& reader, const std::vector<TrackFormat>& tracks, const MediaTime& end)
    : reader_(reader), tracks_(tracks), summaries_(tracks.size()) {
    for (const TrackFormat& track : tracks) {
        const MediaTime time = end.convertedTo(static_cast<std::int32_t>(track.timescale));
        ends_.push_back(time.isValid() ? time.value + track.lead : kNoEnd);
    }
}

OptionalError MovieIndex::write(BoxWriter& writer, std::int64_t creationTime) {
    error_ = reader_.forEachRun([this](const FragmentReader::Run& run) {
        if (run.track < summaries_.size()) summarize(run);
    });
    if (error_) return error_;
    clipToEnd();
    std::uint64_t duration = 0;
    for (std::size_t i = 0; i < tracks_.size(); ++i)
        duration = std::max(duration, extent(i).presentationStart + extent(i).presentationDuration);
    writer.box("moov", [&] {
        writeMovieHeader(writer, creationTime, duration, tracks_.size());
        for (std::size_t i = 0; i < tracks_.size(); ++i)
            writeTrack(writer, i, creationTime);
    });
    return error_;
}

void MovieIndex::summarize(const FragmentReader::Run& run) {
    Summary& summary = summaries_[run.track];
    std::int64_t decodeTime = run.firstDecodeTime;
    if (summary.samplesSeen == 0) summary.firstDecodeTime = decodeTime;
    for (const auto& [timing, size] : run.samples) {
        const std::int64_t presentation = decodeTime + timing.compositionOffset;
        ++summary.samplesSeen;
        if (presentation < ends_[run.track] || summary.samplesSeen == 1) {
            summary.samplesKept = summary.samplesSeen;
            summary.lastDecodeTime = decodeTime;
            summary.presentationEnd =
                std::max(summary.presentationEnd, presentation + std::int64_t{timing.duration});
        }
        summary.hasCompositionOffsets |= timing.compositionOffset != 0;
        summary.hasOtherThanKeyFrames |= !timing.isKeyFrame;
        decodeTime += timing.duration;
    }
}

/// What is shown when the end comes is shown until then, and nothing is shown after it.
void MovieIndex::clipToEnd() {
    for (std::size_t i = 0; i < tracks_.size(); ++i) {
        Summary& summary = summaries_[i];
        if (ends_[i] == kNoEnd || summary.samplesKept == 0) continue;
        const bool lastsUntilEnd =
            tracks_[i].type == MediaType::video || summary.samplesKept < summary.samplesSeen;
        const std::int64_t end = lastsUntilEnd ? ends_[i] : std::min(ends_[i], summary.presentationEnd);
        summary.presentationEnd = std::max(end, summary.lastDecodeTime + 1);
    }
}

TrackExtent MovieIndex::extent(std::size_t track) const {
    const Summary& summary = summaries_[track];
    if (summary.samplesKept == 0) return {};
    const std::uint32_t timescale = tracks_[track].timescale;
    // The first `lead` of the media is never shown; what follows begins where it was decoded to begin.
    const std::uint64_t start = inMovieTime(summary.firstDecodeTime, timescale);
    const std::uint64_t end = inMovieTime(summary.presentationEnd - tracks_[track].lead, timescale);
    return {static_cast<std::uint64_t>(summary.presentationEnd - summary.firstDecodeTime), start,
            end > start ? end - start : 0};
}

void MovieIndex::writeTrack(BoxWriter& writer, std::size_t track, std::int64_t creationTime) {
    const TrackFormat& format = tracks_[track];
    const TrackExtent lasting = extent(track);
    writer.box("trak", [&] {
        writeTrackHeader(writer, format, static_cast<std::uint32_t>(track + 1), creationTime,
                         lasting.presentationStart + lasting.presentationDuration);
        if (summaries_[track].samplesKept > 0) writeEdits(writer, track);
        writer.box("mdia", [&] {
            writeMediaHeader(writer, format, lasting.mediaDuration);
            writeHandler(writer, format);
            writer.box("minf", [&] {
                writeMediaInformation(writer, format);
                writer.box("stbl", [&] {
                    writeSampleDescription(writer, format);
                    writeTables(writer, track);
                });
            });
        });
    });
}

void MovieIndex::writeEdits(BoxWriter& writer, std::size_t track) {
    const TrackExtent lasting = extent(track);
    const bool beginsLate = lasting.presentationStart > 0;
    writer.box("edts", [&] {
        writer.fullBox("elst", 1, 0, [&] {
            writer.u32(beginsLate ? 2 : 1);
            if (beginsLate) {
                writer.u64(lasting.presentationStart);
                writer.u64(std::numeric_limits<std::uint64_t>::max());  // nothing is shown
                writer.u32(0x10000);
            }
            writer.u64(lasting.presentationDuration);
            writer.u64(static_cast<std::uint64_t>(tracks_[track].lead));
            writer.u32(0x10000);
        });
    });
}

}  // namespace kelvo
