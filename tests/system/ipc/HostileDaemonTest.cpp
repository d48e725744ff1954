#include "WireCalls.h"
#include "ipc/KVClientProtocolTable.h"
#include "platform/linux/ipc/SocketConnection.h"
#include "support/Eventually.h"
#include "support/FakeClientProxy.h"
#include "support/LogRecorder.h"
#include "support/RawSocket.h"

#include <fcntl.h>
#include <ostream>
#include <sys/mman.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

using test::argumentBytes;
using test::BodyBytes;
using test::RawSocket;

constexpr const char* kFrame = "captureHandlerWithSample";
constexpr const char* kSound = "captureHandlerWithAudioSample";

Bytes callbackBytes(const std::string& member, const std::string& signature, Bytes body,
                    std::uint32_t descriptorsClaimed = 0) {
    return test::wireCall("com.quillon.KelvoKit.KVClientProtocol", member, signature, std::move(body),
                          descriptorsClaimed);
}

/// A callback that is not what it claims, and what the client's log says.
struct Lie {
    std::string name;
    std::function<void(RawSocket&)> send;
    std::string reason;

    friend void PrintTo(const Lie& lie, std::ostream* out) { *out << lie.name; }
};

/// A frame of this width, four rows of it, whose descriptor is this file.
Lie frame(const std::string& name, std::uint32_t width, const std::function<UniqueFd()>& open) {
    return {name,
            [=](RawSocket& daemon) {
                BodyBytes body;
                body.u32(20).align(8).u32(0).u32(width).u32(4).u32(width * 4);
                body.raw("xRGB").u32(72).raw(std::string(72, '\0'));
                const UniqueFd file = open();
                daemon.write(callbackBytes(kFrame, "a(huuuu)ay", body.bytes(), 1), {file.get()});
            },
            "captureHandlerWithSample: surface that is not what it claims"};
}

UniqueFd memoryFile(std::size_t size, int seals) {
    UniqueFd file(::memfd_create("frame", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(::ftruncate(file.get(), static_cast<off_t>(size)), 0);
    EXPECT_EQ(::fcntl(file.get(), F_ADD_SEALS, seals), 0);
    return file;
}

std::vector<Lie> lies() {
    const Bytes timing(72);
    const Bytes format(40);
    const auto sound = [](const Array& values) {
        return [=](RawSocket& daemon) {
            daemon.write(callbackBytes(kSound, "ayayxxay", argumentBytes("ayayxxay", values)));
        };
    };
    const std::string unfit = "arguments of captureHandlerWithAudioSample are not what it takes";
    return {
        frame("SurfaceTooSmallForWhatItClaims", 4096,
              [] { return memoryFile(4096, F_SEAL_SHRINK | F_SEAL_GROW); }),
        frame("SurfaceThatCouldShrink", 4, [] { return memoryFile(65536, 0); }),
        frame("NullDeviceAsSurface", 4, [] { return UniqueFd(::open("/dev/null", O_RDONLY | O_CLOEXEC)); }),
        frame("SocketAsSurface", 4,
              [] { return UniqueFd(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0)); }),
        frame("SurfaceOfNoSize", 0, [] { return memoryFile(65536, F_SEAL_SHRINK | F_SEAL_GROW); }),
        frame("SurfaceBeyondItsBound", 16385,
              [] { return memoryFile(std::size_t{16385} * 16, F_SEAL_SHRINK | F_SEAL_GROW); }),
        {"FrameWithoutItsDescriptor",
         [](RawSocket& daemon) {
             BodyBytes body;
             body.u32(20).align(8).u32(0).u32(4).u32(4).u32(16).raw("xRGB").u32(72).raw(
                 std::string(72, '\0'));
             daemon.write(callbackBytes(kFrame, "a(huuuu)ay", body.bytes()));
         },
         "captureHandlerWithSample: descriptor"},
        {"TimingOfAnotherSize",
         [](RawSocket& daemon) {
             daemon.write(
                 callbackBytes(kFrame, "a(huuuu)ay", argumentBytes("a(huuuu)ay", {Array(), Bytes(71)})));
         },
         "arguments of captureHandlerWithSample are not what it takes"},
        {"FormatOfAnotherSize", sound({Bytes(4), Bytes(41), 1, 2, timing}), unfit},
        {"UnknownTypeOfSound", sound({Bytes(4), format, 1, 4, timing}), unfit},
        {"ErrorThatIsMissing",
         [](RawSocket& daemon) {
             daemon.write(
                 callbackBytes("recordingLockInterrupted", "a(sxa{sv})", BodyBytes().u32(0).bytes()));
         },
         "signature of recordingLockInterrupted is not what it takes"},
        {"TwoOfWhatMayBeAbsent",
         [](RawSocket& daemon) {
             daemon.write(
                 callbackBytes("recordingDidStopWithError", "a(sxa{sv})as",
                               argumentBytes("a(sxa{sv})as", {Array(), Array{"file:///a", "file:///b"}})));
         },
         "arguments of recordingDidStopWithError are not what it takes"},
    };
}

/// A client does not take everything from its daemon either: another program may sit at the socket.
class HostileDaemonTest : public testing::TestWithParam<Lie> {
  protected:
    ~HostileDaemonTest() override { loop->stop(); }

    test::LogRecorder log;
    const std::shared_ptr<SocketLoop> loop = std::make_shared<SocketLoop>();
    const std::shared_ptr<test::FakeClientProxy> callbacks = std::make_shared<test::FakeClientProxy>();
};

TEST_P(HostileDaemonTest, LosesItsClientWithOneLine) {
    auto [daemon, socket] = RawSocket::pair();
    const auto client = std::make_shared<SocketConnection>(SocketConnection::Side::client, std::move(socket),
                                                           loop, nullptr, nullptr, nullptr);
    client->setExported(interfaceOf<KVClientProtocol>(),
                        std::make_shared<ProtocolDispatcher<KVClientProtocol>>(callbacks));
    std::atomic<bool> isOver{false};
    client->setInvalidationHandler([&] { isOver = true; });
    client->resume();
    daemon.readUntil("BEGIN\r\n");
    daemon.write("OK 6b656c766f640000000000000000001f\r\nAGREE_UNIX_FD\r\n");
    GetParam().send(daemon);
    EXPECT_TRUE(daemon.isCutOff());
    EXPECT_TRUE(test::eventually([&] { return isOver.load(); }));
    EXPECT_THAT(log.texts(), testing::ElementsAre(testing::HasSubstr(GetParam().reason)));
    EXPECT_THAT(callbacks->messages(), testing::IsEmpty());
}

std::string lieName(const testing::TestParamInfo<Lie>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, HostileDaemonTest, testing::ValuesIn(lies()), lieName);

}  // namespace
}  // namespace kelvo
