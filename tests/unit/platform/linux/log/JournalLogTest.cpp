#include "base/UniqueFd.h"
#include "platform/linux/log/JournalLog.h"

#include <array>
#include <cerrno>
#include <cstring>
#include <filesystem>
#include <sched.h>
#include <string>
#include <string_view>
#include <sys/mount.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <thread>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using testing::Contains;

/// The fields of one entry, as the journal got them.
using Entry = std::vector<std::string>;

/// A journal of the calling thread's own: where the thread looks for the system's, there is this one.
class OwnJournal {
  public:
    /// Whether this may be done here.
    bool open() {
        constexpr std::string_view kPath = "/run/systemd/journal/socket";
        if (::unshare(CLONE_NEWNS) != 0 ||
            ::mount(nullptr, "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0 ||
            ::mount("none", "/run", "tmpfs", 0, "size=1m") != 0)
            return false;
        std::filesystem::create_directories("/run/systemd/journal");
        socket_ = UniqueFd(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
        sockaddr_un address{AF_UNIX, {}};
        kPath.copy(address.sun_path, sizeof address.sun_path - 1);
        return ::bind(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0;
    }

    /// The entry that came next; empty when none has come.
    Entry next() const {
        std::array<char, 4096> bytes{};
        const ssize_t size = ::recv(socket_.get(), bytes.data(), bytes.size(), 0);
        Entry fields;
        std::string text(bytes.data(), size > 0 ? static_cast<std::size_t>(size) : 0);
        for (std::size_t end = 0; (end = text.find('\n')) != std::string::npos; text.erase(0, end + 1))
            fields.push_back(text.substr(0, end));
        return fields;
    }

  private:
    UniqueFd socket_;
};

/// What a test does with a journal, on a thread that sees a file system of its own.
class JournalLogTest : public testing::Test {
  protected:
    template <typename Act>
    static void withJournal(Act act) {
        int refusal = 0;
        std::thread([&] {
            OwnJournal journal;
            if (journal.open()) return act(journal);
            refusal = errno;
        }).join();
        if (refusal != 0)
            GTEST_SKIP() << "no file system of one's own can be had here: " << std::strerror(refusal);
    }
};

TEST_F(JournalLogTest, EachLevelHasItsPriority) {
    withJournal([](const OwnJournal& journal) {
        JournalLog log;
        const std::vector<std::pair<LogLevel, std::string>> rows{{LogLevel::error, "PRIORITY=3"},
                                                                 {LogLevel::info, "PRIORITY=6"},
                                                                 {LogLevel::console, "PRIORITY=6"},
                                                                 {LogLevel::sample, "PRIORITY=7"}};
        for (const auto& [level, priority] : rows) {
            log.write(level, "something");
            EXPECT_THAT(journal.next(), Contains(priority));
        }
    });
}

TEST_F(JournalLogTest, LineIsTheMessageOfOneEntryOfTheDaemons) {
    withJournal([](const OwnJournal& journal) {
        const std::string_view line = "100 % of it%s, and no more";
        JournalLog().write(LogLevel::info, line.substr(0, 13));
        const Entry entry = journal.next();
        EXPECT_THAT(entry, Contains("MESSAGE=100 % of it%s"));
        EXPECT_THAT(entry, Contains("SYSLOG_IDENTIFIER=kelvod"));
        EXPECT_TRUE(journal.next().empty());
    });
}

TEST_F(JournalLogTest, JournalThatIsNotThereLosesTheLineAndNoMore) {
    withJournal([](const OwnJournal& journal) {
        std::filesystem::rename("/run/systemd/journal/socket", "/run/elsewhere");
        JournalLog().write(LogLevel::error, "lost");
        std::filesystem::rename("/run/elsewhere", "/run/systemd/journal/socket");
        JournalLog().write(LogLevel::error, "kept");
        EXPECT_THAT(journal.next(), Contains("MESSAGE=kept"));
        EXPECT_TRUE(journal.next().empty());
    });
}

}  // namespace
}  // namespace kelvo
