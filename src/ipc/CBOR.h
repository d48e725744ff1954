#pragma once

#include "base/Result.h"
#include "base/Value.h"

#include <cstddef>
#include <span>

/// Values as CBOR (RFC 8949), in its deterministic form but for the order of map entries, which is kept.
namespace kelvo::cbor {

/// What a decoder takes at most.
struct Bounds {
    int nesting;
    std::size_t items;
};

/// Dates and URLs carry the standard's tags 1 and 32, an error is an array of its parts under a tag of our
/// own, 40801. An object by handle cannot be kept and becomes undefined.
Bytes encode(const Value& value);

/// The one value that `bytes` hold. Fails on anything else: other items, text that is not UTF-8, a key that
/// is no text or stands twice, trailing bytes, indefinite lengths, more than the bounds. Takes memory in
/// proportion to the bytes given, whatever lengths they claim.
Result<Value> decode(std::span<const std::byte> bytes, const Bounds& bounds);

}  // namespace kelvo::cbor
