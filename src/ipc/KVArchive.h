#pragma once

#include "base/Result.h"
#include "base/Value.h"

#include <cstddef>
#include <span>
#include <string>
#include <string_view>
#include <utility>

/// Keyed archives: a record as a CBOR map of its class name, under "$class", and its entries.
namespace kelvo {

/// Bytes of an archive, levels of nesting, and items in it altogether that are read at most.
inline constexpr std::size_t kLargestArchive = std::size_t{256} << 10;
inline constexpr int kDeepestArchive = 16;
inline constexpr std::size_t kMostArchivedItems = 16384;

/// Takes and gives a record's entries by key. Caller's thread.
class KVCoder {
  public:
    enum class Kind {
        archive,  ///< bytes that anyone may keep
        ipc,      ///< a message, which can carry objects by handle
    };

    explicit KVCoder(Kind kind, Dictionary entries = {}) : kind_(kind), entries_(std::move(entries)) {}

    bool isIPCCoder() const { return kind_ == Kind::ipc; }
    void encode(std::string_view key, Value value) { entries_.set(key, std::move(value)); }
    /// The entry under `key`; none when it is missing.
    const Value* decode(std::string_view key) const { return entries_.find(key); }
    const Dictionary& entries() const { return entries_; }

  private:
    Kind kind_;
    Dictionary entries_;
};

/// The archive of one record. An object by handle cannot be kept: it reads as nothing afterwards.
Bytes archiveRecord(std::string_view className, const Dictionary& entries);

/// The entries of an archive whose root is of the class `allowedClass`. Fails on any other class, on bytes
/// that are no archive, and beyond the bounds above.
Result<Dictionary> unarchiveRecord(std::span<const std::byte> bytes, std::string_view allowedClass);

/// The archive of a record, by its class's coding.
template <typename Coding, typename Record>
Bytes archivedData(const Record& record) {
    KVCoder coder(KVCoder::Kind::archive);
    Coding::encodeWithCoder(record, coder);
    return archiveRecord(Coding::kClassName, coder.entries());
}

/// The record in an archive, which must be of exactly that class.
template <typename Coding>
auto unarchived(std::span<const std::byte> bytes)
    -> Result<decltype(Coding::initWithCoder(KVCoder(KVCoder::Kind::archive)))> {
    const auto entries = unarchiveRecord(bytes, Coding::kClassName);
    if (!entries) return entries.error();
    return Coding::initWithCoder(KVCoder(KVCoder::Kind::archive, *entries));
}

}  // namespace kelvo
