#pragma once

#include "base/KVError.h"

#include <string>

namespace kelvo {

/// Makes the directory at a host path, with those above it, unless it is there. Fails when this process could
/// not write to it.
OptionalError makeWritableDirectory(const std::string& hostPath);

}  // namespace kelvo
