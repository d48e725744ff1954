#include "SocketFixture.h"
#include "WireCalls.h"
#include "support/RawSocket.h"

namespace kelvo {
namespace {

using test::BodyBytes;
using test::eventually;
using test::RawSocket;
using test::requestBytes;
using testing::ElementsAre;

/// What the daemon is told of peers that keep no manners.
class AcceptingTest : public test::SocketFixture {
  protected:
    std::vector<std::string> linesAbout(const std::string& part) const {
        std::vector<std::string> lines = log.texts();
        std::erase_if(lines, [&](const std::string& line) { return line.find(part) == std::string::npos; });
        return lines;
    }
};

TEST_F(AcceptingTest, DaemonIsToldOfAClientBeforeARequestThatWasThereAtOnceIsServed) {
    // From now on a thread is left for the sockets while another one is busy.
    ASSERT_NO_FATAL_FAILURE(expectOthersAreServed());
    ASSERT_TRUE(eventually([&] { return daemon->departures.copy().size() == 2; }));
    std::atomic<int> servedWhileTold{-1};
    daemon->onArrival.set([&] {
        // Slow to be told: whoever could be served meanwhile would be.
        eventually([&] { return daemon->requests().size() > 1; }, std::chrono::milliseconds(300));
        servedWhileTold = static_cast<int>(daemon->requests().size());
    });
    daemon->onRequest.set([&](const std::string&) { EXPECT_NE(servedWhileTold, -1); });
    ASSERT_EQ(daemon->requests().size(), 1U);
    RawSocket hasty(path);
    hasty.authenticate();
    hasty.write(requestBytes("pauseRecording", "", {}));
    ASSERT_TRUE(eventually([&] { return daemon->requests().size() == 2; }));
    EXPECT_EQ(servedWhileTold, 1);
}

TEST_F(AcceptingTest, ClientThatIsCutOffIsReportedOnceAsInvalid) {
    const Client bystander = connect();
    acceptedLast();
    RawSocket hostile(path);
    hostile.authenticate();
    hostile.write(requestBytes("setMicrophoneEnabled", "i", BodyBytes().u32(5).bytes()));
    EXPECT_TRUE(hostile.isCutOff());
    ASSERT_TRUE(eventually([&] { return !daemon->departures.copy().empty(); }));
    ASSERT_TRUE(eventually([&] { return log.contains("connection INVALID"); }));
    EXPECT_EQ(cutOffs().size(), 1U);
    EXPECT_THAT(linesAbout("connection IN"), ElementsAre("connection INVALID"));
    EXPECT_THAT(daemon->departures.copy(), ElementsAre(testing::Pair("com.example.test", ::getpid())));
    EXPECT_EQ(*bystander.invalidations, 0);
}

}  // namespace
}  // namespace kelvo
