#include "ScriptedDaemon.h"

#include <algorithm>
#include <array>
#include <string>
#include <vector>

namespace kelvo {
namespace {

using test::errorSaying;

/// A callback, and the line that it makes.
struct Told {
    void (*send)(KVClientProtocol& client);
    const char* text;
    const char* json;
};

/// All ten.
std::array<Told, 10> callbacks() {
    return {{
        {[](auto& client) { client.updateScreenRecordingState(); }, "updateScreenRecordingState",
         R"({"callback":"updateScreenRecordingState"})"},
        {[](auto& client) {
             client.updateBroadcastServiceInfo({{"viewers", 3}});
         },
         R"(updateBroadcastServiceInfo {"serviceInfo" = {"viewers" = 3}})",
         R"({"callback":"updateBroadcastServiceInfo","serviceInfo":{"viewers":3}})"},
        {[](auto& client) { client.updateBroadcastURL(URL("https://x")); },
         R"(updateBroadcastURL {"broadcastURL" = https://x})",
         R"({"callback":"updateBroadcastURL","broadcastURL":"https://x"})"},
        {[](auto& client) { client.recordingDidStopWithError(std::nullopt, URL("movie:a")); },
         R"(recordingDidStopWithError {"error" = (none); "movieURL" = movie:a})",
         R"({"callback":"recordingDidStopWithError","error":null,"movieURL":"movie:a"})"},
        {[](auto& client) { client.recordingLockInterrupted(errorSaying("locked")); },
         R"(recordingLockInterrupted {"error" = domain -5804 (locked)})",
         R"({"callback":"recordingLockInterrupted","error":{"domain":"domain","code":-5804,"description":"locked"}})"},
        {[](auto& client) { client.recordingShouldResume(); }, "recordingShouldResume",
         R"({"callback":"recordingShouldResume"})"},
        {[](auto& client) { client.recordingDidPause(); }, "recordingDidPause",
         R"({"callback":"recordingDidPause"})"},
        {[](auto& client) { client.recordingTimerDidUpdate("0:05"); },
         R"(recordingTimerDidUpdate {"timerText" = "0:05"})",
         R"({"callback":"recordingTimerDidUpdate","timerText":"0:05"})"},
        {[](auto& client) {
             client.captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(),
                                             bytesOfRecord(TimingRecord{{}, MediaTime::make(3, 2), {}}));
         },
         R"(captureHandlerWithSample {"presentationTime" = 1.500000})",
         R"({"callback":"captureHandlerWithSample","presentationTime":1.5})"},
        {[](auto& client) {
             client.captureHandlerWithAudioSample(Bytes(16), {}, 2, SampleBuffer::Type::microphone,
                                                  bytesOfRecord(TimingRecord{{}, MediaTime::make(3, 2), {}}));
         },
         R"(captureHandlerWithAudioSample {"bytes" = 16; "itemCount" = 2; "bufferType" = 3; "presentationTime" = 1.500000})",
         R"({"callback":"captureHandlerWithAudioSample","bytes":16,"itemCount":2,"bufferType":3,"presentationTime":1.5})"},
    }};
}

class WatchTest : public test::KelvoctlRecordingTest {
  protected:
    /// What is printed on standard output while each callback is sent.
    std::string printed(const std::vector<std::string>& arguments) {
        const std::string output = root.path() + "/watched";
        const std::string script = "exec \"$0\" \"$@\" >" + output;
        std::vector<std::string> command{"sh", "-c", script, KELVOCTL_PROGRAM, "watch"};
        command.insert(command.end(), arguments.begin(), arguments.end());
        test::ChildProcess watch(command, {{"KELVO_SOCKET", socket}});
        EXPECT_TRUE(test::eventually([this] { return door->client.copy() != nullptr; }));
        for (const Told& told : callbacks()) {
            RemoteClient client = this->client();
            told.send(client);
        }
        const auto isComplete = [&] { return std::ranges::count(contentOf("watched"), '\n') >= 10; };
        EXPECT_TRUE(test::eventually(isComplete)) << contentOf("watched") << watch.output();
        return contentOf("watched");
    }
};

TEST_F(WatchTest, EachOfTheTenCallbacksIsALineOfText) {
    std::string expected;
    for (const Told& told : callbacks())
        expected += std::string(told.text) + "\n";
    EXPECT_EQ(printed({}), expected);
}

TEST_F(WatchTest, EachOfTheTenCallbacksIsAnObject) {
    std::string expected;
    for (const Told& told : callbacks())
        expected += std::string(told.json) + "\n";
    EXPECT_EQ(printed({"--json"}), expected);
}

}  // namespace
}  // namespace kelvo
