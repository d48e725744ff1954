#pragma once

#include <string>

namespace kelvo {

/// What the environment says of the user's folders; empty where it says nothing.
struct UserEnvironment {
    std::string home;        ///< HOME, else the one of the user's account
    std::string configHome;  ///< XDG_CONFIG_HOME
    std::string videosDir;   ///< XDG_VIDEOS_DIR

    /// Reads the environment, before other threads can change it.
    static UserEnvironment ofProcess();
};

/// The user's videos folder, a host path: the one that the environment names, else the one in
/// "user-dirs.dirs", else "Videos" in the home folder. Names that are no absolute paths are passed over. Any
/// thread.
std::string videosFolder(const UserEnvironment& environment);

}  // namespace kelvo
