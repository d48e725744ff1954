#include "platform/linux/library/UserFolders.h"

#include "platform/linux/files/ReadFile.h"

#include <array>
#include <cstdlib>
#include <optional>
#include <pwd.h>
#include <string_view>
#include <unistd.h>

namespace kelvo {
namespace {

constexpr std::size_t kMostBytes = 64U << 10;
constexpr std::string_view kKey = "XDG_VIDEOS_DIR=\"";
constexpr std::string_view kHomeVariable = "$HOME/";

std::string environmentText(const char* name) {
    const char* text = std::getenv(name);  // NOLINT(concurrency-mt-unsafe): read once, before threads start
    return text != nullptr ? text : "";
}

std::string homeOfAccount() {
    std::array<char, 4096> buffer;
    passwd entry{};
    passwd* found = nullptr;
    ::getpwuid_r(::geteuid(), &entry, buffer.data(), buffer.size(), &found);
    return found != nullptr ? entry.pw_dir : "/";
}

/// The text in quotes that `rest` begins in, with its escapes undone.
std::string unquoted(std::string_view rest) {
    std::string text;
    for (std::size_t i = 0; i < rest.size() && rest[i] != '"' && rest[i] != '\n'; ++i) {
        if (rest[i] == '\\' && ++i == rest.size()) break;
        text += rest[i];
    }
    return text;
}

/// What a line of "user-dirs.dirs" says; none when it says nothing of use. The home folder itself stands
/// there for "no such folder".
std::optional<std::string> folderIn(std::string_view line, const std::string& home) {
    line.remove_prefix(std::min(line.find_first_not_of(" \t"), line.size()));
    if (!line.starts_with(kKey)) return std::nullopt;
    std::string folder = unquoted(line.substr(kKey.size()));
    if (folder.starts_with(kHomeVariable)) folder.replace(0, kHomeVariable.size() - 1, home);
    if (!folder.starts_with('/') || folder == home + "/" || folder == home) return std::nullopt;
    return folder;
}

}  // namespace

UserEnvironment UserEnvironment::ofProcess() {
    UserEnvironment environment{environmentText("HOME"), environmentText("XDG_CONFIG_HOME"),
                                environmentText("XDG_VIDEOS_DIR")};
    if (!environment.home.starts_with('/')) environment.home = homeOfAccount();
    return environment;
}

std::string videosFolder(const UserEnvironment& environment) {
    if (environment.videosDir.starts_with('/')) return environment.videosDir;
    const std::string& home = environment.home;
    const std::string config =
        environment.configHome.starts_with('/') ? environment.configHome : home + "/.config";
    const auto content = readFile(config + "/user-dirs.dirs", kMostBytes);
    std::string folder = home + "/Videos";
    std::string_view rest = content ? std::string_view(*content) : std::string_view();
    while (!rest.empty()) {
        const std::size_t end = std::min(rest.find('\n'), rest.size());
        if (const auto found = folderIn(rest.substr(0, end), home)) folder = *found;  // the last one counts
        rest.remove_prefix(std::min(end + 1, rest.size()));
    }
    return folder;
}

}  // namespace kelvo
