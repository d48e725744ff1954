#include "GoldenFile.h"
#include "ipc/KVClientProtocolTable.h"
#include "ipc/KVRemoteDaemon.h"
#include "platform/linux/ipc/Introspection.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "platform/linux/ipc/SocketEndpoint.h"
#include "support/DaemonRequests.h"
#include "support/Eventually.h"
#include "support/FakeClientProxy.h"
#include "support/FakeDaemon.h"
#include "support/RawSocket.h"

#include <algorithm>
#include <set>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::RawSocket;
using test::WireMessage;

constexpr const char* kServersAnswers = "OK 6b656c766f640000000000000000001f\r\nAGREE_UNIX_FD\r\n";

std::string hex(std::size_t number, int digits) {
    std::string text;
    for (int i = digits - 1; i >= 0; --i)
        text += "0123456789abcdef"[(number >> (4 * i)) & 15];
    return text;
}

/// Rows of sixteen bytes, in hexadecimal and as text.
std::string dump(const WireMessage& message) {
    std::string text;
    for (std::size_t row = 0; row < message.bytes.size(); row += 16) {
        std::string numbers;
        std::string characters;
        for (std::size_t i = row; i < std::min(row + 16, message.bytes.size()); ++i) {
            const auto byte = std::to_integer<unsigned char>(message.bytes[i]);
            numbers += " " + hex(byte, 2);
            characters += byte >= 32 && byte < 127 ? static_cast<char>(byte) : '.';
        }
        numbers.resize(48, ' ');
        text += hex(row, 4) + " " + numbers + "  " + characters + "\n";
    }
    if (!message.descriptors.empty())
        text += "and " + std::to_string(message.descriptors.size()) + " descriptor\n";
    return text;
}

/// A golden file: messages one below the other, each under its title.
class Sheet {
  public:
    explicit Sheet(std::string name) : name_(std::move(name)) {}
    void add(const std::string& title, const WireMessage& message) {
        text_ += (text_.empty() ? "" : "\n") + title + "\n" + dump(message);
    }
    void compare() const {
        test::expectGolden(std::filesystem::path(KELVO_GOLDEN_MESSAGES) / (name_ + ".txt"), text_);
    }

  private:
    const std::string name_;
    std::string text_;
};

/// One callback as the daemon makes it.
struct DaemonCallback {
    const char* name;
    std::function<void(KVClientProtocol&)> make;
};

std::vector<DaemonCallback> daemonCallbacks() {
    const KVError error("domain", -5809, {{"key", "text"}});
    const TimingRecord timing{{1, 60, 1, 0}, {90, 60, 1, 0}, {}};
    const auto frame = std::make_shared<KVIOSurfaceObject>();
    frame->setIOSurface(*VideoSurface::create(VideoSurface::Geometry::packed(4, 2)));
    using C = KVClientProtocol;
    return {
        {"updateScreenRecordingState", [](C& c) { c.updateScreenRecordingState(); }},
        {"updateBroadcastServiceInfo, one value of each kind",
         [=](C& c) {
             c.updateBroadcastServiceInfo({{"nothing", Value()},
                                           {"boolean", true},
                                           {"integer", -7},
                                           {"large", std::uint64_t{UINT64_MAX}},
                                           {"double", 1.5},
                                           {"text", "é"},
                                           {"bytes", Bytes{std::byte{1}, std::byte{2}}},
                                           {"date", Date{1500000000}},
                                           {"url", URL("https://example.com")},
                                           {"error", error},
                                           {"array", Array{1, "x"}},
                                           {"dictionary", Dictionary{{"a", false}}}});
         }},
        {"updateBroadcastURL", [](C& c) { c.updateBroadcastURL(URL("https://example.com/live")); }},
        {"recordingDidStopWithError, stopped by an error",
         [=](C& c) { c.recordingDidStopWithError(error, std::nullopt); }},
        {"recordingDidStopWithError, with a movie",
         [](C& c) { c.recordingDidStopWithError(std::nullopt, URL("file:///m.mp4")); }},
        {"recordingLockInterrupted", [=](C& c) { c.recordingLockInterrupted(error); }},
        {"recordingShouldResume", [](C& c) { c.recordingShouldResume(); }},
        {"recordingDidPause", [](C& c) { c.recordingDidPause(); }},
        {"recordingTimerDidUpdate", [](C& c) { c.recordingTimerDidUpdate("00:01"); }},
        {"captureHandlerWithSample", [=](C& c) { c.captureHandlerWithSample(frame, bytesOfRecord(timing)); }},
        {"captureHandlerWithSample, without a surface",
         [=](C& c) {
             c.captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(), bytesOfRecord(timing));
         }},
        {"captureHandlerWithAudioSample",
         [=](C& c) {
             const Bytes sound{std::byte{1}, std::byte{2}, std::byte{3}, std::byte{4}};
             c.captureHandlerWithAudioSample(sound, bytesOfRecord(AudioFormatRecord::signed16(44100, 2)), 1,
                                             SampleBuffer::Type::microphone, bytesOfRecord(timing));
         }},
    };
}

