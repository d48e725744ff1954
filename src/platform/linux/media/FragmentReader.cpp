#include "platform/linux/media/FragmentReader.h"

#include "base/MediaRecords.h"
#include "platform/MediaErrors.h"
#include "platform/linux/media/BoxReader.h"
#include "platform/linux/media/FileWriting.h"
#include "platform/linux/media/Fragment.h"

#include <algorithm>

namespace kelvo {
namespace {

/// Enough for nearly every fragment's header, so that one read does.
constexpr std::size_t kFirstRead = 4 * 1024;
/// No time of a movie is later, and none of its samples' ends overflows.
constexpr std::uint64_t kLatestTime = std::uint64_t{1} << 56;

KVError damaged() {
    return mediaError(kMediaErrorUnreadableMovie, "a fragment of the movie is damaged");
}

/// Fills `run` from the content of a track run.
bool readRun(std::span<const std::byte> content, std::uint64_t fragmentStart, FragmentReader::Run& run) {
    BoxReader reader(content);
    const std::uint32_t versionAndFlags = reader.u32();
    const std::uint32_t count = reader.u32();
    run.dataOffset = fragmentStart + reader.u32();
    constexpr std::size_t kBytesPerSample = 16;
    if ((versionAndFlags & 0xFFFFFF) != kRunContent || count > content.size() / kBytesPerSample) return false;
    run.samples.resize(count);
    for (auto& [timing, size] : run.samples) {
        timing.duration = reader.u32();
        size = reader.u32();
        timing.isKeyFrame = (reader.u32() & kSampleIsNoKeyFrame) == 0;
        timing.compositionOffset = static_cast<std::int32_t>(reader.u32());
    }
    return reader.isGood();
}

}  // namespace

OptionalError FragmentReader::forEachRun(const Visit& visit) {
    for (std::uint64_t position = begin_; position < end_;) {
        if (OptionalError error = readFragment(position, visit)) return error;
    }
    return std::nullopt;
}

OptionalError FragmentReader::readFragment(std::uint64_t& position, const Visit& visit) {
    const std::uint64_t left = end_ - position;
    buffer_.resize(std::max<std::size_t>(buffer_.size(), kFirstRead));
    std::size_t wanted = std::min<std::uint64_t>(buffer_.size(), left);
    if (readAt(descriptor_, position, std::span(buffer_).first(wanted)) !=
        static_cast<std::int64_t>(wanted)) {
        return damaged();
    }
    BoxReader header(std::span<const std::byte>(buffer_).first(wanted));
    const std::size_t size = header.u32();
    if (header.u32() != fourCharacterCode("moof") || size > left - std::min<std::uint64_t>(left, 8)) {
        return damaged();
    }
    if (size + BoxReader::kHeaderSize > wanted) {
        wanted = size + BoxReader::kHeaderSize;
        buffer_.resize(wanted);
        if (readAt(descriptor_, position, buffer_) != static_cast<std::int64_t>(wanted)) return damaged();
    }
    BoxReader boxes(std::span<const std::byte>(buffer_).first(size + BoxReader::kHeaderSize));
    const auto fragment = boxes.box();
    const std::uint32_t dataSize = boxes.u32();
    if (!fragment || boxes.u32() != fourCharacterCode("mdat") || dataSize < BoxReader::kHeaderSize) {
        return damaged();
    }
    BoxReader parts(fragment->content);
    while (const auto part = parts.box()) {
        if (part->type == fourCharacterCode("traf") && !visitTrackFragment(part->content, position, visit)) {
            return damaged();
        }
    }
    position += size + dataSize;
    return std::nullopt;
}

bool FragmentReader::visitTrackFragment(std::span<const std::byte> content, std::uint64_t fragmentStart,
                                        const Visit& visit) {
    BoxReader boxes(content);
    bool hasRun = false;
    while (const auto box = boxes.box()) {
        BoxReader fields(box->content);
        if (box->type == fourCharacterCode("tfhd")) {
            fields.u32();
            run_.track = std::size_t{fields.u32()} - 1;
        } else if (box->type == fourCharacterCode("tfdt")) {
            fields.u32();
            const std::uint64_t time = fields.u64();
            if (time > kLatestTime) return false;
            run_.firstDecodeTime = static_cast<std::int64_t>(time);
        } else if (box->type == fourCharacterCode("trun")) {
            hasRun = readRun(box->content, fragmentStart, run_);
        }
        if (!fields.isGood()) return false;
    }
    if (hasRun) visit(run_);
    return hasRun;
}

}  // namespace kelvo
