#include "platform/linux/log/StderrLog.h"

#include <string>
#include <unistd.h>

namespace kelvo {

void StderrLog::write(LogLevel level, std::string_view line) {
    std::string text = level == LogLevel::error ? "kelvod: error: " : "kelvod: ";
    text.append(line).append("\n");
    // A standard error that is closed or full loses the line; there is nobody left to tell.
    static_cast<void>(!::write(STDERR_FILENO, text.data(), text.size()));
}

}  // namespace kelvo
