#pragma once

#include "base/Guarded.h"
#include "base/KVLog.h"

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

namespace kelvo::test {

/// Records every log line of the process while it lives. Thread-safe.
class LogRecorder {
  public:
    struct Line {
        LogLevel level;
        std::string text;
        friend bool operator==(const Line&, const Line&) = default;
    };

    LogRecorder();
    ~LogRecorder();
    LogRecorder(const LogRecorder&) = delete;
    LogRecorder& operator=(const LogRecorder&) = delete;

    /// The lines so far, in order.
    std::vector<Line> lines() const;
    /// Their texts alone.
    std::vector<std::string> texts() const;
    /// How often exactly this text was logged (at any level, or at `level`).
    std::size_t count(const std::string& text) const;
    std::size_t count(LogLevel level, const std::string& text) const;
    bool contains(const std::string& text) const { return count(text) > 0; }
    void clear();

  private:
    class Sink;
    std::shared_ptr<Sink> sink_;
    std::shared_ptr<LogSink> previous_;
};

}  // namespace kelvo::test