class MessageBytesTest : public testing::Test {
  protected:
    using Side = SocketConnection::Side;

    ~MessageBytesTest() override { loop->stop(); }

    /// A connection as a client has it, with its greeting read.
    std::shared_ptr<SocketConnection> clientAt(UniqueFd socket) {
        auto client = std::make_shared<SocketConnection>(Side::client, std::move(socket), loop, nullptr,
                                                         nullptr, nullptr);
        client->setRemoteInterface(interfaceOf<KVDaemonProtocol>());
        client->setExported(interfaceOf<KVClientProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks));
        client->resume();
        return client;
    }
    /// A connection as the daemon has it, with its answers to a client's greeting read.
    std::shared_ptr<SocketConnection> serverAt(RawSocket& end, UniqueFd socket) {
        auto server = std::make_shared<SocketConnection>(Side::server, std::move(socket), loop, nullptr,
                                                         nullptr, nullptr);
        server->setRemoteInterface(interfaceOf<KVClientProtocol>());
        server->setExported(interfaceOf<KVDaemonProtocol>(),
                            std::make_shared<ProtocolDispatcher<KVDaemonProtocol>>(daemon));
        server->resume();
        end.write(dbus::clientGreeting(::getuid()));
        EXPECT_EQ(end.readUntil("AGREE_UNIX_FD\r\n"), kServersAnswers);
        return server;
    }
    WireMessage request(const std::function<void(KVDaemonProtocol&)>& make) {
        auto [end, socket] = RawSocket::pair();
        const auto client = clientAt(std::move(socket));
        KVRemoteDaemon remote(*client, nullptr);
        make(remote);
        end.readUntil("BEGIN\r\n");
        WireMessage message = end.read();
        client->invalidate();
        return message;
    }
    WireMessage callback(const DaemonCallback& each) {
        auto [end, socket] = RawSocket::pair();
        const auto server = serverAt(end, std::move(socket));
        RemoteClient remote(*server, nullptr);
        each.make(remote);
        WireMessage message = end.read();
        server->invalidate();
        return message;
    }
    WireMessage answerTo(const WireMessage& message) {
        auto [end, socket] = RawSocket::pair();
        const auto server = serverAt(end, std::move(socket));
        end.write(message);
        WireMessage answer = end.read();
        server->invalidate();
        return answer;
    }
    static WireMessage standardCall(const std::string& path, const std::string& interface,
                                    const std::string& member) {
        dbus::Message call;
        call.serial = 5;
        call.path = path;
        call.interface = interface;
        call.member = member;
        return {dbus::serialize(call), {}};
    }

    const std::shared_ptr<SocketLoop> loop = std::make_shared<SocketLoop>();
    const std::shared_ptr<test::FakeDaemon> daemon = std::make_shared<test::FakeDaemon>();
    const std::shared_ptr<test::FakeClientProxy> callbacks = std::make_shared<test::FakeClientProxy>();
};

TEST_F(MessageBytesTest, Greetings) {
    auto [end, socket] = RawSocket::pair();
    const auto client = clientAt(std::move(socket));
    EXPECT_EQ(end.readUntil("BEGIN\r\n"), dbus::clientGreeting(::getuid()));
    EXPECT_EQ(dbus::clientGreeting(1000),
              std::string(1, '\0') + "AUTH EXTERNAL 31303030\r\nNEGOTIATE_UNIX_FD\r\nBEGIN\r\n");
    client->invalidate();
}

