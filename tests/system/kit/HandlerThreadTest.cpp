#include "ipc/KVClientProtocolTable.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/ChildProcess.h"
#include "support/Eventually.h"
#include "support/OpenDoor.h"
#include "support/TemporaryDirectory.h"
#include "support/Threads.h"

#include <atomic>
#include <future>
#include <kelvokit/KelvoKit.h>
#include <memory>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using kelvokit::Recorder;
using test::eventually;
using test::OpenDoor;

/// Recorders with the library's own threads, before a daemon that answers at once.
class HandlerThreadTest : public testing::Test {
  protected:
    HandlerThreadTest() {
        listener->setDelegate(door);
        listener->resume();
    }

    /// A recorder that is connected.
    std::unique_ptr<Recorder> recorder() {
        door->client.set(nullptr);
        auto made =
            std::make_unique<Recorder>(kelvokit::RecorderOptions{.socketPath = socket, .executor = {}});
        EXPECT_TRUE(isAnswered(*made));
        EXPECT_TRUE(eventually([this] { return door->client.copy() != nullptr; }));
        return made;
    }
    static bool isAnswered(Recorder& recorder) {
        const auto answer = std::make_shared<std::promise<bool>>();
        recorder.isBroadcasting("any", [answer](bool value, const auto&) { answer->set_value(value); });
        auto future = answer->get_future();
        return future.wait_for(std::chrono::seconds(30)) == std::future_status::ready && future.get();
    }
    /// Tells the latest recorder so often what time it is.
    void tick(int count) {
        RemoteClient told = remoteClient(*door->client.copy(), "cannot tell");
        for (int i = 0; i < count; ++i)
            told.recordingTimerDidUpdate(std::to_string(i));
    }
    std::optional<int> exitOf(const std::string& mode) const {
        test::ChildProcess program({EXITING_CLIENT_PROGRAM, mode, socket});
        return program.waitForExit();
    }

    const test::TemporaryDirectory root;
    const std::string socket = root.path() + "/run/kelvod/com.quillon.kelvod";
    const std::shared_ptr<OpenDoor> door = std::make_shared<OpenDoor>();
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
    std::shared_ptr<IPCListener> listener = transport.createListener("com.quillon.kelvod");
};

TEST_F(HandlerThreadTest, RecorderMayGoInsideItsHandlerOnWhicheverThread) {
    for (int round = 0; round < 40; ++round) {
        auto going = recorder();
        std::atomic<int> heard{0};
        const auto gone = std::make_shared<std::promise<void>>();
        going->onTimer([&, gone](const std::string&) {
            ++heard;
            going.reset();
            gone->set_value();
        });
        tick(1 + round % 8);
        gone->get_future().wait();
        EXPECT_EQ(heard, 1);
    }
}

TEST_F(HandlerThreadTest, RecorderMayGoWhileItIsToldManyThings) {
    for (int round = 0; round < 40; ++round) {
        auto going = recorder();
        std::atomic<bool> isGone{false};
        std::atomic<int> heard{0};
        going->onTimer([&](const std::string&) {
            EXPECT_FALSE(isGone);
            ++heard;
        });
        tick(50);
        EXPECT_TRUE(eventually([&] { return heard > round % 5; }));
        going.reset();
        isGone = true;
    }
}

TEST_F(HandlerThreadTest, HandlerThatTakesItsTimeHoldsUpNoOtherRecorder) {
    const auto slow = recorder();
    std::promise<void> release;
    std::atomic<int> heard{0};
    std::atomic<bool> isBusy{false};
    slow->onTimer([&, released = release.get_future().share()](const std::string&) {
        isBusy = true;
        released.wait();
        ++heard;
    });
    tick(3);
    ASSERT_TRUE(eventually([&] { return isBusy.load(); }));
    const auto other = recorder();
    for (int i = 0; i < 20; ++i)
        EXPECT_TRUE(isAnswered(*other)) << i;
    EXPECT_EQ(heard, 0);
    release.set_value();
    EXPECT_TRUE(eventually([&] { return heard == 3; }));
    EXPECT_TRUE(isAnswered(*slow));
}

TEST_F(HandlerThreadTest, HandlerMayWaitForAnotherRecordersAnswer) {
    const auto other = recorder();
    const auto waiting = recorder();
    const auto outcome = std::make_shared<std::promise<bool>>();
    waiting->onTimer([&, outcome](const std::string&) { outcome->set_value(isAnswered(*other)); });
    tick(1);
    EXPECT_TRUE(outcome->get_future().get());
}

TEST_F(HandlerThreadTest, RecorderThatGoesWaitsForAHandlerThatRunsElsewhere) {
    auto going = recorder();
    std::promise<void> release;
    std::atomic<bool> isBusy{false};
    std::atomic<bool> isDone{false};
    going->onTimer([&, released = release.get_future().share()](const std::string&) {
        isBusy = true;
        released.wait();
        isDone = true;
    });
    tick(1);
    ASSERT_TRUE(eventually([&] { return isBusy.load(); }));
    std::atomic<bool> wasDone{false};
    test::BlockingCaller caller([&] {
        going.reset();
        wasDone = isDone.load();
    });
    caller.awaitBlocked();
    release.set_value();
    caller.join();
    EXPECT_TRUE(wasDone);
}

TEST_F(HandlerThreadTest, ProcessMayEndInsideAHandler) {
    EXPECT_EQ(exitOf("inside"), 4);
}

TEST_F(HandlerThreadTest, EndOfTheProcessDoesNotWaitForAHandler) {
    EXPECT_EQ(exitOf("outside"), 3);
}

}  // namespace
}  // namespace kelvo
