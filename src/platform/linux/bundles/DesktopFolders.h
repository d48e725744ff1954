#pragma once

#include <string>
#include <vector>

namespace kelvo {

/// Where a desktop keeps what it knows of its applications; host paths, the most important first.
struct DesktopFolders {
    std::vector<std::string> data;      ///< each may hold "applications", "icons" and "pixmaps"
    std::vector<std::string> programs;  ///< where a program without a path is looked for

    /// As XDG_DATA_HOME (else "~/.local/share"), XDG_DATA_DIRS (else "/usr/local/share:/usr/share") and PATH
    /// say. Reads the environment, before other threads can change it.
    static DesktopFolders ofProcess();
};

/// The file of an icon for `icon`, an absolute path or a name of the icon theme "hicolor", which every other
/// theme falls back to: the first PNG of its sizes from 256 pixels down, else a larger one, else the SVG,
/// else one in "pixmaps". Empty when there is none. Any thread.
std::string iconFile(const DesktopFolders& folders, const std::string& icon);

}  // namespace kelvo
