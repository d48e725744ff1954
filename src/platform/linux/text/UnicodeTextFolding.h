#pragma once

#include "platform/TextFolding.h"

namespace kelvo {

/// Folds with Unicode's case folding and decomposition tables. Thread-safe.
class UnicodeTextFolding : public TextFolding {
  public:
    std::string folded(std::string_view text) override;
};

}  // namespace kelvo
