#pragma once

#include "base/KVError.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

namespace kelvo {

/// Pieces of memory that follow one another in a file.
using Pieces = std::vector<std::span<const std::byte>>;

/// Writes all of `bytes` at `offset`. Fails with what the file system says (a full volume: ENOSPC).
/// Thread-safe.
OptionalError writeAt(int descriptor, std::uint64_t offset, std::span<const std::byte> bytes);

/// The same for several pieces, one after the other.
OptionalError writeAt(int descriptor, std::uint64_t offset, Pieces pieces);

/// Reads up to `bytes.size()` bytes at `offset`; returns how many there were, less than 0 on failure.
std::int64_t readAt(int descriptor, std::uint64_t offset, std::span<std::byte> bytes);

}  // namespace kelvo
