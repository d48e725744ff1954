#include "SocketFixture.h"
#include "ipc/KVClientProxy.h"
#include "platform/IPCBounds.h"
#include "support/RawSocket.h"

#include <array>
#include <span>

namespace kelvo {
namespace {

using test::eventually;
using test::RawSocket;

/// A client that does not read: of what is sent to it, the socket takes some and the rest waits.
class UnsentMessageTest : public test::SocketFixture {
  protected:
    UnsentMessageTest() {
        client.authenticate();
        client.readUntil("AGREE_UNIX_FD\r\n");
    }

    void send(int count) {
        KVClientProxy proxy(acceptedLast());
        const Bytes sound(std::size_t{256} << 10);
        for (int i = 0; i < count; ++i)
            proxy.captureHandlerWithAudioSample(sound, {}, 1, SampleBuffer::Type::microphone, {});
        proxy.setConnection(nullptr);
    }
    /// How many whole messages come until the connection ends.
    std::size_t arrived() const {
        Bytes all;
        std::array<std::byte, 65536> buffer;
        for (ssize_t count = 1; count > 0; all.insert(all.end(), buffer.begin(), buffer.begin() + count))
            count = std::max<ssize_t>(::recv(client.descriptor(), buffer.data(), buffer.size(), 0), 0);
        std::size_t messages = 0;
        for (std::span<const std::byte> rest(all); rest.size() >= dbus::kFixedHeader; ++messages) {
            const auto size = dbus::messageSize(rest);
            if (!size || *size > rest.size()) break;
            rest = rest.subspan(*size);
        }
        return messages;
    }
    std::size_t failures() const {
        return log.count(LogLevel::error,
                         "KVClientProxy:captureHandlerWithAudioSample: error getting remote proxy: 107");
    }

    RawSocket client{path};
};

TEST_F(UnsentMessageTest, WhatACutOffClientDidNotGetIsReportedOnceEach) {
    send(100);
    ASSERT_EQ(cutOffs().size(), 1U);
    const std::size_t read = arrived();
    EXPECT_TRUE(eventually([&] { return failures() == 100 - read; })) << failures() << " and " << read;
    expectOthersAreServed();
    EXPECT_EQ(failures(), 100 - read);
}

TEST_F(UnsentMessageTest, WhatWaitedWhenThisSideEndedTheConnectionIsReported) {
    send(15);
    EXPECT_EQ(failures(), 0U) << "it may read yet";
    acceptedLast()->invalidate();
    const std::size_t read = arrived();
    EXPECT_LT(read, 15U);
    EXPECT_TRUE(eventually([&] { return failures() == 15 - read; })) << failures() << " and " << read;
}

TEST_F(UnsentMessageTest, WhatWaitedForAClientThatDiedIsReported) {
    send(15);
    EXPECT_EQ(failures(), 0U);
    client = RawSocket(UniqueFd());
    EXPECT_TRUE(eventually([&] { return log.contains("connection INVALID"); }));
    EXPECT_TRUE(eventually([&] { return failures() > 0; }));
    EXPECT_LE(failures(), 15U);
}

/// What the other side would cut this one off for is refused before it is sent.
class LargeMessageTest : public test::SocketFixture {
  protected:
    void expectStillServed(const Client& client) {
        const std::size_t before = daemon->requests().size();
        client.daemon->pauseRecording();
        EXPECT_TRUE(eventually([&] { return daemon->requests().size() == before + 1; }));
        EXPECT_EQ(*client.invalidations, 0);
        EXPECT_TRUE(cutOffs().empty());
    }
};

TEST_F(LargeMessageTest, RequestBeyondTheBoundFailsAndTheConnectionGoesOn) {
    const Client client = connect();
    client.daemon->setupBroadcastWithHostBundleID("", "", Bytes(ipc_bounds::kLargestMessage), {},
                                                  [](const auto&) { FAIL(); });
    EXPECT_EQ(*client.errors, 1);
    expectStillServed(client);
}

TEST_F(LargeMessageTest, CallbackBeyondTheBoundFailsAndTheConnectionGoesOn) {
    const Client client = connect();
    KVClientProxy proxy(acceptedLast());
    const Bytes sound(ipc_bounds::kLargestMessage);
    proxy.captureHandlerWithAudioSample(sound, {}, 1, SampleBuffer::Type::microphone, {});
    EXPECT_EQ(log.count("KVClientProxy:captureHandlerWithAudioSample: error getting remote proxy: 90"), 1U);
    expectStillServed(client);
    EXPECT_TRUE(client.callbacks->messages().empty());
}

TEST_F(LargeMessageTest, ReplyBeyondTheBoundFailsItsRequestAlone) {
    daemon->keepsStopHandler = true;
    const Client client = connect();
    client.daemon->stopRecordingWithHandler([](const auto&, const auto&) { FAIL(); });
    ASSERT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    daemon->keptStopHandler.exchange(nullptr)(URL(std::string(ipc_bounds::kLongestString + 1, 'x')),
                                              std::nullopt);
    EXPECT_TRUE(eventually([&] { return *client.errors == 1; }));
    EXPECT_EQ(log.count("IPC: reply of stopRecordingWithHandler cannot be sent"), 1U);
    expectStillServed(client);
}

}  // namespace
}  // namespace kelvo
