#pragma once

#include <array>
#include <cstdint>
#include <string>

namespace kelvo {

/// A universally unique identifier.
struct UUID {
    std::array<std::uint8_t, 16> bytes{};

    /// A random (version 4) identifier made of 16 random bytes.
    static UUID fromRandomBytes(std::array<std::uint8_t, 16> random);

    /// "xxxxxxxx-xxxx-xxxx-xxxx-xxxxxxxxxxxx", upper case.
    std::string text() const;

    friend bool operator==(const UUID&, const UUID&) = default;
};

}  // namespace kelvo
