#pragma once

#include "base/Guarded.h"
#include "media/KVAudioMixUtility.h"
#include "platform/Platform.h"

#include <atomic>
#include <functional>
#include <map>
#include <memory>
#include <string>
#include <vector>

namespace kelvo {

/// Brings movies that lie in the store with nobody to save them to the library: all that an earlier run of
/// the daemon left because it crashed or had no time, and of this run the recordings of the whole screen that
/// could not be saved or that ended by themselves. What an application recorded of itself in this run is left
/// to it. Thread-safe.
class MovieRecovery : public std::enable_shared_from_this<MovieRecovery> {
  public:
    using Handler = std::function<void(const std::vector<Dictionary>& movies)>;

    /// Whether somebody of this run uses the store's movie of that name. Called on any thread.
    using InUse = std::function<bool(const std::string& name)>;

    /// Notes what lies in the store now: whatever comes later is this run's own. Says so in the log when it
    /// is anything. `isInUse` may be none.
    MovieRecovery(const Platform& platform, const std::shared_ptr<KVUserErrors>& errors, InUse isInUse);

    /// Mixes and saves those movies one by one, in the background, and takes each out of the store: the saved
    /// ones, those that are in the library already, and those in which there is nothing to play. What cannot
    /// be saved stays, and so does what somebody uses or what was written two seconds ago or less. `handler`
    /// gets a dictionary for each movie that was saved or could not be
    /// (`KVLibraryProtocol::recoverMovies` names the keys). EBUSY, without calling it, while an earlier call
    /// is at work.
    OptionalError recover(Handler handler);

  private:
    struct Work;
    using WorkRef = std::shared_ptr<Work>;

    bool isAsItWas(const std::string& name, const FileAttributes& now) const;
    bool isForsaken(const std::string& name) const;
    bool isSavedAlready(const std::string& name) const;
    bool isPlayable(const std::string& name) const;
    void recoverNext(const WorkRef& work);
    void save(const WorkRef& work, const std::string& name, const std::optional<URL>& mixedURL);
    void finish(const WorkRef& work);
    void remove(const std::string& path) const;

    const InUse isInUse_;
    const Platform platform_;
    const KVAudioMixUtility mixer_;
    Guarded<std::map<std::string, FileAttributes>> leftovers_;
    std::atomic<bool> isAtWork_{false};
};

}  // namespace kelvo
