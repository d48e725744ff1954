#pragma once

#include "base/KVError.h"
#include "base/UniqueFd.h"

#include <string>

namespace kelvo {

/// Puts the content of the open regular file `source` at `hostPath`, where nothing stands yet, and returns
/// when it is on the disk. The pixels are shared with the source where the volume can do that (a clone, else
/// a second name of the same file) and copied where it cannot. On failure nothing is left at `hostPath`. Any
/// thread; blocks for as long as the disk takes.
OptionalError stageFile(const UniqueFd& source, const std::string& hostPath);

}  // namespace kelvo
