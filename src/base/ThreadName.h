#pragma once

#include <string>

namespace kelvo {

/// Names the calling thread after `label`: its last 15 bytes, where dotted labels differ.
void nameCurrentThread(const std::string& label);

}  // namespace kelvo
