#pragma once

#include "base/Date.h"
#include "platform/AnalyticsSink.h"

#include <string>

namespace kelvo {

/// A message as one line of JSON, without the line's end. Dates read as seconds since 1970, whatever JSON has
/// no word for as its description, and bytes that are not UTF-8 as U+FFFD. Any thread.
std::string analyticsLine(const AnalyticsMessage& message, Date time);

}  // namespace kelvo
