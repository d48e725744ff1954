#include "platform/linux/bundles/StringsTable.h"

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <string>

/// Any bytes are a table or an error; every key of a table is found.
extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
    const auto table = kelvo::StringsTable::parse(std::string(reinterpret_cast<const char*>(data), size));
    if (!table) return 0;
    for (const auto key : table->keys()) {
        if (!table->find(key)) std::abort();
    }
    return 0;
}
