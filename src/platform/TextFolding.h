#pragma once

#include <string>
#include <string_view>

namespace kelvo {

/// Makes texts comparable without regard to case and diacritics. Implemented with Unicode's tables by the
/// Linux adapter and, for Latin letters, by the simulated device. Any thread.
class TextFolding {
  public:
    virtual ~TextFolding() = default;

    /// `text` (UTF-8) with letters folded to one case and their marks removed: "Écran" and "ecran" fold
    /// alike. Text that is not UTF-8 comes back as it is.
    virtual std::string folded(std::string_view text) = 0;
};

}  // namespace kelvo
