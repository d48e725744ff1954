#include "platform/linux/library/LibraryAccess.h"

#include "base/KVLog.h"
#include "platform/linux/files/RenameFile.h"
#include "platform/linux/library/StagedFile.h"

#include <array>
#include <cerrno>
#include <chrono>
#include <fcntl.h>
#include <filesystem>
#include <sys/file.h>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>
#include <utility>

// How a movie comes in: its content is staged under a hidden name and synced; then one transaction of the
// index says that the movie belongs to the library under a certain name, and from there on it does; then the
// file gets that name, and the index notes that it has it. Whatever is found half done is taken the rest of
// its way by the next one who opens the library; content that no transaction speaks of is dropped.
//
// While somebody else holds the library, a movie is left in its folder under another hidden name, whole and
// synced, and comes in when the library is opened next.

namespace kelvo {
namespace {

namespace fs = std::filesystem;
using State = LibraryEntry::State;

constexpr std::string_view kIndexName = ".library.sqlite";
constexpr std::string_view kStagingSuffix = ".staged";
constexpr std::string_view kWaitingMark = ".waiting.";
constexpr std::size_t kIdentifierLength = 36;
constexpr std::chrono::milliseconds kNextLook{10};
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

/// ".IDENTIFIER.waiting.FILE NAME"
std::string waitingName(const LibraryEntry& entry) {
    return "." + entry.identifier + std::string(kWaitingMark) + entry.fileName;
}

/// The movie that waits under `name`; none when nothing does.
std::optional<LibraryEntry> waitingEntry(const std::string& name) {
    if (name.size() <= 1 + kIdentifierLength + kWaitingMark.size()) return std::nullopt;
    LibraryEntry entry;
    entry.identifier = name.substr(1, kIdentifierLength);
    entry.fileName = name.substr(1 + kIdentifierLength + kWaitingMark.size());
    const bool isWaitingName = waitingName(entry) == name && entry.fileName.front() != '.';
    if (!isLibraryIdentifier(entry.identifier) || !isWaitingName) return std::nullopt;
    return entry;
}

/// A copy keeps the movie's time only when told to.
OptionalError setTime(const std::string& path, Date date) {
    constexpr std::int64_t kNanoseconds = 1000000000;
    const timespec time{date.nanosecondsSince1970 / kNanoseconds, date.nanosecondsSince1970 % kNanoseconds};
    const std::array<timespec, 2> times{time, time};
    const UniqueFd file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW));
    if (file && ::futimens(file.get(), times.data()) == 0 && ::fsync(file.get()) == 0) return std::nullopt;
    return KVError::posix(errno, path);
}

/// The kernel would wait for the lock without limit.
OptionalError lockFolder(const UniqueFd& folder, const std::string& path,
                         std::chrono::milliseconds patience) {
    const auto end = std::chrono::steady_clock::now() + patience;
    while (::flock(folder.get(), LOCK_EX | LOCK_NB) != 0) {
        if (errno == EINTR) continue;
        if (errno != EWOULDBLOCK) return KVError::posix(errno, path);
        if (std::chrono::steady_clock::now() >= end) return heldByAnother(path);
        std::this_thread::sleep_for(kNextLook);
    }
    return std::nullopt;
}

/// Some file systems have nothing to sync in a folder.
OptionalError syncFolder(const UniqueFd& folder, const std::string& path) {
    if (::fsync(folder.get()) == 0 || errno == EINVAL) return std::nullopt;
    return KVError::posix(errno, path);
}

UniqueFd openFolder(const std::string& path) {
    return UniqueFd(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
}

}  // namespace

bool MovieLibrary::Access::hasLibrary(const std::string& folder) {
    return exists(folder + "/" + std::string(kIndexName));
}

