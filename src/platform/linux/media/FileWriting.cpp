#include "platform/linux/media/FileWriting.h"

#include <algorithm>
#include <cerrno>
#include <sys/uio.h>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr std::size_t kMostPieces = 64;  // in one system call

ssize_t writeSome(int descriptor, std::uint64_t offset, std::span<const std::span<const std::byte>> pieces) {
    std::vector<iovec> vectors;
    for (const auto& piece : pieces.first(std::min(pieces.size(), kMostPieces)))
        // The system call does not write to what it is given; its structure just cannot say so.
        vectors.push_back({const_cast<std::byte*>(piece.data()), piece.size()});
    return ::pwritev(descriptor, vectors.data(), static_cast<int>(vectors.size()),
                     static_cast<off_t>(offset));
}

}  // namespace

OptionalError writeAt(int descriptor, std::uint64_t offset, std::span<const std::byte> bytes) {
    return writeAt(descriptor, offset, Pieces{bytes});
}

OptionalError writeAt(int descriptor, std::uint64_t offset, Pieces pieces) {
    std::size_t first = 0;
    while (true) {
        while (first < pieces.size() && pieces[first].empty())
            ++first;
        if (first == pieces.size()) return std::nullopt;
        const ssize_t written = writeSome(descriptor, offset, std::span(pieces).subspan(first));
        if (written < 0 && errno == EINTR) continue;
        if (written <= 0) return KVError::posix(written < 0 ? errno : EIO, "movie file");
        offset += static_cast<std::uint64_t>(written);
        auto left = static_cast<std::size_t>(written);
        for (std::size_t i = first; left > 0; ++i) {
            const std::size_t taken = std::min(left, pieces[i].size());
            pieces[i] = pieces[i].subspan(taken);
            left -= taken;
        }
    }
}

std::int64_t readAt(int descriptor, std::uint64_t offset, std::span<std::byte> bytes) {
    std::size_t done = 0;
    while (done < bytes.size()) {
        const ssize_t got =
            ::pread(descriptor, bytes.data() + done, bytes.size() - done, static_cast<off_t>(offset + done));
        if (got < 0 && errno == EINTR) continue;
        if (got < 0) return -1;
        if (got == 0) break;
        done += static_cast<std::size_t>(got);
    }
    return static_cast<std::int64_t>(done);
}

}  // namespace kelvo
