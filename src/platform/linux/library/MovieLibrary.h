#pragma once

#include "base/Date.h"
#include "base/Result.h"
#include "base/UniqueFd.h"
#include "platform/Random.h"
#include "platform/linux/library/LibraryIndex.h"

#include <chrono>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace kelvo {

/// One movie of the library, as a person may look at it.
struct LibraryMovie {
    std::string identifier;  ///< stable for as long as the movie is in the library
    std::string path;        ///< on the host
    Date creationDate;       ///< when it was recorded
    std::uint64_t size = 0;  ///< bytes
};

/// The user's recordings: ordinary movie files in one folder, and beside them an index that gives each an
/// identifier. A change survives a crash and the loss of power at any moment: afterwards it is made, or it is
/// as if it had never begun, and what it left behind goes when the library is used next. A file that the
/// library did not put there, or that the user took away or renamed, is none of its movies and is left alone.
///
/// Thread-safe, and safe among processes; changes wait for each other. Blocks for as long as the disk takes,
/// and for other programs that hold the library for as long as its patience lasts; EBUSY after that.
class MovieLibrary {
  public:
    static constexpr std::chrono::milliseconds kUsualPatience{5000};

    /// Nothing is touched until the library is used. `folder` is a host path.
    MovieLibrary(std::string folder, std::shared_ptr<Random> random,
                 std::chrono::milliseconds patience = kUsualPatience)
        : folder_(std::move(folder)), random_(std::move(random)), patience_(patience) {}

    /// Adds the content of the movie at a host path and returns its identifier. On a volume that has links
    /// but no clones both are one file with two names: the movie may be removed, but not written into any
    /// more. The movie stays where it is; its pixels are not copied where the volume can share them. When
    /// another program does not let go of the library, the movie is put beside its others under a hidden
    /// name, which is logged, and is listed from the moment on when somebody can open the library again.
    /// Fails, changing nothing, when there is no such regular file, when the folder cannot be made or written
    /// and when the volume is full.
    Result<std::string> add(const std::string& moviePath);

    /// Removes a movie with its file. Fails with ENOENT when there is none of that identifier.
    OptionalError remove(std::string_view identifier);

    /// Oldest first. Empty when nothing was ever added.
    Result<std::vector<LibraryMovie>> movies();

    /// Finishes or undoes what an interrupted change left. `add`, `remove` and `movies` do so by themselves.
    OptionalError recover();

    const std::string& folder() const { return folder_; }

  private:
    class Access;

    OptionalError addOrLeave(const UniqueFd& source, const LibraryEntry& entry);

    const std::string folder_;
    const std::shared_ptr<Random> random_;
    const std::chrono::milliseconds patience_;
    std::mutex mutex_;  ///< held by who uses the library: only other programs are waited for with patience
};

}  // namespace kelvo