Result<MovieLibrary::Access> MovieLibrary::Access::begin(const std::string& folder,
                                                         std::chrono::milliseconds patience) {
    UniqueFd held = openFolder(folder);
    if (!held) return KVError::posix(errno, folder);
    if (const OptionalError error = lockFolder(held, folder, patience)) return *error;
    auto index = LibraryIndex::open(folder + "/" + std::string(kIndexName), patience);
    if (!index) return index.error();
    Access access(folder, std::move(held), std::move(*index));
    if (const OptionalError error = access.recover()) return *error;
    return access;
}

OptionalError MovieLibrary::Access::leave(const std::string& folder, const UniqueFd& source,
                                          const LibraryEntry& entry) {
    const UniqueFd opened = openFolder(folder);
    if (!opened) return KVError::posix(errno, folder);
    const std::string staged = stagingPath(folder, entry);
    if (OptionalError error = stageFile(source, staged)) return error;
    OptionalError error = setTime(staged, entry.creationDate);
    if (!error) {
        const int code = renameWithoutReplacing(staged, folder + "/" + waitingName(entry));
        error = code == 0 ? kelvo::syncFolder(opened, folder) : KVError::posix(code, staged);
    }
    if (error) ::unlink(staged.c_str());
    return error;
}

OptionalError MovieLibrary::Access::add(const UniqueFd& source, LibraryEntry entry) {
    const std::string staged = stagingPath(entry);
    if (OptionalError error = stageFile(source, staged)) return error;
    OptionalError error = syncFolder();
    if (!error) error = place(entry, staged);
    if (!error) return std::nullopt;
    // A disk that refuses this too leaves it to the next who opens the library.
    index_.remove(entry.identifier);
    ::unlink(staged.c_str());
    return error;
}

/// Gives the whole content at `from` the first free name like `entry.fileName`. The name is in the index
/// before the file has it, so that a file in the folder is never without an owner.
OptionalError MovieLibrary::Access::place(LibraryEntry& entry, const std::string& from) {
    const std::string wanted = entry.fileName;
    for (int number = 1; number <= kMostClashes; ++number) {
        entry.fileName = numbered(wanted, number);
        if (exists(path(entry))) continue;
        entry.state = State::staged;
        if (OptionalError error = index_.put(entry)) return error;
        const int code = renameWithoutReplacing(from, path(entry));
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
            error = place(entry, stagingPath(entry));
        } else if (entry.state == State::staged) {
            error = exists(path(entry)) ? finish(entry) : index_.remove(entry.identifier);
        }
        if (error) return error;
    }
    if (OptionalError error = takeInWhatWaits()) return error;
    return sweepStagedFiles();
}

OptionalError MovieLibrary::Access::takeInWhatWaits() {
    std::vector<std::string> names;
    std::error_code code;
    for (fs::directory_iterator item(folder_, code), end; !code && item != end; item.increment(code))
        names.push_back(item->path().filename().string());
    for (const std::string& name : names) {
        if (OptionalError error = takeIn(name)) return error;
    }
    return code ? OptionalError(KVError::posix(code.value(), folder_)) : std::nullopt;
}

/// Interrupted at any point, it is done again as if it had never begun: the movie waits until it has its
/// name, and an entry of the same identifier is replaced.
OptionalError MovieLibrary::Access::takeIn(const std::string& name) {
    auto entry = waitingEntry(name);
    if (!entry) return std::nullopt;
    const std::string from = folder_ + "/" + name;
    struct stat status {};
    if (::lstat(from.c_str(), &status) != 0) return KVError::posix(errno, from);
    if (!S_ISREG(status.st_mode)) return std::nullopt;
    entry->creationDate = {status.st_mtim.tv_sec * 1000000000LL + status.st_mtim.tv_nsec};
    KVLog("the movie library takes in what waited: %s", name.c_str());
    return place(*entry, from);
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
    return kelvo::syncFolder(lock_, folder_);
}

std::string MovieLibrary::Access::stagingPath(const std::string& folder, const LibraryEntry& entry) {
    return folder + "/." + entry.identifier + std::string(kStagingSuffix);
}

}  // namespace kelvo
