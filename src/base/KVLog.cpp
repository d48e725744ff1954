#include "base/KVLog.h"

#include "base/Guarded.h"

#include <array>
#include <atomic>
#include <cstdarg>
#include <cstdio>

namespace kelvo {
namespace {

constexpr std::size_t kLongestLine = 4096;

std::atomic<bool> areSamplesLogged{true};

Guarded<std::shared_ptr<LogSink>>& currentSink() {
    static Guarded<std::shared_ptr<LogSink>> sink;
    return sink;
}

[[gnu::format(printf, 2, 0)]] void logLine(LogLevel level, const char* format, std::va_list arguments) {
    const std::shared_ptr<LogSink> sink = currentSink().copy();
    if (!sink) return;
    std::array<char, kLongestLine + 1> buffer;  // not zeroed: lines are logged for every sample
    const int wanted = std::vsnprintf(buffer.data(), buffer.size(), format, arguments);
    if (wanted < 0) return;
    const std::size_t length = std::min(static_cast<std::size_t>(wanted), kLongestLine);
    for (std::size_t i = 0; i < length; ++i) {
        const auto byte = static_cast<unsigned char>(buffer[i]);
        if (byte < 0x20 || byte == 0x7F) buffer[i] = ' ';
    }
    sink->write(level, std::string_view(buffer.data(), length));
}

}  // namespace

std::shared_ptr<LogSink> setLogSink(std::shared_ptr<LogSink> sink) {
    return currentSink().exchange(std::move(sink));
}

void setLogsSamples(bool logsSamples) {
    areSamplesLogged = logsSamples;
}

void KVLog(const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    logLine(LogLevel::info, format, arguments);
    va_end(arguments);
}

void KVLogSample(const char* format, ...) {
    if (!areSamplesLogged) return;
    std::va_list arguments;
    va_start(arguments, format);
    logLine(LogLevel::sample, format, arguments);
    va_end(arguments);
}

void KVLogError(const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    logLine(LogLevel::error, format, arguments);
    va_end(arguments);
}

void KVLogConsole(const char* format, ...) {
    std::va_list arguments;
    va_start(arguments, format);
    logLine(LogLevel::console, format, arguments);
    va_end(arguments);
}

}  // namespace kelvo
