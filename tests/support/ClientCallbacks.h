#pragma once

#include "ipc/KVClientProxyBase.h"

#include <memory>
#include <ostream>
#include <string>
#include <vector>

namespace kelvo::test {

/// The error that the callbacks below carry.
inline const KVError kCallbackError{"domain", -5809, {{"key", 1}}};

/// One callback, and what proxies log about it.
struct ClientCallback {
    std::string name;
    void (*send)(KVClientProtocol&);
    std::string text;
    std::string failureText;    // empty: nothing is sent
    std::string fanOutText;     // empty: nothing is logged by the multiple proxy
    std::string fanOutFailure;  // empty: nothing is sent by the multiple proxy
    bool isOfferedToEveryone;

    friend void PrintTo(const ClientCallback& callback, std::ostream* out) { *out << callback.name; }
};

/// All that a single client is sent. The movie is no file, which each transport names as its peer finds it.
inline std::vector<ClientCallback> clientCallbacks() {
    const std::string tail = ": error getting remote proxy: 107";
    const std::string saved = ":recodingDidStopAndSavedToCameraRoll: video saved to camera roll: 107";
    const auto row = [&](const std::string& name, void (*send)(KVClientProtocol&), const std::string& text,
                         bool isFannedOut) {
        const std::string failure = name == "recordingLockInterrupted" ? saved : ":" + name + tail;
        return ClientCallback{name,
                              send,
                              "KVClientProxy:" + text,
                              "KVClientProxy" + failure,
                              isFannedOut ? "KVMultipleClientProxy:" + text : "",
                              isFannedOut ? "KVMultipleClientProxy" + failure : "",
                              name != "recordingShouldResume" && name != "recordingDidPause"};
    };
    return {
        row(
            "recordingDidStopWithError",
            [](KVClientProtocol& c) { c.recordingDidStopWithError(kCallbackError, URL("movie:m")); },
            "recordingDidStopWithError:movieURL:", true),
        row(
            "updateBroadcastServiceInfo",
            [](KVClientProtocol& c) {
                c.updateBroadcastServiceInfo({{"a", "b"}});
            },
            "updateBroadcastServiceInfo:", false),
        row(
            "updateBroadcastURL", [](KVClientProtocol& c) { c.updateBroadcastURL(URL("rtmp://x")); },
            "updateBroadcastURL:", true),
        row(
            "captureHandlerWithSample",
            [](KVClientProtocol& c) {
                c.captureHandlerWithSample(std::make_shared<KVIOSurfaceObject>(), {});
            },
            "captureHandlerWithSample:", false),
        row(
            "captureHandlerWithAudioSample",
            [](KVClientProtocol& c) {
                const Bytes sound(8);
                c.captureHandlerWithAudioSample(sound, {}, 2, SampleBuffer::Type::microphone, {});
            },
            "captureHandlerWithAudioSample:", false),
        row(
            "recordingLockInterrupted",
            [](KVClientProtocol& c) { c.recordingLockInterrupted(kCallbackError); },
            "recordingLockInterrupted:", true),
        row(
            "recordingShouldResume", [](KVClientProtocol& c) { c.recordingShouldResume(); },
            "recordingShouldResume:", false),
        row(
            "recordingDidPause", [](KVClientProtocol& c) { c.recordingDidPause(); },
            "recordingDidPause:", false),
        row(
            "recordingTimerDidUpdate", [](KVClientProtocol& c) { c.recordingTimerDidUpdate("00:01"); },
            "recordingTimerDidUpdate:", true),
    };
}

}  // namespace kelvo::test
