#pragma once

#include "base/UniqueFd.h"
#include "platform/linux/library/LibraryIndex.h"
#include "platform/linux/library/MovieLibrary.h"

namespace kelvo {

/// A library's folder while somebody works in it: held against everybody else, in this process and others,
/// with its index open. One thread.
class MovieLibrary::Access {
  public:
    /// Whether a library was ever begun in `folder`.
    static bool hasLibrary(const std::string& folder);

    /// Waits for the others, and clears away what they left. Begins a library where there is none. EBUSY when
    /// the others take longer than `patience`.
    static Result<Access> begin(const std::string& folder, std::chrono::milliseconds patience);

    /// Puts the content of `source` into a library that somebody else holds, for whoever begins next to add.
    static OptionalError leave(const std::string& folder, const UniqueFd& source, const LibraryEntry& entry);

    /// Adds the content of `source`; see `MovieLibrary::add`.
    OptionalError add(const UniqueFd& source, LibraryEntry entry);
    OptionalError remove(LibraryEntry entry);
    LibraryIndex& index() { return index_; }

  private:
    Access(std::string folder, UniqueFd lock, LibraryIndex index)
        : folder_(std::move(folder)), lock_(std::move(lock)), index_(std::move(index)) {}

    OptionalError recover();
    OptionalError finish(LibraryEntry entry);
    OptionalError place(LibraryEntry& entry, const std::string& from);
    OptionalError takeInWhatWaits();
    OptionalError takeIn(const std::string& name);
    OptionalError sweepStagedFiles();
    OptionalError syncFolder() const;
    std::string stagingPath(const LibraryEntry& entry) const { return stagingPath(folder_, entry); }
    static std::string stagingPath(const std::string& folder, const LibraryEntry& entry);
    std::string path(const LibraryEntry& entry) const { return folder_ + "/" + entry.fileName; }

    std::string folder_;
    UniqueFd lock_;
    LibraryIndex index_;
};

}  // namespace kelvo
