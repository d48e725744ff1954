#include "platform/linux/log/JournalLog.h"

#include <syslog.h>

#include <systemd/sd-journal.h>

namespace kelvo {

void JournalLog::write(LogLevel level, std::string_view line) {
    const int priority = level == LogLevel::error ? LOG_ERR : LOG_INFO;
    // A journal that is not there drops the line: nobody could be told.
    static_cast<void>(sd_journal_send("SYSLOG_IDENTIFIER=kelvod", "PRIORITY=%d", priority, "MESSAGE=%.*s",
                                      static_cast<int>(line.size()), line.data(), nullptr));
}

}  // namespace kelvo
