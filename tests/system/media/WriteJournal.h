#pragma once

#include "base/Value.h"

#include <cstdint>
#include <string>
#include <vector>

namespace kelvo::test {

/// Notes every write (pwritev) that this program makes to one file, for as long as it lives. One at a time.
class WriteJournal {
  public:
    struct Write {
        std::uint64_t offset;
        Bytes bytes;
    };

    explicit WriteJournal(std::string path);
    ~WriteJournal();
    WriteJournal(const WriteJournal&) = delete;
    WriteJournal& operator=(const WriteJournal&) = delete;

    std::vector<Write> writes() const;

    /// The file as it is when its writer is killed after the first `count` writes and `cut` bytes of the
    /// next.
    std::string fileAfter(std::size_t count, std::size_t cut) const;
};

}  // namespace kelvo::test
