#include "support/KVTemporaryFileStore.h"

#include "base/GlobalQueue.h"
#include "base/KVLog.h"

#include <filesystem>
#include <utility>

namespace kelvo {
namespace {

constexpr std::string_view kStorePath = "/private/var/mobile/Library/KelvoKit/";
constexpr std::uint64_t kLeastFreeBytesForRecording = 100000000;

std::string pathInStore(const std::string& name) {
    return std::string(kStorePath) + "/" + name;
}

int codeOf(const KVError& error) {
    return static_cast<int>(error.code());
}

/// Reports what went wrong while old files were deleted; nothing when nothing did.
void reportDeletionError(const OptionalError& error) {
    if (!error) return;
    KVLogError("error in _kkRemoveFile_srDeleteFilesOlderThanTimeToLiveInSeconds, error code: %i",
               codeOf(*error));
    KVLogConsole("error = %s", error->description().c_str());
}

}  // namespace

KVTemporaryFileStore::KVTemporaryFileStore(std::shared_ptr<FileSystem> fileSystem,
                                           std::shared_ptr<TextFolding> textFolding,
                                           std::shared_ptr<Clock> clock)
    : fileSystem_(std::move(fileSystem)), textFolding_(std::move(textFolding)), clock_(std::move(clock)) {}

std::string KVTemporaryFileStore::_srTempPath() {
    return std::string(kStorePath);
}

std::optional<std::string> KVTemporaryFileStore::nameInStore(const URL& url) {
    const std::filesystem::path path = std::filesystem::path(url.path()).lexically_normal();
    const bool isThere = path.has_filename() && path.filename() != ".." &&
                         path.parent_path() == std::filesystem::path(kStorePath).parent_path();
    return isThere ? std::optional(path.filename().string()) : std::nullopt;
}

void KVTemporaryFileStore::_srSetupTempDirectory() {
    KVLog("_srSetupTempDirectory");
    if (fileSystem_->itemExists(kStorePath)) return;
    if (const OptionalError error = fileSystem_->createDirectory(kStorePath)) {
        KVLogConsole("error: %s", error->description().c_str());
        KVLogError("error creating temp directory");
    }
}

std::int64_t KVTemporaryFileStore::_srSizeOfTempDir(OptionalError* error) {
    const Result<FileAttributes> attributes = fileSystem_->attributesOfItem(kStorePath);
    if (error != nullptr) *error = attributes.optionalError();
    return attributes ? static_cast<std::int64_t>(attributes->size) : 0;
}

std::uint64_t KVTemporaryFileStore::_srDeleteAllTempFiles() {
    return _srDeleteFilesOlderThanTimeToLiveInSeconds(0);
}

std::uint64_t KVTemporaryFileStore::_srDeleteFilesOlderThanTimeToLiveInSeconds(double timeToLive) {
    KVLog("_srDeleteFilesOlderThanTimeToLiveInSeconds: %i", static_cast<int>(timeToLive));
    const auto names = fileSystem_->namesInDirectory(kStorePath);
    reportDeletionError(names.optionalError());
    if (!names) return 0;
    std::uint64_t freed = 0;
    for (const std::string& name : *names)
        freed += deleteIfOlder(name, timeToLive);
    return freed;
}

/// Deletes one file when it is old enough. Returns the bytes freed.
std::uint64_t KVTemporaryFileStore::deleteIfOlder(const std::string& name, double timeToLive) {
    const std::string path = pathInStore(name);
    const auto attributes = fileSystem_->attributesOfItem(path);
    reportDeletionError(attributes.optionalError());
    // A file whose age cannot be told goes only when every file goes.
    const bool isOlder = attributes && inSeconds(clock_->now() - attributes->modificationDate) > timeToLive;
    if (timeToLive != 0 && !isOlder) return 0;
    KVLog("deleting old file");
    const OptionalError error = fileSystem_->removeItem(path);
    reportDeletionError(error);
    return error || !attributes ? 0 : attributes->size;
}

void KVTemporaryFileStore::_srRemoveFile(const URL& url, ErrorHandler completion) {
    GlobalQueue::get(QueuePriority::high)
        .async([fileSystem = fileSystem_, path = url.path(), completion = std::move(completion)] {
            OptionalError error;
            if (fileSystem->itemExists(path)) error = fileSystem->removeItem(path);
            if (error) KVLog("_kkRemoveFile error: %i", codeOf(*error));
            if (completion) completion(error);
        });
}

void KVTemporaryFileStore::_srMoveFileFromURL(const URL& source, const URL& destination,
                                              ErrorHandler completion) {
    GlobalQueue::get(QueuePriority::normal)
        .async([fileSystem = fileSystem_, from = source.path(), to = destination.path(),
                completion = std::move(completion)] {
            // What stands in the way is removed as far as that goes; the move itself then tells.
            if (fileSystem->itemExists(to)) static_cast<void>(fileSystem->removeItem(to));
            const OptionalError error = fileSystem->moveItem(from, to);
            if (error) KVLogError("_kkMoveFileFromURL error: %i", codeOf(*error));
            if (completion) completion(error);
        });
}

void KVTemporaryFileStore::_srDeleteFilesWithPrefix(std::string_view prefix) {
    GlobalQueue::get(QueuePriority::normal)
        .async([fileSystem = fileSystem_, folding = textFolding_, prefix = std::string(prefix)] {
            const auto names = fileSystem->namesInDirectory(kStorePath);
            OptionalError pending = names.optionalError();
            const std::string folded = folding->folded(prefix);
            for (const std::string& name : names.valueOr({})) {
                if (!folding->folded(name).starts_with(folded)) continue;
                if (pending) KVLogError("_kkDeleteFilesWithPrefix error: %i", codeOf(*pending));
                if (OptionalError error = fileSystem->removeItem(pathInStore(name)))
                    pending = std::move(error);
            }
        });
}

std::optional<Date> KVTemporaryFileStore::_srGetCreationDateForFile(const URL& url) {
    const auto attributes = fileSystem_->attributesOfItem(url.path());
    if (!attributes) return std::nullopt;
    return attributes->creationDate;
}

std::uint64_t KVTemporaryFileStore::_srDeviceFreeDiskSpace() {
    return fileSystem_->freeSpace(kStorePath).valueOr(0);
}

bool KVTemporaryFileStore::_srDeviceHasSufficientFreeSpaceForRecording() {
    return _srDeviceFreeDiskSpace() > kLeastFreeBytesForRecording;
}

}  // namespace kelvo
