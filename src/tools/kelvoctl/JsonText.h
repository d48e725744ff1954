#pragma once

#include "base/Value.h"

#include <string>

namespace kelvo::ctl {

/// A value as one line of JSON. Dates are seconds since 1970, bytes are base64, errors are objects with
/// "domain", "code" and "description", objects by handle are null. Text that is not UTF-8 is mended.
std::string jsonText(const Value& value);

}  // namespace kelvo::ctl