TEST_F(MessageBytesTest, EveryRequest) {
    Sheet sheet("requests");
    const auto requests = test::daemonRequests();
    EXPECT_EQ(requests.size(), interfaceOf<KVDaemonProtocol>()->methods.size());
    for (const test::DaemonRequest& each : requests)
        sheet.add(each.name,
                  request([&](KVDaemonProtocol& remote) { each.make(remote, [](const Array&) {}); }));
    sheet.add("stopRecordingWithHandler, without a handler",
              request([](KVDaemonProtocol& remote) { remote.stopRecordingWithHandler(nullptr); }));
    const UniqueFd packetSocket(::socket(AF_UNIX, SOCK_SEQPACKET | SOCK_CLOEXEC, 0));
    const auto endpoint = *SocketEndpoint::fromDescriptor(UniqueFd(::dup(packetSocket.get())));
    sheet.add("startRecordingWindowLayerContextIDs, with an endpoint", request([&](KVDaemonProtocol& remote) {
                  remote.startRecordingWindowLayerContextIDs({}, {1, 2}, false, false, true, false, false,
                                                             endpoint, nullptr);
              }));
    sheet.compare();
}

TEST_F(MessageBytesTest, EveryReply) {
    Sheet sheet("replies");
    for (const test::DaemonRequest& each : test::daemonRequests()) {
        if (!each.expectedReply) continue;
        const auto sent = request([&](KVDaemonProtocol& remote) { each.make(remote, [](const Array&) {}); });
        sheet.add(each.name, answerTo(sent));
    }
    sheet.compare();
}

TEST_F(MessageBytesTest, EveryCallback) {
    Sheet sheet("callbacks");
    std::set<std::string> names;
    for (const DaemonCallback& each : daemonCallbacks()) {
        sheet.add(each.name, callback(each));
        names.insert(std::string(each.name).substr(0, std::string(each.name).find(',')));
    }
    EXPECT_EQ(names.size(), interfaceOf<KVClientProtocol>()->methods.size());
    sheet.compare();
}

TEST_F(MessageBytesTest, FrameThatIsGivenBack) {
    const auto all = daemonCallbacks();
    const auto frame = std::ranges::find(all, std::string("captureHandlerWithSample"), &DaemonCallback::name);
    ASSERT_NE(frame, all.end());
    auto [end, socket] = RawSocket::pair();
    const auto client = clientAt(std::move(socket));
    end.readUntil("BEGIN\r\n");
    end.write(kServersAnswers);
    end.write(callback(*frame));
    ASSERT_TRUE(test::eventually([&] { return !callbacks->messages().empty(); }));
    callbacks->videoSamples.set({});
    Sheet sheet("frame_given_back");
    sheet.add("the request for a lane, with the first frame", end.read());
    sheet.add("the answer to captureHandlerWithSample", end.read());
    sheet.compare();
    client->invalidate();
}

TEST_F(MessageBytesTest, EveryErrorAndWhatEveryObjectAnswers) {
    Sheet sheet("standard_answers");
    const std::string ours(interfaceOf<KVDaemonProtocol>()->name);
    sheet.add("a lane", answerTo(standardCall(dbus::kObjectPath, dbus::kLaneInterface, "Open")));
    sheet.add("no such method", answerTo(standardCall(dbus::kObjectPath, ours, "fly")));
    sheet.add("no such object", answerTo(standardCall("/elsewhere", ours, "pauseRecording")));
    sheet.add("ping", answerTo(standardCall(dbus::kObjectPath, "org.freedesktop.DBus.Peer", "Ping")));
    sheet.add("hello", answerTo(standardCall("/org/freedesktop/DBus", "org.freedesktop.DBus", "Hello")));
    sheet.add("properties",
              answerTo(standardCall(dbus::kObjectPath, "org.freedesktop.DBus.Properties", "GetAll")));
    sheet.add("introspection of a parent",
              answerTo(standardCall("/com", "org.freedesktop.DBus.Introspectable", "Introspect")));
    sheet.compare();
}

/// Answers with what its reply does not declare.
class WrongReplier : public IPCExportedObject {
  public:
    bool serve(std::size_t, const Array&, IPCReply reply) override {
        if (reply) reply({"one", "too many"});
        return true;
    }
};

TEST_F(MessageBytesTest, ReplyThatCannotBeSentIsAnError) {
    auto [end, socket] = RawSocket::pair();
    const auto server = serverAt(end, std::move(socket));
    server->setExported(interfaceOf<KVDaemonProtocol>(), std::make_shared<WrongReplier>());
    end.write(standardCall(dbus::kObjectPath, "", "stopRecordingWithHandler"));
    Sheet sheet("failed_reply");
    sheet.add("a reply that does not fit its declaration", end.read());
    sheet.compare();
    server->invalidate();
}

}  // namespace
}  // namespace kelvo
