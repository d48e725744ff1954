#include "platform/linux/media/MovieFile.h"

#include "base/MediaRecords.h"
#include "platform/linux/media/Fragment.h"
#include "platform/linux/media/FragmentReader.h"
#include "platform/linux/media/MovieHeader.h"
#include "platform/linux/media/MovieIndex.h"

#include <array>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <unistd.h>

namespace kelvo {
namespace {

/// A box's size and type, or the first half of a large box's header: what makes the bytes after it count.
constexpr std::size_t kHeadSize = 8;
/// Where the header's own box begins: behind the file type.
constexpr std::uint64_t kHeaderOffset = 32;
constexpr std::uint32_t kSizeFollowsTheType = 1;

std::int64_t nowInSeconds() {
    return std::chrono::duration_cast<std::chrono::seconds>(
               std::chrono::system_clock::now().time_since_epoch())
        .count();
}

}  // namespace

MovieFile::MovieFile(UniqueFd file, std::vector<TrackFormat> tracks, Durability durability)
    : file_(std::move(file)),
      tracks_(std::move(tracks)),
      durability_(durability),
      creationTime_(nowInSeconds()) {}

Result<std::unique_ptr<MovieFile>> MovieFile::create(const std::string& path, std::vector<TrackFormat> tracks,
                                                     Durability durability) {
    UniqueFd file(::open(path.c_str(), O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
    if (!file) return KVError::posix(errno, path);
    // The constructor is private, so that no movie file is without its header.
    std::unique_ptr<MovieFile> movie(new MovieFile(std::move(file), std::move(tracks), durability));
    if (const OptionalError error = movie->writeHeader()) {
        ::unlink(path.c_str());
        return *error;
    }
    return movie;
}

OptionalError MovieFile::writeHeader() {
    BoxWriter writer;
    writeFileType(writer);
    writeFragmentedHeader(writer, tracks_, creationTime_);
    // Fragments begin at multiples of 8, so that their heads never lie astride two pages.
    const std::size_t padding = (8 - writer.position() % 8) % 8;
    writer.box("free", [&] { writer.zeros(padding); });
    const std::span<const std::byte> header(writer.bytes());
    OptionalError error = commit(header.first(kHeadSize), {header.subspan(kHeadSize)});
    headerEnd_ = end_;
    return error;
}

/// Writes `head` and `rest` at the end of the file so that they count all at once: without their head the
/// rest reads as nothing, and eight aligned bytes are written or not.
OptionalError MovieFile::commit(std::span<const std::byte> head, Pieces rest) {
    std::uint64_t size = head.size();
    for (const auto& piece : rest)
        size += piece.size();
    OptionalError error = writeAt(file_.get(), end_ + head.size(), std::move(rest));
    if (!error) error = writeAt(file_.get(), end_, head);
    if (error) {
        // Should this fail too, what was half written still reads as nothing.
        static_cast<void>(::ftruncate(file_.get(), static_cast<off_t>(end_)));
        return error;
    }
    if (durability_ == Durability::synced) {
        // Starts the disk's work now, so that little is left to wait for when the movie is finished.
        static_cast<void>(::sync_file_range(file_.get(), static_cast<off_t>(end_), static_cast<off_t>(size),
                                            SYNC_FILE_RANGE_WRITE));
    }
    end_ += size;
    return std::nullopt;
}

OptionalError MovieFile::appendFragment(std::span<const SampleRun> runs) {
    static constexpr std::array<std::byte, 8> kPadding{};
    const FragmentHeader header = makeFragmentHeader(++sequenceNumber_, tracks_, runs);
    const std::span<const std::byte> headerBytes(header.bytes);
    Pieces rest{headerBytes.subspan(kHeadSize)};
    for (const SampleRun& run : runs)
        rest.emplace_back(run.data);
    rest.push_back(std::span(kPadding).first(header.padding));
    return commit(headerBytes.first(kHeadSize), std::move(rest));
}

OptionalError MovieFile::finish(const MediaTime& end) {
    OptionalError error = appendIndex(end);
    if (!error) error = sync();
    if (error) {
        static_cast<void>(::ftruncate(file_.get(), static_cast<off_t>(end_)));
        return error;
    }
    return turnIntoIndexedMovie();
}

/// The index goes behind the fragments, inside a box that says "skip me, to the end of the file".
OptionalError MovieFile::appendIndex(const MediaTime& end) {
    FragmentReader reader(file_.get(), headerEnd_, end_);
    BoxWriter writer(file_.get(), end_);
    writer.u32(0);
    writer.type("free");
    MovieIndex index(reader, tracks_, end);
    const OptionalError error = index.write(writer, creationTime_);
    const OptionalError writeError = writer.flush();
    return error ? error : writeError;
}

/// One write turns the header and the fragments into the data of an indexed movie: what was the header's box
/// now reaches up to the index, past the head of the box that hid it.
OptionalError MovieFile::turnIntoIndexedMovie() {
    BoxWriter head;
    head.u32(kSizeFollowsTheType);
    head.type("mdat");
    head.u64(end_ + kHeadSize - kHeaderOffset);
    if (OptionalError error = writeAt(file_.get(), kHeaderOffset, head.bytes())) return error;
    return sync();
}

OptionalError MovieFile::sync() const {
    if (durability_ == Durability::cached || ::fdatasync(file_.get()) == 0) return std::nullopt;
    return KVError::posix(errno, "movie file");
}

}  // namespace kelvo
