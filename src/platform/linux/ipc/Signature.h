#pragma once

#include <optional>
#include <string_view>

namespace kelvo::dbus {

/// Walks the complete types of a signature that is valid.
class SignatureParts {
  public:
    explicit SignatureParts(std::string_view signature) : rest_(signature) {}

    /// The next complete type; none at the end.
    std::optional<std::string_view> next();

  private:
    std::string_view rest_;
};

/// Whether a signature consists of complete types of D-Bus, within the bounds of nesting.
bool isValidSignature(std::string_view signature);

/// Whether it is exactly one of them.
bool isSingleType(std::string_view signature);

}  // namespace kelvo::dbus
