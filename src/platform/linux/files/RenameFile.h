#pragma once

#include <string>

namespace kelvo {

/// Gives the item at one host path another on the same volume, unless something stands there. Returns the
/// errno value, 0 on success; EEXIST when the new path is taken. Any thread.
int renameWithoutReplacing(const std::string& from, const std::string& to);

}  // namespace kelvo
