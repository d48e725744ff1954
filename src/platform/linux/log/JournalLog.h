#pragma once

#include "base/KVLog.h"

namespace kelvo {

/// Writes to the system's journal as "kelvod"; errors with priority "err", what comes with each
/// sample with "debug", the rest with "info". Thread-safe.
class JournalLog : public LogSink {
  public:
    void write(LogLevel level, std::string_view line) override;
};

}  // namespace kelvo
