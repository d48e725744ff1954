#pragma once

#include "ipc/KVArchive.h"
#include "ipc/KVBroadcastConfiguration.h"

#include <string_view>

namespace kelvo {

/// How broadcast settings are archived. Caller's thread.
struct KVBroadcastConfigurationCoding {
    static constexpr std::string_view kClassName = "KVBroadcastConfiguration";
    static constexpr bool supportsSecureCoding = true;

    /// The clip's length always; compression properties only when there are any.
    static void encodeWithCoder(const KVBroadcastConfiguration& configuration, KVCoder& coder);
    /// A length that is missing or no number, as a boolean is none, is 0; one that is not finite stays so.
    /// Properties that are missing or no dictionary are none.
    static KVBroadcastConfiguration initWithCoder(const KVCoder& coder);
};

}  // namespace kelvo
