#include "platform/linux/media/MediaModule.h"

#include "platform/linux/media/LavMediaService.h"

#include <string_view>

extern "C" [[gnu::visibility("default")]] void kelvoMakeMediaService(
    const char* version, const std::shared_ptr<kelvo::FileSystem>& fileSystem,
    std::shared_ptr<kelvo::MediaService>& service) {
    if (std::string_view(version) == KELVO_VERSION)
        service = std::make_shared<kelvo::LavMediaService>(fileSystem);
}
