#pragma once

#include <string>

namespace kelvo {

/// The folder with the frameworks and bundles that belong to this program: "resources" beside it in a build
/// tree,
/// "../share/kelvod" where it is installed.
std::string installedResourceFolder();

}  // namespace kelvo
