#include "SocketFixture.h"
#include "WireCalls.h"
#include "platform/IPCBounds.h"
#include "support/RawSocket.h"

#include <fcntl.h>
#include <ostream>
#include <sys/mman.h>

namespace kelvo {
namespace {

using test::argumentBytes;
using test::BodyBytes;
using test::eventually;
using test::RawSocket;
using test::requestBytes;
using testing::IsEmpty;

constexpr const char* kStart = "startRecordingWindowLayerContextIDs";
constexpr const char* kSetUp = "setupBroadcastWithHostBundleID";

/// A message that breaks a rule, and what the log says about it.
struct Attack {
    std::string name;
    std::function<void(RawSocket&)> send;
    std::string reason;
    bool isAuthenticated = true;

    friend void PrintTo(const Attack& attack, std::ostream* out) { *out << attack.name; }
};

std::function<void(RawSocket&)> writing(Bytes bytes) {
    return [bytes = std::move(bytes)](RawSocket& peer) { peer.write(bytes); };
}
std::function<void(RawSocket&)> writing(std::string text) {
    return [text = std::move(text)](RawSocket& peer) { peer.write(text); };
}
/// Sixteen bytes that begin a message: a call whose body and header fields have these sizes.
std::string head(std::uint32_t body, std::uint32_t fields) {
    const Bytes numbers = BodyBytes().u32(body).u32(1).u32(fields).bytes();
    return "l\1" + std::string("\0\1", 2) + std::string(reinterpret_cast<const char*>(numbers.data()), 12);
}

Attack string(const std::string& name, const std::string& reason, Bytes body) {
    return {name, writing(requestBytes("setBroadcastURL", "s", std::move(body))),
            "setBroadcastURL: " + reason};
}

/// Arguments of a set-up whose user information is these bytes.
Attack userInfo(const std::string& name, const std::string& reason, std::string_view variant) {
    const Bytes body = BodyBytes().string("").string("").u32(0).dictionaryWith(variant).bytes();
    return {name, writing(requestBytes(kSetUp, "ssaya{sv}", body)),
            "setupBroadcastWithHostBundleID: " + reason};
}
Attack userInfo(const std::string& name, const std::string& reason, const Dictionary& content) {
    return {
        name,
        writing(requestBytes(kSetUp, "ssaya{sv}", argumentBytes("ssaya{sv}", {"", "", Bytes(), content}))),
        "setupBroadcastWithHostBundleID: " + reason};
}

/// A start whose argument 7 holds these many descriptors, which are sent.
Attack endpoint(const std::string& name, const std::string& reason,
                const std::function<UniqueFd()>& makeDescriptor, std::uint32_t count = 1) {
    return {name,
            [=](RawSocket& peer) {
                BodyBytes body;
                body.u32(0).align(8).u32(0).u32(0).u32(0).u32(0);
                for (int i = 0; i < 5; ++i)
                    body.u32(0);
                body.u32(4 * count);
                std::vector<UniqueFd> owned;
                std::vector<int> descriptors;
                for (std::uint32_t i = 0; i < count; ++i) {
                    body.u32(i);
                    owned.push_back(makeDescriptor());
                    descriptors.push_back(owned.back().get());
                }
                peer.write(requestBytes(kStart, "au(dd)bbbbbah", body.bytes(), count), descriptors);
            },
            reason};
}

UniqueFd nullDevice() {
    return UniqueFd(::open("/dev/null", O_RDONLY | O_CLOEXEC));
}
UniqueFd socketOf(int type) {
    return UniqueFd(::socket(AF_UNIX, type | SOCK_CLOEXEC, 0));
}

std::vector<Attack> attacksOnTheConversation() {
    return {
        {"NoAuthentication", writing("GET / HTTP/1.1\r\n"), "authentication failed", false},
        {"EndlessAuthentication", writing(std::string(1, '\0') + std::string(8000, 'x')),
         "authentication failed", false},
        {"ManyLinesOfAuthentication",
         [](RawSocket& peer) {
             std::string lines(1, '\0');
             for (int i = 0; i < 300; ++i)
                 lines += "AUTH ANONYMOUS\r\n";
             peer.write(lines);
         },
         "authentication failed", false},
        {"SomebodyElsesIdentity", writing(std::string(1, '\0') + "AUTH EXTERNAL 3939393939\r\nBEGIN\r\n"),
         "authentication failed", false},
        {"Garbage", writing(std::string(64, 'x')), "no little-endian message"},
        {"HugeMessage", writing(head(0x07ffffff, 0)), "message beyond its bound"},
        {"MessageOneByteTooLarge",
         writing(head(static_cast<std::uint32_t>(ipc_bounds::kLargestMessage) - 15, 0)),
         "message beyond its bound"},
        {"HugeHeader", writing(head(0, 0x03ffffff)), "header beyond its bound"},
        {"HeaderOneByteTooLarge",
         writing(head(0, static_cast<std::uint32_t>(ipc_bounds::kLargestHeader) + 1)),
         "header beyond its bound"},
        {"NoHeaderFields", writing(head(0, 0)), "incomplete header"},
        {"UnknownTypeOfMessage",
         [](RawSocket& peer) {
             Bytes bytes = requestBytes("pauseRecording", "", {});
             bytes[1] = std::byte{9};
             peer.write(bytes);
         },
         "unknown type of message"},
        {"BrokenHeader",
         [](RawSocket& peer) {
             Bytes bytes = requestBytes("pauseRecording", "", {});
             bytes[20] = std::byte{0xff};  // the path is longer than the message
             peer.write(bytes);
         },
         "broken header"},
    };
}

std::vector<Attack> attacksOnTheTypes() {
    const std::size_t tooLong = ipc_bounds::kLongestString + 1;
    Dictionary tooManyEntries;
    for (std::size_t i = 0; i <= ipc_bounds::kMostEntries; ++i)
        tooManyEntries.set(std::to_string(i), true);
    Dictionary tooManyValues;
    for (const char* key : {"a", "b", "c", "d", "e"})
        tooManyValues.set(key, Array(ipc_bounds::kMostElements, Value()));
    std::string variants;
    for (int i = 0; i <= ipc_bounds::kDeepestNesting; ++i)
        variants += std::string("\1v\0", 3);
    return {
        {"WrongType", writing(requestBytes("setMicrophoneEnabled", "i", BodyBytes().u32(5).bytes())),
         "signature of setMicrophoneEnabled is not what it takes"},
        {"MissingArgument", writing(requestBytes("setMicrophoneEnabled", "", {})),
         "signature of setMicrophoneEnabled is not what it takes"},
        {"BooleanThatIsNone", writing(requestBytes("setMicrophoneEnabled", "b", BodyBytes().u32(2).bytes())),
         "setMicrophoneEnabled: boolean"},
        {"CutArguments", writing(requestBytes("setMicrophoneEnabled", "b", {})),
         "setMicrophoneEnabled: cut arguments"},
        {"BytesBehindTheArguments", writing(requestBytes("pauseRecording", "", Bytes(4))),
         "pauseRecording: bytes behind the arguments"},
        string("StringBeyondItsBound", "string beyond its bound",
               BodyBytes().string(std::string(tooLong, 'x')).bytes()),
        string("StringLongerThanItsMessage", "cut string", BodyBytes().u32(100).raw("x").bytes()),
        string("StringThatIsNotUTF8", "string is not UTF-8", BodyBytes().string("\xff\xfe").bytes()),
        string("StringWithAZeroByte", "string is not UTF-8", BodyBytes().string({"a\0b", 3}).bytes()),
        {"ArrayBeyondItsBound",
         writing(requestBytes(
             kStart, "au(dd)bbbbbah",
             argumentBytes("au(dd)bbbbbah", {Array(ipc_bounds::kMostElements + 1, Value(1)), Array{1.0, 1.0},
                                             false, false, false, false, false, Array()}))),
         "startRecordingWindowLayerContextIDs: array beyond its bound"},
        {"ArrayLongerThanItsMessage",
         writing(requestBytes(kStart, "au(dd)bbbbbah", BodyBytes().u32(0x7fffffff).u32(1).bytes())),
         "startRecordingWindowLayerContextIDs: array longer than its message"},
        {"PaddingThatIsNotZero",
         writing(requestBytes(kSetUp, "ssaya{sv}",
                              BodyBytes().string("").raw("xxx").string("").u32(0).u32(0).align(8).bytes())),
         "setupBroadcastWithHostBundleID: padding"},
        userInfo("DictionaryBeyondItsBound", "dictionary beyond its bound", tooManyEntries),
        userInfo("TooManyValues", "too many values", tooManyValues),
        userInfo("NestedTooDeep", "nested too deep", variants + std::string("\1y\0\0", 4)),
        userInfo("VariantOfTwoTypes", "variant", std::string("\2yy\0\0\0", 6)),
        userInfo("VariantOfNoType", "variant", std::string("\1z\0\0", 4)),
        {"KeyThatStandsTwice",
         writing(requestBytes(kSetUp, "ssaya{sv}",
                              BodyBytes()
                                  .string("")
                                  .string("")
                                  .u32(0)
                                  .u32(26)
                                  .align(8)
                                  .string("k")
                                  .raw({"\1y\0\0", 4})
                                  .align(8)
                                  .string("k")
                                  .raw({"\1y\0\0", 4})
                                  .bytes())),
         "setupBroadcastWithHostBundleID: key that stands twice"},
    };
}

std::vector<Attack> attacksWithDescriptors() {
    return {
        {"DescriptorThatIsNotSent", writing(requestBytes("pauseRecording", "", {}, 1)),
         "fewer descriptors than claimed"},
        {"DescriptorThatIsNotClaimed",
         [](RawSocket& peer) {
             const UniqueFd surplus = nullDevice();
             const Bytes bytes = test::wireCall("org.freedesktop.DBus.Peer", "Ping", "", {});
             peer.write(bytes, {surplus.get()});
         },
         "descriptors that belong to no message"},
        {"MoreDescriptorsThanAllowed",
         [](RawSocket& peer) {
             const UniqueFd one = nullDevice();
             const std::vector<int> descriptors(ipc_bounds::kMostDescriptors + 1, one.get());
             peer.write(requestBytes("pauseRecording", "", {}, ipc_bounds::kMostDescriptors + 1),
                        descriptors);
         },
         "more descriptors than allowed"},
        {"MoreDescriptorsClaimedThanAllowed",
         writing(requestBytes("pauseRecording", "", {}, ipc_bounds::kMostDescriptors + 1)),
         "more descriptors than allowed"},
        {"DescriptorInsideAVariant",
         [](RawSocket& peer) {
             const UniqueFd null = nullDevice();
             const Bytes body = BodyBytes()
                                    .string("")
                                    .string("")
                                    .u32(0)
                                    .u32(16)
                                    .align(8)
                                    .string("k")
                                    .raw({"\1h\0", 3})
                                    .u32(0)
                                    .bytes();
             peer.write(requestBytes(kSetUp, "ssaya{sv}", body, 1), {null.get()});
         },
         "setupBroadcastWithHostBundleID: descriptor"},
        endpoint("NullDeviceAsEndpoint",
                 "startRecordingWindowLayerContextIDs: endpoint that is none: Bad message", nullDevice),
        endpoint("MemoryFileAsEndpoint", "endpoint that is none",
                 [] { return UniqueFd(::memfd_create("x", MFD_CLOEXEC)); }),
        endpoint("StreamSocketAsEndpoint", "endpoint that is none", [] { return socketOf(SOCK_STREAM); }),
        endpoint(
            "TwoEndpoints", "arguments of startRecordingWindowLayerContextIDs are not what it takes",
            [] { return socketOf(SOCK_SEQPACKET); }, 2),
        {"SurfaceAsArgument7", writing(requestBytes(kStart, "au(dd)bbbbba(huuuu)", {})),
         "signature of startRecordingWindowLayerContextIDs is not what it takes"},
        {"StringAsArgument7", writing(requestBytes(kStart, "au(dd)bbbbbs", {})),
         "signature of startRecordingWindowLayerContextIDs is not what it takes"},
    };
}

class HostileMessageTest : public test::SocketFixture, public testing::WithParamInterface<Attack> {};

TEST_P(HostileMessageTest, EndsItsConnectionWithOneLineAndNobodyElses) {
    const Client bystander = connect();
    acceptedLast();
    RawSocket peer(path);
    if (GetParam().isAuthenticated) peer.authenticate();
    GetParam().send(peer);
    EXPECT_TRUE(peer.isCutOff());
    ASSERT_TRUE(eventually([&] { return !cutOffs().empty(); }));
    EXPECT_THAT(cutOffs().front(),
                testing::HasSubstr("IPC: cut off PID " + std::to_string(::getpid()) + ": "));
    EXPECT_THAT(cutOffs().front(), testing::HasSubstr(GetParam().reason));
    EXPECT_THAT(daemon->requests(), IsEmpty());
    bystander.daemon->pauseRecording();
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    EXPECT_EQ(*bystander.invalidations, 0);
    EXPECT_EQ(cutOffs().size(), 1U);
}

std::string attackName(const testing::TestParamInfo<Attack>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(Conversation, HostileMessageTest, testing::ValuesIn(attacksOnTheConversation()),
                         attackName);
INSTANTIATE_TEST_SUITE_P(Types, HostileMessageTest, testing::ValuesIn(attacksOnTheTypes()), attackName);
INSTANTIATE_TEST_SUITE_P(Descriptors, HostileMessageTest, testing::ValuesIn(attacksWithDescriptors()),
                         attackName);

using HarmlessOddityTest = test::SocketFixture;

TEST_F(HarmlessOddityTest, LargestMessageIsTaken) {
    RawSocket peer(path);
    peer.authenticate();
    const std::string text(ipc_bounds::kLongestString, 'x');
    peer.write(requestBytes("setBroadcastURL", "s", BodyBytes().string(text).bytes()));
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    EXPECT_THAT(cutOffs(), IsEmpty());
}

TEST_F(HarmlessOddityTest, AnswersToNothingSignalsAndUnknownMethodsAreNoReasonToCutOff) {
    RawSocket peer(path);
    peer.authenticate();
    dbus::Message answer;
    answer.type = dbus::MessageType::reply;
    answer.serial = 1;
    answer.replySerial = 4711;
    peer.write(dbus::serialize(answer));
    answer.type = dbus::MessageType::error;
    answer.errorName = "com.example.Error";
    peer.write(dbus::serialize(answer));
    dbus::Message signal;
    signal.type = dbus::MessageType::signal;
    signal.serial = 2;
    signal.path = "/";
    signal.interface = "com.example";
    signal.member = "Hello";
    peer.write(dbus::serialize(signal));
    peer.write(requestBytes("fly", "s", BodyBytes().string("high").bytes()));
    peer.write(requestBytes("pauseRecording", "", {}));
    EXPECT_TRUE(eventually([&] { return daemon->requests().size() == 1; }));
    EXPECT_THAT(cutOffs(), IsEmpty());
}

}  // namespace
}  // namespace kelvo
