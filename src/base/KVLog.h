#pragma once

#include <memory>
#include <string>
#include <string_view>

namespace kelvo {

enum class LogLevel {
    info,     ///< what happened, one line an event
    sample,   ///< what became of one picture or piece of sound: hundreds of lines a second
    error,    ///< something failed
    console,  ///< plain print-outs beside the structured log
};

/// Receives every log line. Implemented by the journal, standard error and a test's recorder; called on
/// whatever thread logs, from several at once, so implementations are thread-safe.
class LogSink {
  public:
    virtual ~LogSink() = default;

    /// `line` has neither a line break nor another control character.
    virtual void write(LogLevel level, std::string_view line) = 0;
};

/// Sends the process's log lines to `sink` from now on and returns the sink before it. With none (the start
/// of every process) lines are dropped. Thread-safe.
std::shared_ptr<LogSink> setLogSink(std::shared_ptr<LogSink> sink);

/// Whether lines of the level `sample` are logged; they are at first. Thread-safe.
void setLogsSamples(bool logsSamples);

/// Log one event, printf-style, as one line: control characters in what is logged become spaces, so that no
/// client's text can look like a line of ours, and a line ends after 4096 bytes. Thread-safe.
[[gnu::format(printf, 1, 2)]] void KVLog(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void KVLogSample(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void KVLogError(const char* format, ...);
[[gnu::format(printf, 1, 2)]] void KVLogConsole(const char* format, ...);

}  // namespace kelvo
