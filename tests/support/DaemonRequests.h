#pragma once

#include "ipc/KVDaemonProtocol.h"

#include <functional>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace kelvo::test {

/// One request as a client makes it, and what its handler and the daemon see.
struct DaemonRequest {
    std::string name;
    /// Makes the request with handlers that call `answered` with what they got.
    std::function<void(KVDaemonProtocol& daemon, std::function<void(Array)> answered)> make;
    Array expectedArguments;
    /// What `FakeDaemon` answers; nothing for a one-way request.
    std::optional<Array> expectedReply;

    friend void PrintTo(const DaemonRequest& request, std::ostream* out) { *out << request.name; }
};

inline Value valueOf(const OptionalError& error) {
    return error ? Value(*error) : Value();
}

/// All nineteen, each with arguments unlike the default. The movies are no files, which each transport names
/// as its peer finds them.
inline std::vector<DaemonRequest> daemonRequests() {
    using D = KVDaemonProtocol;
    using Answer = std::function<void(Array)>;
    const Bytes configuration{std::byte{0xa1}, std::byte{0}};
    const Dictionary userInfo{{"answer", 42}, {"nested", Dictionary{{"list", Array{1.5, "x"}}}}};
    const KVError error{"domain", -5, {{"key", "text"}}};
    return {
        {"startRecordingWindowLayerContextIDs",
         [](D& d, const Answer& answered) {
             d.startRecordingWindowLayerContextIDs({7, 0xffffffff}, {1080, 1920.5}, true, false, true, false,
                                                   true, nullptr,
                                                   [=](const OptionalError& e, bool microphone, bool camera) {
                                                       answered({valueOf(e), microphone, camera});
                                                   });
         },
         {Array{7, std::uint32_t{0xffffffff}}, 1080.0, 1920.5, true, false, true, false, true, false},
         Array{error, true, false}},
        {"setupBroadcastWithHostBundleID",
         [=](D& d, const Answer& answered) {
             d.setupBroadcastWithHostBundleID("host", "extension", configuration, userInfo,
                                              [=](const OptionalError& e) { answered({valueOf(e)}); });
         },
         {"host", "extension", configuration, userInfo},
         Array{Value()}},
        {"getCurrentBroadcastImages",
         [](D& d, const Answer& answered) {
             d.getCurrentBroadcastImages([=](const auto& host, const auto& extension) {
                 answered({host ? Value(*host) : Value(), extension ? Value(*extension) : Value()});
             });
         },
         {},
         Array{Bytes{std::byte{1}, std::byte{2}}, Value()}},
        {"getSystemBroadcastExtensionInfo",
         [](D& d, const Answer& answered) {
             d.getSystemBroadcastExtensionInfo([=](const auto& extensions, const OptionalError& e) {
                 answered({Array(extensions.begin(), extensions.end()), valueOf(e)});
             });
         },
         {},
         Array{Array{Dictionary{{"displayName", "One"}}, Dictionary{{"displayName", "Two"}}}, Value()}},
        {"stopRecordingWithHandler",
         [](D& d, const Answer& answered) {
             d.stopRecordingWithHandler([=](const auto& movieURL, const OptionalError& e) {
                 answered({movieURL ? Value(*movieURL) : Value(), valueOf(e)});
             });
         },
         {},
         Array{URL("movie:taken"), Value()}},
        {"stopRecordingWithStartClipDuration",
         [](D& d, const Answer& answered) {
             d.stopRecordingWithStartClipDuration(1.25, 2.5, [=](const auto& movieURL, const auto& e) {
                 answered({movieURL ? Value(*movieURL) : Value(), valueOf(e)});
             });
         },
         {1.25, 2.5},
         Array{Value(), error}},
        {"saveVideoToCameraRoll",
         [](D& d, const Answer& answered) {
             d.saveVideoToCameraRoll(URL("movie:a"), [=](const OptionalError& e) { answered({valueOf(e)}); });
         },
         {URL("movie:a")},
         Array{error}},
        {"pauseRecording", [](D& d, const Answer&) { d.pauseRecording(); }, {}, {}},
        {"resumeRecordingWithWindowLayerContextID",
         [](D& d, const Answer&) { d.resumeRecordingWithWindowLayerContextID(0x80000001); },
         {std::uint32_t{0x80000001}},
         {}},
        {"setMicrophoneEnabled", [](D& d, const Answer&) { d.setMicrophoneEnabled(true); }, {true}, {}},
        {"updateProcessIDForAudioCaptureWithPID",
         [](D& d, const Answer&) { d.updateProcessIDForAudioCaptureWithPID(-3); },
         {-3},
         {}},
        {"discardRecordingWithHandler",
         [](D& d, const Answer& answered) { d.discardRecordingWithHandler([=] { answered({}); }); },
         {},
         Array{}},
        {"synchronousGetCurrentState",
         [](D& d, const Answer& answered) {
             d.synchronousGetCurrentState(
                 [=](const auto& state) { answered({state ? Value(*state) : Value()}); });
         },
         {},
         Array{Dictionary{{"isRecording", true}}}},
        {"synchronousIsBroadcastingWithPreferredExtension",
         [](D& d, const Answer& answered) {
             d.synchronousIsBroadcastingWithPreferredExtension("preferred",
                                                               [=](bool value) { answered({value}); });
         },
         {"preferred"},
         Array{true}},
        {"setHasUserConsentForCamera",
         [](D& d, const Answer&) { d.setHasUserConsentForCamera(true); },
         {true},
         {}},
        {"setHasUserConsentForMicrophone",
         [](D& d, const Answer&) { d.setHasUserConsentForMicrophone(true); },
         {true},
         {}},
        {"setBroadcastURL",
         [](D& d, const Answer&) { d.setBroadcastURL(URL("https://example.com/live")); },
         {URL("https://example.com/live")},
         {}},
        {"setMicrophoneEnabledPersistent",
         [](D& d, const Answer&) { d.setMicrophoneEnabledPersistent(true); },
         {true},
         {}},
        {"reportCameraUsage", [](D& d, const Answer&) { d.reportCameraUsage(2); }, {2}, {}},
    };
}

}  // namespace kelvo::test
