#include "ipc/KVArchive.h"

#include "ipc/CBOR.h"

#include <cerrno>

namespace kelvo {
namespace {

constexpr std::string_view kClassKey = "$class";

}  // namespace

Bytes archiveRecord(std::string_view className, const Dictionary& entries) {
    Dictionary root{{std::string(kClassKey), className}};
    root.merge(entries);
    return cbor::encode(root);
}

Result<Dictionary> unarchiveRecord(std::span<const std::byte> bytes, std::string_view allowedClass) {
    if (bytes.size() > kLargestArchive) return KVError::posix(EMSGSIZE, "archive");
    const auto root = cbor::decode(bytes, {kDeepestArchive, kMostArchivedItems});
    if (!root) return root.error();
    const Dictionary* record = root->asDictionary();
    const Value* className = record != nullptr ? record->find(kClassKey) : nullptr;
    if (className == nullptr || *className != Value(allowedClass))
        return KVError::posix(EBADMSG, "archive of another class");
    Dictionary entries = *record;
    entries.remove(kClassKey);
    return entries;
}

}  // namespace kelvo
