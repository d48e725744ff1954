#pragma once

#include "platform/FileSystem.h"
#include "platform/MediaService.h"

#include <memory>

namespace kelvo {

/// The file name of the media module, and the one function that it exports.
inline constexpr const char* kMediaModuleName = "kelvod-media.so";
inline constexpr const char* kMediaModuleFunction = "kelvoMakeMediaService";

/// Makes the media service; none when the module belongs to another version of the program than `version`.
using MediaModuleFunction = void(const char* version, const std::shared_ptr<FileSystem>& fileSystem,
                                 std::shared_ptr<MediaService>& service);

}  // namespace kelvo
