#include "platform/linux/bundles/DesktopEntryFile.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

/// Any bytes are a desktop entry, whose texts came from them, or an error.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using kelvo::DesktopEntryFile;
    const auto file = DesktopEntryFile::parse(std::string_view(reinterpret_cast<const char*>(data), size));
    if (!file) return 0;
    std::size_t characters = file->name.size() + file->icon.size();
    for (const auto& argument : file->command)
        characters += argument.size();
    if (characters > size) std::abort();
    return 0;
}
