#include "platform/linux/bundles/DesktopFolders.h"

#include <cstdlib>
#include <filesystem>
#include <string_view>

namespace kelvo {
namespace {

namespace fs = std::filesystem;

std::string environmentText(const char* name) {
    const char* text = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): read once, before threads start
    return text != nullptr ? text : "";
}

/// Adds those of a list with colons that are absolute paths.
void addFolders(std::string_view list, std::vector<std::string>& folders) {
    while (!list.empty()) {
        const std::size_t end = std::min(list.find(':'), list.size());
        if (list.starts_with('/')) folders.emplace_back(list.substr(0, end));
        list.remove_prefix(std::min(end + 1, list.size()));
    }
}

bool isFile(const std::string& path) {
    std::error_code ignored;
    return fs::is_regular_file(path, ignored);
}

}  // namespace

DesktopFolders DesktopFolders::ofProcess() {
    DesktopFolders folders;
    const std::string home = environmentText("HOME");
    const std::string own = environmentText("XDG_DATA_HOME");
    const std::string shared = environmentText("XDG_DATA_DIRS");
    addFolders(own.starts_with('/') ? own : home + "/.local/share", folders.data);
    addFolders(shared.empty() ? "/usr/local/share:/usr/share" : shared, folders.data);
    addFolders(environmentText("PATH"), folders.programs);
    return folders;
}

std::string iconFile(const DesktopFolders& folders, const std::string& icon) {
    if (icon.starts_with('/')) return isFile(icon) ? icon : std::string();
    if (icon.empty() || icon.find('/') != std::string::npos) return {};
    const std::string theme = "/icons/hicolor/";
    std::vector<std::string> names;
    for (const char* size : {"256x256", "192x192", "128x128", "96x96", "72x72", "64x64", "48x48", "32x32",
                             "24x24", "22x22", "16x16", "512x512", "1024x1024"})
        names.push_back(std::string(theme).append(size).append("/apps/").append(icon).append(".png"));
    names.push_back(std::string(theme).append("scalable/apps/").append(icon).append(".svg"));
    names.push_back("/pixmaps/" + icon + ".png");
    names.push_back("/pixmaps/" + icon + ".svg");
    for (const std::string& name : names) {
        for (const std::string& folder : folders.data) {
            if (std::string path = folder + name; isFile(path)) return path;
        }
    }
    return {};
}

}  // namespace kelvo
