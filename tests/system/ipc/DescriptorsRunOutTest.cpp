#include "SocketFixture.h"
#include "support/RawSocket.h"

#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <sys/resource.h>

namespace kelvo {
namespace {

using test::eventually;
using test::RawSocket;

/// For as long as it lives this process can open nothing more.
class NoDescriptorLeft {
  public:
    NoDescriptorLeft() {
        int highest = 0;
        for (const auto& entry : std::filesystem::directory_iterator("/proc/self/fd"))
            highest = std::max(highest, std::stoi(entry.path().filename().string()));
        // No gaps below the limit.
        do {
            fillers_.emplace_back(::open("/dev/null", O_RDONLY | O_CLOEXEC));
        } while (fillers_.back() && fillers_.back().get() <= highest);
        ::getrlimit(RLIMIT_NOFILE, &before_);
        rlimit now = before_;
        now.rlim_cur = static_cast<rlim_t>(fillers_.back().get()) + 1;
        ::setrlimit(RLIMIT_NOFILE, &now);
    }
    ~NoDescriptorLeft() { ::setrlimit(RLIMIT_NOFILE, &before_); }
    NoDescriptorLeft(const NoDescriptorLeft&) = delete;
    NoDescriptorLeft& operator=(const NoDescriptorLeft&) = delete;

  private:
    std::vector<UniqueFd> fillers_;
    rlimit before_{};
};

class DescriptorsRunOutTest : public test::SocketFixture {
  protected:
    static bool connectTo(const std::string& path, const UniqueFd& socket) {
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        path.copy(address.sun_path, sizeof(address.sun_path) - 1);
        return ::connect(socket.get(), reinterpret_cast<sockaddr*>(&address), sizeof(address)) == 0;
    }
};

TEST_F(DescriptorsRunOutTest, WhoComesMeanwhileIsTurnedAwayOneAfterTheOther) {
    constexpr std::size_t kClients = 3;
    const Client before = connect();
    acceptedLast();
    // Once beforehand: for what it meets for the first time a sanitizer may need a descriptor itself.
    before.daemon->pauseRecording();
    ASSERT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    std::vector<UniqueFd> sockets(kClients);
    for (UniqueFd& each : sockets)
        each.reset(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0));
    std::vector<RawSocket> refused;
    {
        const NoDescriptorLeft exhausted;
        for (UniqueFd& each : sockets) {
            ASSERT_TRUE(connectTo(path, each));
            refused.emplace_back(std::move(each));
            EXPECT_TRUE(refused.back().isCutOff());
        }
        before.daemon->pauseRecording();
        EXPECT_TRUE(eventually([&] { return daemon->requests().size() == 2; }))
            << "the others notice nothing";
    }
    EXPECT_EQ(log.count("IPC: turned away a client: no descriptors left"), kClients);
    EXPECT_EQ(gate->accepted.copy().size(), 1U);
    expectOthersAreServed();
}

}  // namespace
}  // namespace kelvo
