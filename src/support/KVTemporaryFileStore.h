#pragma once

#include "base/Clock.h"
#include "base/KVError.h"
#include "platform/FileSystem.h"
#include "platform/TextFolding.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// The private directory in which every movie lies while it is recorded, trimmed or mixed. Holds no state:
/// each operation goes to the file system. Thread-safe.
///
/// Only the completions and the size query report errors to the caller; every other failure is logged and the
/// operation goes on with the next file. Two operations on one file race as the file system lets them.
class KVTemporaryFileStore {
  public:
    KVTemporaryFileStore(std::shared_ptr<FileSystem> fileSystem, std::shared_ptr<TextFolding> textFolding,
                         std::shared_ptr<Clock> clock);

    /// The store's path, with its trailing slash. A file's path is this, another slash and its name.
    static std::string _srTempPath();

    /// How the names of the whole screen's recordings begin.
    static constexpr std::string_view kScreenRecordingPrefix = "ScreenRecording_";

    /// How the names of mixed movies begin.
    static constexpr std::string_view kMixedMoviePrefix = "KVKelvo_Final";

    /// The name of the store's file at this URL, whether or not there is one; none when the URL leads
    /// elsewhere.
    static std::optional<std::string> nameInStore(const URL& url);

    /// Creates the directory when nothing stands at its path. Caller's thread.
    void _srSetupTempDirectory();

    /// The size of the directory's own entry in bytes (what lies in it does not count); 0 with `error` set
    /// when it cannot be read. `error` may be null. Caller's thread.
    std::int64_t _srSizeOfTempDir(OptionalError* error);

    /// Deletes every file. Returns the bytes freed. Caller's thread.
    std::uint64_t _srDeleteAllTempFiles();

    /// Deletes the files whose last change is more than `timeToLive` seconds ago (all of them when it is 0).
    /// Returns the bytes freed. Caller's thread.
    std::uint64_t _srDeleteFilesOlderThanTimeToLiveInSeconds(double timeToLive);

    /// Removes one file in the background (high priority). `completion`, which may be none, runs there; a
    /// file that does not exist is no error.
    void _srRemoveFile(const URL& url, ErrorHandler completion);

    /// Moves a file in the background (normal priority), replacing what stands at the destination.
    /// `completion`, which may be none, runs there.
    void _srMoveFileFromURL(const URL& source, const URL& destination, ErrorHandler completion);

    /// Deletes, in the background (normal priority), the files whose names begin with `prefix`, whatever its
    /// case and diacritics. A removal that fails is logged when the next file is come to, so the last one's
    /// never is.
    void _srDeleteFilesWithPrefix(std::string_view prefix);

    /// None when the file's attributes cannot be read. Caller's thread.
    std::optional<Date> _srGetCreationDateForFile(const URL& url);

    /// Free bytes of the store's volume; 0 when they cannot be read. Caller's thread.
    std::uint64_t _srDeviceFreeDiskSpace();

    /// Whether more than 100000000 bytes are free. Caller's thread.
    bool _srDeviceHasSufficientFreeSpaceForRecording();

  private:
    std::uint64_t deleteIfOlder(const std::string& name, double timeToLive);

    std::shared_ptr<FileSystem> fileSystem_;
    std::shared_ptr<TextFolding> textFolding_;
    std::shared_ptr<Clock> clock_;
};

}  // namespace kelvo
