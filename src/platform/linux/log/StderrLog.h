#pragma once

#include "base/KVLog.h"

namespace kelvo {

/// Writes "kelvod: LINE" to standard error, errors as "kelvod: error: LINE"; one write a line. Thread-safe.
class StderrLog : public LogSink {
  public:
    void write(LogLevel level, std::string_view line) override;
};

}  // namespace kelvo
