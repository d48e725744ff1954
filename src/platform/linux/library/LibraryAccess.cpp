#include "platform/linux/library/LibraryAccess.h"

#include "base/KVLog.h"
#include "platform/linux/files/RenameFile.h"
#include "platform/linux/library/StagedFile.h"

#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>
#include <utility>

// How a movie comes in: its content is staged under a hidden name and synced; then one transaction of the
// index says that the movie belongs to the library under a certain name, and from there on it does; then the
// file gets that name, and the index notes that it has it. Whatever is found half done is taken the rest of
// its way by the next one who opens the library; content that no transaction speaks of is dropped.

namespace kelvo {
namespace {

namespace fs = std::filesystem;
using State = LibraryEntry::State;

constexpr std::string_view kIndexName = ".library.sqlite";
constexpr std::string_view kStagingSuffix = ".staged";
constexpr int kMostClashes = 10000;

bool exists(const std::string& path) {
    struct stat status {};
    return ::lstat(path.c_str(), &status) == 0;
}

OptionalError unlinkIfThere(const std::string& path) {
    if (::unlink(path.c_str()) == 0 || errno == ENOENT) return std::nullopt;
    return KVError::posix(errno, path);
}

/// "Movie.mp4", "Movie 2.mp4", "Movie 3.mp4"…
std::string numbered(const std::string& fileName, int number) {
    if (number == 1) return fileName;
    const fs::path name(fileName);
    return name.stem().string() + " " + std::to_string(number) + name.extension().string();
}

/// The identifier in a staged file's name; empty when it is none.
std::string_view stagedIdentifier(std::string_view name) {
    if (!name.starts_with('.') || !name.ends_with(kStagingSuffix)) return {};
    const std::string_view identifier = name.substr(1, name.size() - 1 - kStagingSuffix.size());
    return isLibraryIdentifier(identifier) ? identifier : std::string_view();
}

}  // namespace

bool MovieLibrary::Access::hasLibrary(const std::string& folder) {
    return exists(folder + "/" + std::string(kIndexName));
}

Result<MovieLibrary::Access> MovieLibrary::Access::begin(const std::string& folder) {
    UniqueFd lock(::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!lock) return KVError::posix(errno, folder);
    while (::flock(lock.get(), LOCK_EX) != 0) {
        if (errno != EINTR) return KVError::posix(errno, folder);
    }
    auto index = LibraryIndex::open(folder + "/" + std::string(kIndexName));
    if (!index) return index.error();
    Access access(folder, std::move(lock), std::move(*index));
    if (const OptionalError error = access.recover()) return *error;
    return access;
}

OptionalError MovieLibrary::Access::add(const UniqueFd& source, LibraryEntry entry) {
    const std::string staged = stagingPath(entry);
    if (OptionalError error = stageFile(source, staged)) return error;
    OptionalError error = syncFolder();
    if (!error) error = place(entry);
    if (!error) return std::nullopt;
    // A disk that refuses this too leaves it to the next who opens the library.
    index_.remove(entry.identifier);
    ::unlink(staged.c_str());
    return error;
}

/// Gives staged content the first free name like `entry.fileName`. The name is in the index before the file
/// has it, so that a file in the folder is never without an owner.
OptionalError MovieLibrary::Access::place(LibraryEntry& entry) {
    const std::string wanted = entry.fileName;
    for (int number = 1; number <= kMostClashes; ++number) {
        entry.fileName = numbered(wanted, number);
        if (exists(path(entry))) continue;
        entry.state = State::staged;
        if (OptionalError error = index_.put(entry)) return error;
        const int code = renameWithoutReplacing(stagingPath(entry), path(entry));
        if (code == EEXIST) continue;
        if (code != 0) return KVError::posix(code, path(entry));
        return finish(entry);
    }
    return KVError::posix(EEXIST, folder_ + "/" + wanted);
}

/// From here on a failure undoes nothing: the movie has its place, and the next who opens the library notes
/// it.
OptionalError MovieLibrary::Access::finish(LibraryEntry entry) {
    entry.state = State::complete;
    OptionalError error = syncFolder();
    if (!error) error = index_.put(entry);
    if (error) KVLogError("the movie library will finish later: %s", error->localizedDescription().c_str());
    return std::nullopt;
}

OptionalError MovieLibrary::Access::remove(LibraryEntry entry) {
    const State before = std::exchange(entry.state, State::removed);
    if (OptionalError error = index_.put(entry)) return error;
    if (OptionalError error = unlinkIfThere(path(entry))) {
        entry.state = before;
        index_.put(entry);
        return error;
    }
    if (OptionalError error = syncFolder()) return error;
    return index_.remove(entry.identifier);
}

OptionalError MovieLibrary::Access::recover() {
    auto entries = index_.entries();
    if (!entries) return entries.error();
    for (LibraryEntry& entry : *entries) {
        OptionalError error;
        if (entry.state == State::removed) {
            error = remove(entry);
        } else if (entry.state == State::staged && exists(stagingPath(entry))) {
            error = place(entry);
        } else if (entry.state == State::staged) {
            error = exists(path(entry)) ? finish(entry) : index_.remove(entry.identifier);
        }
        if (error) return error;
    }
    return sweepStagedFiles();
}

OptionalError MovieLibrary::Access::sweepStagedFiles() {
    std::error_code code;
    for (fs::directory_iterator item(folder_, code), end; !code && item != end; item.increment(code)) {
        const std::string name = item->path().filename().string();
        const std::string_view identifier = stagedIdentifier(name);
        if (identifier.empty()) continue;
        const auto owner = index_.find(identifier);
        if (!owner) return owner.error();
        if (*owner && (*owner)->state == State::staged) continue;
        KVLog("the movie library drops what an interrupted change left: %s", name.c_str());
        if (OptionalError error = unlinkIfThere(item->path().string())) return error;
    }
    return code ? OptionalError(KVError::posix(code.value(), folder_)) : std::nullopt;
}

OptionalError MovieLibrary::Access::syncFolder() const {
    // Some file systems have nothing to sync in a folder.
    if (::fsync(lock_.get()) == 0 || errno == EINVAL) return std::nullopt;
    return KVError::posix(errno, folder_);
}

std::string MovieLibrary::Access::stagingPath(const LibraryEntry& entry) const {
    return folder_ + "/." + entry.identifier + std::string(kStagingSuffix);
}

}  // namespace kelvo
