#pragma once

#include "base/Value.h"

#include <cstddef>
#include <string_view>

/// How our values stand in messages: what their writer and their reader have in common.
namespace kelvo::dbus {

/// Inside a variant, types of ours that D-Bus has none for: a date, a URL, an error, and nothing.
inline constexpr std::string_view kDateSignature = "(x)";
inline constexpr std::string_view kURLSignature = "(s)";
inline constexpr std::string_view kErrorSignature = "(sxa{sv})";
inline constexpr std::string_view kNothingSignature = "y";
inline constexpr std::string_view kSurfaceSignature = "(huuuu)";

/// The boundary in bytes at which a value of the type begins whose signature starts with `type`.
std::size_t alignmentOf(char type);

/// The signature under which a value travels inside a variant; empty for an object.
std::string_view variantSignature(const Value& value);
/// What a variant's value looks like to its signature.
Value asStructure(const Value& value);
/// The same backwards; `value` was read with `signature`.
Value fromStructure(std::string_view signature, Value value);

}  // namespace kelvo::dbus
