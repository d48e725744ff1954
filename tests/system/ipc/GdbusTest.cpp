#include "SocketFixture.h"
#include "support/DaemonRequests.h"

#include <array>
#include <cstdio>
#include <map>

namespace kelvo {
namespace {

using testing::ElementsAre;
using testing::HasSubstr;

/// Somebody else's D-Bus library as the client: the program `gdbus`, as docs/wire.md shows it.
class GdbusTest : public test::SocketFixture {
  protected:
    /// What the program prints, errors included.
    std::string gdbus(const std::string& command, const std::string& rest) const {
        const std::string line = "gdbus " + command + " --address unix:path=" + path +
                                 " --dest com.quillon.kelvod --object-path /com/quillon/kelvod " + rest +
                                 " 2>&1";
        std::FILE* const pipe = ::popen(line.c_str(), "r");
        if (pipe == nullptr) return "cannot run " + line;
        std::string output;
        std::array<char, 4096> buffer;
        for (std::size_t count = 1; count > 0;) {
            count = std::fread(buffer.data(), 1, buffer.size(), pipe);
            output.append(buffer.data(), count);
        }
        ::pclose(pipe);
        return output;
    }
    std::string call(const std::string& method, const std::string& arguments) const {
        return gdbus("call", "--method com.quillon.KelvoKit.KVDaemonProtocol." + method + " " + arguments);
    }
    /// The program's process belongs to no bundle of the fixture; such a client may do everything but this.
    static bool needsARight(const std::string& method) { return method == "setupBroadcastWithHostBundleID"; }
};

/// For each request: the arguments of `test::daemonRequests` as text, and what is printed of the reply.
const std::map<std::string, std::pair<std::string, std::string>> kCalls{
    {"startRecordingWindowLayerContextIDs",
     {"'[7, 4294967295]' '(1080.0, 1920.5)' true false true false true '@ah []'",
      "([('domain', int64 -5, {'key': <'text'>})], true, false)"}},
    {"setupBroadcastWithHostBundleID",
     {"host extension '[byte 0xa1, 0x00]' \"{'answer': <int64 42>, 'nested': <{'list': <[<1.5>, <'x'>]>}>}\"",
      "([('com.quillon.KelvoKit.KVRecordingErrorDomain', int64 -5819, @a{sv} {})],)"}},
    {"getCurrentBroadcastImages", {"", "([[byte 0x01, 0x02]], @aay [])"}},
    {"getSystemBroadcastExtensionInfo",
     {"", "([{'displayName': <'One'>}, {'displayName': <'Two'>}], @a(sxa{sv}) [])"}},
    {"stopRecordingWithHandler", {"", "(['movie:taken'], @a(sxa{sv}) [])"}},
    {"stopRecordingWithStartClipDuration",
     {"1.25 2.5", "(@as [], [('domain', int64 -5, {'key': <'text'>})])"}},
    {"saveVideoToCameraRoll", {"movie:a", "([('domain', int64 -5, {'key': <'text'>})],)"}},
    {"pauseRecording", {"", "()"}},
    {"resumeRecordingWithWindowLayerContextID", {"2147483649", "()"}},
    {"setMicrophoneEnabled", {"true", "()"}},
    {"updateProcessIDForAudioCaptureWithPID", {"'int32 -3'", "()"}},
    {"discardRecordingWithHandler", {"", "()"}},
    {"synchronousGetCurrentState", {"", "([{'isRecording': <true>}],)"}},
    {"synchronousIsBroadcastingWithPreferredExtension", {"preferred", "(true,)"}},
    {"setHasUserConsentForCamera", {"true", "()"}},
    {"setHasUserConsentForMicrophone", {"true", "()"}},
    {"setBroadcastURL", {"https://example.com/live", "()"}},
    {"setMicrophoneEnabledPersistent", {"true", "()"}},
    {"reportCameraUsage", {"2", "()"}},
};

class GdbusCallTest : public GdbusTest, public testing::WithParamInterface<test::DaemonRequest> {};

TEST_P(GdbusCallTest, ArrivesAndIsAnswered) {
    const auto& [arguments, answer] = kCalls.at(GetParam().name);
    EXPECT_EQ(call(GetParam().name, arguments), answer + "\n");
    if (needsARight(GetParam().name)) return;
    ASSERT_TRUE(test::eventually([&] { return daemon->arguments().size() == 1; }));
    EXPECT_THAT(daemon->requests(), ElementsAre(GetParam().name));
    EXPECT_THAT(daemon->arguments(), ElementsAre(GetParam().expectedArguments));
}

std::string requestName(const testing::TestParamInfo<test::DaemonRequest>& info) {
    return info.param.name;
}
INSTANTIATE_TEST_SUITE_P(All, GdbusCallTest, testing::ValuesIn(test::daemonRequests()), requestName);

TEST_F(GdbusTest, IntrospectionShowsEveryRequestWithItsDocumentation) {
    const std::string description = gdbus("introspect", "");
    for (const IPCMethod& method : interfaceOf<KVDaemonProtocol>()->methods) {
        EXPECT_THAT(description, HasSubstr(" " + method.name + "("));
        for (const IPCArgument& argument : method.arguments)
            EXPECT_THAT(description, HasSubstr("in  " + argument.signature + " " + argument.name));
    }
    EXPECT_THAT(description, HasSubstr("Starts any kind of recording"));
    EXPECT_THAT(description, HasSubstr("out a(sxa{sv}) error"));
}

TEST_F(GdbusTest, TreeLeadsFromTheRootToTheObject) {
    const std::string tree = gdbus("introspect", "--object-path / --recurse --only-properties");
    EXPECT_THAT(tree, HasSubstr("node /com/quillon/kelvod"));
}

TEST_F(GdbusTest, WhatDoesNotExistIsAnErrorAndNoReasonToCutOff) {
    EXPECT_THAT(call("fly", ""), HasSubstr("org.freedesktop.DBus.Error.UnknownMethod"));
    EXPECT_THAT(cutOffs(), testing::IsEmpty());
}

}  // namespace
}  // namespace kelvo
