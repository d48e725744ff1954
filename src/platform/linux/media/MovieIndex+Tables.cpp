#include "platform/linux/media/MovieIndex.h"

#include <algorithm>
#include <optional>

namespace kelvo {
namespace {

/// Writes a table of equal numbers counted together, whose length shows only at its end.
class RunLengthTable {
  public:
    explicit RunLengthTable(BoxWriter& writer) : writer_(writer), countPosition_(writer.position()) {
        writer.u32(0);
    }
    void add(std::uint32_t number) {
        if (count_ > 0 && number != number_) close();
        number_ = number;
        ++count_;
    }
    void finish() {
        if (count_ > 0) close();
        writer_.patch32(countPosition_, entries_);
    }

  private:
    void close() {
        writer_.u32(count_);
        writer_.u32(number_);
        ++entries_;
        count_ = 0;
    }

    BoxWriter& writer_;
    const std::uint64_t countPosition_;
    std::uint32_t entries_ = 0;
    std::uint32_t count_ = 0;
    std::uint32_t number_ = 0;
};

}  // namespace

void MovieIndex::writeTables(BoxWriter& writer, std::size_t track) {
    writeDecodeTimes(writer, track);
    if (summaries_[track].hasCompositionOffsets) writeCompositionOffsets(writer, track);
    if (summaries_[track].hasOtherThanKeyFrames) writeKeyFrames(writer, track);
    writeChunkLengths(writer, track);
    writeSampleSizes(writer, track);
    writeChunkOffsets(writer, track);
}

template <typename Visit>
void MovieIndex::forEachKeptRun(std::size_t track, Visit&& visit) {
    std::uint64_t left = summaries_[track].samplesKept;
    const OptionalError error = reader_.forEachRun([&](const FragmentReader::Run& run) {
        if (run.track != track || left == 0) return;
        const std::uint64_t count = std::min<std::uint64_t>(left, run.samples.size());
        visit(run, count);
        left -= count;
    });
    if (error && !error_) error_ = error;
}

template <typename Visit>
void MovieIndex::forEachKeptSample(std::size_t track, Visit&& visit) {
    forEachKeptRun(track, [&](const FragmentReader::Run& run, std::uint64_t count) {
        std::int64_t decodeTime = run.firstDecodeTime;
        for (std::uint64_t i = 0; i < count; ++i) {
            SampleTiming timing = run.samples[i].timing;
            timing.decodeTime = decodeTime;
            decodeTime += timing.duration;
            visit(timing, run.samples[i].size);
        }
    });
}

void MovieIndex::writeDecodeTimes(BoxWriter& writer, std::size_t track) {
    const Summary& summary = summaries_[track];
    writer.fullBox("stts", 0, 0, [&] {
        RunLengthTable table(writer);
        std::optional<std::int64_t> previous;
        forEachKeptSample(track, [&](const SampleTiming& timing, std::uint32_t) {
            if (previous) table.add(static_cast<std::uint32_t>(timing.decodeTime - *previous));
            previous = timing.decodeTime;
        });
        if (previous) table.add(static_cast<std::uint32_t>(summary.presentationEnd - *previous));
        table.finish();
    });
}

void MovieIndex::writeCompositionOffsets(BoxWriter& writer, std::size_t track) {
    writer.fullBox("ctts", 1, 0, [&] {
        RunLengthTable table(writer);
        forEachKeptSample(track, [&](const SampleTiming& timing, std::uint32_t) {
            table.add(static_cast<std::uint32_t>(timing.compositionOffset));
        });
        table.finish();
    });
}

void MovieIndex::writeKeyFrames(BoxWriter& writer, std::size_t track) {
    writer.fullBox("stss", 0, 0, [&] {
        const std::uint64_t countPosition = writer.position();
        writer.u32(0);
        std::uint32_t number = 0;
        std::uint32_t count = 0;
        forEachKeptSample(track, [&](const SampleTiming& timing, std::uint32_t) {
            ++number;
            if (!timing.isKeyFrame) return;
            writer.u32(number);
            ++count;
        });
        writer.patch32(countPosition, count);
    });
}

/// One fragment's run is one chunk; chunks of equal length stand together.
void MovieIndex::writeChunkLengths(BoxWriter& writer, std::size_t track) {
    writer.fullBox("stsc", 0, 0, [&] {
        const std::uint64_t countPosition = writer.position();
        writer.u32(0);
        std::uint32_t chunk = 0;
        std::uint32_t entries = 0;
        std::uint64_t length = 0;
        forEachKeptRun(track, [&](const FragmentReader::Run&, std::uint64_t count) {
            ++chunk;
            if (count == length) return;
            length = count;
            writer.u32(chunk);
            writer.u32(static_cast<std::uint32_t>(count));
            writer.u32(1);
            ++entries;
        });
        writer.patch32(countPosition, entries);
    });
}

void MovieIndex::writeSampleSizes(BoxWriter& writer, std::size_t track) {
    writer.fullBox("stsz", 0, 0, [&] {
        writer.u32(0);
        writer.u32(static_cast<std::uint32_t>(summaries_[track].samplesKept));
        forEachKeptSample(track, [&](const SampleTiming&, std::uint32_t size) { writer.u32(size); });
    });
}

void MovieIndex::writeChunkOffsets(BoxWriter& writer, std::size_t track) {
    writer.fullBox("co64", 0, 0, [&] {
        const std::uint64_t countPosition = writer.position();
        writer.u32(0);
        std::uint32_t count = 0;
        forEachKeptRun(track, [&](const FragmentReader::Run& run, std::uint64_t) {
            writer.u64(run.dataOffset);
            ++count;
        });
        writer.patch32(countPosition, count);
    });
}

}  // namespace kelvo
