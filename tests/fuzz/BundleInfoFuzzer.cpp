#include "platform/linux/bundles/BundleInfo.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string_view>

/// Any bytes are a bundle's description, within its bounds, or an error.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    using kelvo::BundleInfo;
    const auto info = BundleInfo::parse(std::string_view(reinterpret_cast<const char*>(data), size));
    if (!info) return 0;
    const auto entries = info->localizedNames.size() + info->entitlements.size() + info->extension.size();
    if (entries > BundleInfo::kMostEntries) std::abort();
    return 0;
}
