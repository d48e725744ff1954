#include "WriteJournal.h"

#include "base/Guarded.h"

#include <algorithm>
#include <array>
#include <climits>
#include <span>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <unistd.h>

namespace kelvo::test {
namespace {

struct Journal {
    std::string path;
    std::vector<WriteJournal::Write> writes;
};

Guarded<Journal>& journal() {
    static Guarded<Journal> theJournal;
    return theJournal;
}

std::string pathOf(int descriptor) {
    std::array<char, PATH_MAX> target{};
    const std::string link = "/proc/self/fd/" + std::to_string(descriptor);
    const ssize_t size = ::readlink(link.c_str(), target.data(), target.size());
    return {target.data(), static_cast<std::size_t>(std::max<ssize_t>(size, 0))};
}

void note(int descriptor, std::span<const iovec> pieces, std::uint64_t offset, std::size_t written) {
    journal().with([&](Journal& kept) {
        if (kept.path.empty() || kept.path != pathOf(descriptor)) return;
        WriteJournal::Write write{offset, {}};
        for (const iovec& piece : pieces) {
            const auto* const begin = static_cast<const std::byte*>(piece.iov_base);
            write.bytes.insert(write.bytes.end(), begin, begin + piece.iov_len);
        }
        write.bytes.resize(written);
        kept.writes.push_back(std::move(write));
    });
}

}  // namespace

WriteJournal::WriteJournal(std::string path) {
    journal().set({std::move(path), {}});
}

WriteJournal::~WriteJournal() {
    journal().set({});
}

std::vector<WriteJournal::Write> WriteJournal::writes() const {
    return journal().copy().writes;
}

std::string WriteJournal::fileAfter(std::size_t count, std::size_t cut) const {
    const auto all = writes();
    std::string file;
    for (std::size_t i = 0; i < all.size() && i <= count; ++i) {
        const std::size_t size = i < count ? all[i].bytes.size() : std::min(cut, all[i].bytes.size());
        if (size == 0) continue;
        file.resize(std::max(file.size(), all[i].offset + size));
        std::transform(all[i].bytes.begin(), all[i].bytes.begin() + static_cast<std::ptrdiff_t>(size),
                       file.begin() + static_cast<std::ptrdiff_t>(all[i].offset),
                       [](std::byte byte) { return static_cast<char>(byte); });
    }
    return file;
}

}  // namespace kelvo::test

/// Takes the place of the C library's in this program.
extern "C" ssize_t pwritev(int descriptor, const iovec* pieces, int count, off_t offset) {
    const ssize_t written = ::syscall(SYS_pwritev, descriptor, pieces, count, offset, 0);
    if (written > 0)
        kelvo::test::note(descriptor, std::span(pieces, static_cast<std::size_t>(count)),
                          static_cast<std::uint64_t>(offset), static_cast<std::size_t>(written));
    return written;
}
