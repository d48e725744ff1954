#include "platform/linux/library/MovieLibrary.h"

#include "base/KVLog.h"
#include "base/UUID.h"
#include "platform/linux/files/WritableDirectory.h"
#include "platform/linux/library/LibraryAccess.h"

#include <array>
#include <cerrno>
#include <fcntl.h>
#include <filesystem>
#include <span>
#include <sys/stat.h>
#include <unistd.h>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

std::string newIdentifier(Random& random) {
    std::array<std::uint8_t, 16> bytes;
    random.fill(std::as_writable_bytes(std::span(bytes)));
    return UUID::fromRandomBytes(bytes).text();
}

/// Makes the folder. Its own name and that of the folder above are on the disk before anything relies on
/// them.
OptionalError makeFolder(const std::string& folder) {
    std::error_code ignored;
    if (fs::exists(folder, ignored)) return makeWritableDirectory(folder);
    if (OptionalError error = makeWritableDirectory(folder)) return error;
    const fs::path parent = fs::path(folder).parent_path();
    for (const fs::path& above : {parent, parent.parent_path()}) {
        const UniqueFd directory(::open(above.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
        if (directory) ::fsync(directory.get());
    }
    return std::nullopt;
}

/// The size of the regular file at `path`; none when there is none.
std::optional<std::uint64_t> fileSize(const std::string& path) {
    struct stat status {};
    if (::lstat(path.c_str(), &status) != 0 || !S_ISREG(status.st_mode)) return std::nullopt;
    return static_cast<std::uint64_t>(status.st_size);
}

}  // namespace

Result<std::string> MovieLibrary::add(const std::string& moviePath) {
    const UniqueFd source(::open(moviePath.c_str(), O_RDONLY | O_CLOEXEC | O_NOFOLLOW | O_NONBLOCK));
    struct stat status {};
    if (!source || ::fstat(source.get(), &status) != 0) return KVError::posix(errno, moviePath);
    if (!S_ISREG(status.st_mode)) return KVError::posix(EINVAL, moviePath);
    if (const OptionalError error = makeFolder(folder_)) return *error;
    LibraryEntry entry;
    entry.identifier = newIdentifier(*random_);
    entry.creationDate = {status.st_mtim.tv_sec * 1000000000LL + status.st_mtim.tv_nsec};
    entry.fileName = localTimeText(entry.creationDate, "Screen Recording %Y-%m-%d at %H.%M.%S") +
                     fs::path(moviePath).extension().string();
    const std::lock_guard lock(mutex_);
    if (const OptionalError error = addOrLeave(source, entry)) return *error;
    return entry.identifier;
}

OptionalError MovieLibrary::addOrLeave(const UniqueFd& source, const LibraryEntry& entry) {
    auto access = Access::begin(folder_, patience_);
    OptionalError error = access ? access->add(source, entry) : access.error();
    if (!error || error->code() != EBUSY) return error;
    KVLogError("%s; the new recording comes in when that ends", error->localizedDescription().c_str());
    return Access::leave(folder_, source, entry);
}

OptionalError MovieLibrary::remove(std::string_view identifier) {
    if (!Access::hasLibrary(folder_)) return KVError::posix(ENOENT, identifier);
    const std::lock_guard lock(mutex_);
    auto access = Access::begin(folder_, patience_);
    if (!access) return access.error();
    const auto entry = access->index().find(identifier);
    if (!entry) return entry.error();
    return *entry ? access->remove(**entry) : KVError::posix(ENOENT, identifier);
}

Result<std::vector<LibraryMovie>> MovieLibrary::movies() {
    if (!Access::hasLibrary(folder_)) return std::vector<LibraryMovie>();
    const std::lock_guard lock(mutex_);
    auto access = Access::begin(folder_, patience_);
    if (!access) return access.error();
    const auto entries = access->index().entries();
    if (!entries) return entries.error();
    std::vector<LibraryMovie> movies;
    for (const LibraryEntry& entry : *entries) {
        const std::string path = folder_ + "/" + entry.fileName;
        const auto size = fileSize(path);
        if (size && entry.state != LibraryEntry::State::removed)
            movies.push_back({entry.identifier, path, entry.creationDate, *size});
    }
    return movies;
}

OptionalError MovieLibrary::recover() {
    if (!Access::hasLibrary(folder_)) return std::nullopt;
    const std::lock_guard lock(mutex_);
    return Access::begin(folder_, patience_).optionalError();
}

}  // namespace kelvo
