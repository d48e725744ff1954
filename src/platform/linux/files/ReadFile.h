#pragma once

#include "base/Result.h"

#include <cstddef>
#include <string>

namespace kelvo {

/// The whole content of the regular file at a host path. Fails when it cannot be read, when it is anything
/// but a regular file (a pipe would never end) and when it holds more than `mostBytes`. Any thread.
Result<std::string> readFile(const std::string& hostPath, std::size_t mostBytes);

}  // namespace kelvo
