#include "daemon/MovieRecovery.h"

#include "base/GlobalQueue.h"
#include "base/KVLog.h"

#include <algorithm>
#include <cerrno>
#include <deque>
#include <utility>

namespace kelvo {
namespace {

using namespace std::chrono_literals;

constexpr std::string_view kMovieSuffix = ".mp4";
constexpr std::string_view kTrimmedSuffix = "_trimmed.mp4";
/// What a recording that ended by itself still had in its encoder is in the file by then.
constexpr std::chrono::nanoseconds kLastWrite = 2s;

std::string pathInStore(const std::string& name) {
    return KVTemporaryFileStore::_srTempPath() + "/" + name;
}

bool isOfTheWholeScreen(const std::string& name) {
    return name.starts_with(KVTemporaryFileStore::kScreenRecordingPrefix);
}

/// Whether `name` is what became, or was becoming, of another of those movies.
bool isMadeFromAnother(const std::string& name, const std::map<std::string, FileAttributes>& all) {
    // What mixing was making when the daemon ended: the movie that it was made from is there, too.
    if (name.starts_with(KVTemporaryFileStore::kMixedMoviePrefix)) return true;
    if (!name.ends_with(kTrimmedSuffix)) return false;
    const std::string stem = name.substr(0, name.size() - kTrimmedSuffix.size());
    return all.contains(stem + std::string(kMovieSuffix));
}

}  // namespace

struct MovieRecovery::Work {
    std::deque<std::string> names;
    std::vector<Dictionary> results;
    Handler handler;
};

MovieRecovery::MovieRecovery(const Platform& platform, const std::shared_ptr<KVUserErrors>& errors,
                             InUse isInUse)
    : isInUse_(std::move(isInUse)), platform_(platform), mixer_(platform.media, platform.clock, errors) {
    std::map<std::string, FileAttributes> found;
    const auto names = platform_.fileSystem->namesInDirectory(KVTemporaryFileStore::_srTempPath());
    for (const std::string& name : names.valueOr({})) {
        const auto file = platform_.fileSystem->attributesOfItem(pathInStore(name));
        if (file && !file->isDirectory && name.ends_with(kMovieSuffix)) found.emplace(name, *file);
    }
    if (!found.empty()) {
        KVLog("movies of an earlier run lie in the store: %zu; kelvoctl library recover saves them",
              found.size());
    }
    leftovers_.set(std::move(found));
}

OptionalError MovieRecovery::recover(Handler handler) {
    if (isAtWork_.exchange(true)) return KVError::posix(EBUSY, "the recovery of movies");
    const auto work = std::make_shared<Work>();
    work->handler = std::move(handler);
    const auto names = platform_.fileSystem->namesInDirectory(KVTemporaryFileStore::_srTempPath());
    const auto leftovers = leftovers_.copy();
    for (const std::string& name : names.valueOr({})) {
        if (!isForsaken(name)) continue;
        if (isMadeFromAnother(name, leftovers)) {
            remove(pathInStore(name));
        } else {
            work->names.push_back(name);
        }
    }
    std::ranges::sort(work->names);
    recoverNext(work);
    return std::nullopt;
}

/// Whether nobody of this run will save it. An application that runs may yet do so with its own.
bool MovieRecovery::isForsaken(const std::string& name) const {
    const auto file = platform_.fileSystem->attributesOfItem(pathInStore(name));
    if (!file || file->isDirectory || !name.ends_with(kMovieSuffix)) return false;
    if (isInUse_ && isInUse_(name)) return false;
    const auto age = platform_.clock->now() - file->modificationDate;
    return isAsItWas(name, *file) || (isOfTheWholeScreen(name) && age > kLastWrite);
}

/// A recording of this run may have taken the name over.
bool MovieRecovery::isAsItWas(const std::string& name, const FileAttributes& now) const {
    return leftovers_.with([&](const auto& all) {
        const auto then = all.find(name);
        return then != all.end() && then->second.modificationDate == now.modificationDate &&
               then->second.size == now.size;
    });
}

/// Movies that are saved unmixed stay in the store; the library knows them by date and size.
bool MovieRecovery::isSavedAlready(const std::string& name) const {
    const auto file = platform_.fileSystem->attributesOfItem(pathInStore(name));
    const auto saved = platform_.photoLibrary->assets();
    if (!file || !saved) return false;
    return std::ranges::any_of(*saved, [&](const PhotoAssetDetails& each) {
        return each.creationDate == file->modificationDate && each.size == file->size;
    });
}

bool MovieRecovery::isPlayable(const std::string& name) const {
    const auto asset = platform_.media->openAsset(URL::file(pathInStore(name)));
    return asset && !asset->tracksWithMediaType(MediaType::video).empty();
}

/// The global queue's thread is taken anew for each movie: what the mixing calls back on is not ours.
void MovieRecovery::recoverNext(const WorkRef& work) {
    GlobalQueue::get(QueuePriority::normal).async([self = shared_from_this(), work] {
        if (work->names.empty()) return self->finish(work);
        const std::string name = std::exchange(work->names.front(), {});
        work->names.pop_front();
        if (!self->isForsaken(name)) return self->recoverNext(work);  // it was taken up meanwhile
        if (self->isSavedAlready(name) || !self->isPlayable(name)) {
            KVLog("nothing to save in %s", name.c_str());
            self->remove(pathInStore(name));
            return self->recoverNext(work);
        }
        self->mixer_.mixAudioForMovie(
            URL::file(pathInStore(name)), [self, work, name](const auto& mixedURL, const auto& error) {
                if (error) KVLogError("cannot mix the sound of %s, which is saved as it is", name.c_str());
                self->save(work, name, mixedURL);
                self->recoverNext(work);
            });
    });
}

void MovieRecovery::save(const WorkRef& work, const std::string& name, const std::optional<URL>& mixedURL) {
    const auto asset =
        platform_.photoLibrary->createVideoAsset(mixedURL.value_or(URL::file(pathInStore(name))));
    Dictionary result{{"name", name}};
    if (asset) {
        KVLog("saved %s, which nobody had saved", name.c_str());
        result.set("identifier", asset->localIdentifier);
        for (const PhotoAssetDetails& each : platform_.photoLibrary->assets().valueOr({})) {
            if (each.asset == *asset) result.set("path", each.hostPath);
        }
        remove(pathInStore(name));
    } else {
        KVLogError("cannot save %s: %s", name.c_str(), asset.error().localizedDescription().c_str());
        result.set("error", asset.error());
    }
    if (mixedURL) remove(mixedURL->path());
    work->results.push_back(std::move(result));
}

void MovieRecovery::finish(const WorkRef& work) {
    isAtWork_ = false;
    if (work->handler) work->handler(work->results);
}

void MovieRecovery::remove(const std::string& path) const {
    const OptionalError error = platform_.fileSystem->removeItem(path);
    if (error && error->code() != ENOENT)
        KVLogError("cannot remove %s: %s", path.c_str(), error->localizedDescription().c_str());
}

}  // namespace kelvo
