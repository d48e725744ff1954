#include "RecordingFixture.h"
#include "support/DaemonRequests.h"

#include <random>
#include <thread>

namespace kelvo::test {
namespace {

using Random = std::mt19937;

int below(Random& random, int end) {
    return std::uniform_int_distribution<>(0, end - 1)(random);
}

/// Clients that ask for whatever comes to their minds. $KELVO_RANDOM_SECONDS says for how long,
/// $KELVO_RANDOM_SEED what comes to them.
class RandomRequestsTest : public RecordingFixture {
  protected:
    void SetUp() override { startDaemon(); }

    static int environmentNumber(const char* name, int otherwise) {
        const char* const text = std::getenv(name);
        return text != nullptr ? std::atoi(text) : otherwise;
    }

    using Start = std::function<std::unique_ptr<ClientProcess>()>;

    /// One client's life, and that of those that come after it.
    void live(const Start& start, unsigned seed, std::chrono::steady_clock::time_point end) {
        Random random(seed);
        auto client = startOne(start);
        while (std::chrono::steady_clock::now() < end) {
            const int mind = below(random, 100);
            if (mind < 1) {
                client->kill();
                client = startOne(start);
            } else if (mind < 15) {
                startSomething(random, *client);
            } else if (mind < 18) {
                saveSomething(random, *client);
            } else {
                requests_[static_cast<std::size_t>(below(random, static_cast<int>(requests_.size())))].make(
                    client->daemon(), [](const Array&) {});
            }
            ++fired_;
            pass(std::chrono::milliseconds(below(random, 20)));
        }
    }
    /// One after the other: a program cannot be run while a process forked meanwhile has it open to write.
    std::unique_ptr<ClientProcess> startOne(const Start& start) {
        const std::lock_guard lock(startMutex_);
        return start();
    }
    static void startSomething(Random& random, const ClientProcess& client) {
        const auto isTrue = [&] { return below(random, 2) == 0; };
        const bool isSystem = isTrue();
        const std::vector<std::uint32_t> windows{client.window()};
        client.daemon().startRecordingWindowLayerContextIDs(
            isTrue() ? windows : std::vector<std::uint32_t>(), {320, 480}, isTrue(), isTrue(),
            below(random, 8) == 0, isSystem, isTrue(), nullptr, [](const auto&, bool, bool) {});
        if (isTrue()) client.daemon().pauseRecording();
        if (isTrue()) client.daemon().resumeRecordingWithWindowLayerContextID(client.window());
        if (isTrue()) client.daemon().stopRecordingWithHandler([](const auto&, const auto&) {});
    }
    void saveSomething(Random& random, const ClientProcess& client) const {
        const auto movies = store();
        if (movies.empty()) return;
        const auto which = static_cast<std::size_t>(below(random, static_cast<int>(movies.size())));
        client.daemon().saveVideoToCameraRoll(URL::file(movies[which]), [](const auto&) {});
    }

    const std::vector<DaemonRequest> requests_ = daemonRequests();
    std::mutex startMutex_;
    std::atomic<int> fired_{0};
};

TEST_F(RandomRequestsTest, DaemonServesThemAllAndGoesOn) {
    const auto seed = static_cast<unsigned>(
        environmentNumber("KELVO_RANDOM_SEED", static_cast<int>(std::random_device()())));
    SCOPED_TRACE("KELVO_RANDOM_SEED=" + std::to_string(static_cast<int>(seed)));
    const auto end =
        std::chrono::steady_clock::now() + std::chrono::seconds(environmentNumber("KELVO_RANDOM_SECONDS", 4));
    const auto accepting = user("other");
    const std::vector<Start> clients{[this] { return shell(); },
                                     [this] {
                                         return startApplication("First", {0, 0, kWidth, kHeight});
                                     },
                                     [this] {
                                         return startApplication("Second", {0, 0, kWidth, kHeight});
                                     },
                                     [this] {  // of no bundle
                                         return std::make_unique<ClientProcess>(
                                             root_.path() + "/stranger", "", socket(), server_.display(),
                                             std::nullopt);
                                     }};
    std::vector<std::thread> lives;
    for (unsigned i = 0; i < clients.size(); ++i)
        lives.emplace_back([this, &clients, i, seed, end] { live(clients[i], seed + i, end); });
    for (std::thread& each : lives)
        each.join();
    const auto last = shell();
    EXPECT_TRUE(last->flag("isRecording").has_value()) << log();
    EXPECT_NE(last->start({{}, false, false, true, false}), std::nullopt) << log();
    EXPECT_NE(last->stop(), std::nullopt) << log();
    daemon_->signal(SIGTERM);
    EXPECT_EQ(daemon_->waitForExit(), 0)
        << log().substr(log().size() - std::min<std::size_t>(log().size(), 20000));
    RecordProperty("fired", fired_);
    EXPECT_GT(fired_, 50);
}

}  // namespace
}  // namespace kelvo::test
