#include "platform/linux/system/Resources.h"

#include <filesystem>

namespace kelvo {

std::string installedResourceFolder() {
    std::error_code ignored;
    const auto folder = std::filesystem::read_symlink("/proc/self/exe", ignored).parent_path();
    const auto built = folder / "resources";
    if (std::filesystem::is_directory(built, ignored)) return built.string();
    return (folder.parent_path() / "share" / "kelvod").string();
}

}  // namespace kelvo
