#include "platform/linux/log/JournalLog.h"

#include <syslog.h>

#include <systemd/sd-journal.h>

namespace kelvo {
namespace {

int priorityOf(LogLevel level) {
    switch (level) {
        case LogLevel::error:
            return LOG_ERR;
        case LogLevel::sample:
            return LOG_DEBUG;
        default:
            return LOG_INFO;
    }
}

}  // namespace

void JournalLog::write(LogLevel level, std::string_view line) {
    const int priority = priorityOf(level);
    // A journal that is not there drops the line: nobody could be told.
    static_cast<void>(sd_journal_send("SYSLOG_IDENTIFIER=kelvod", "PRIORITY=%d", priority, "MESSAGE=%.*s",
                                      static_cast<int>(line.size()), line.data(), nullptr));
}

}  // namespace kelvo
