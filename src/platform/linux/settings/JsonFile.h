#pragma once

#include "base/Result.h"

#include <string>

namespace kelvo {

/// The JSON object in the file at a host path, at most 64 KiB and 16 levels deep; deeper values read as
/// nothing. A file that does not exist is an empty object. Fails on anything that is not a JSON object. Any
/// thread.
Result<Dictionary> readJsonFile(const std::string& hostPath);

}  // namespace kelvo
