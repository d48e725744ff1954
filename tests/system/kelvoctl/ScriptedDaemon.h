#pragma once

#include "KelvoctlProcess.h"
#include "ipc/KVClientProtocolTable.h"
#include "platform/linux/ipc/SocketTransport.h"
#include "support/Eventually.h"
#include "support/FakeDaemon.h"
#include "support/OpenDoor.h"
#include "support/TemporaryDirectory.h"

#include <atomic>
#include <fstream>
#include <functional>
#include <iterator>
#include <memory>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

inline KVError errorSaying(const std::string& text) {
    return {"domain", -5804, {{std::string(kLocalizedDescriptionKey), text}}};
}

/// A daemon that records as a test decides.
class ScriptedDaemon : public FakeDaemon {
  public:
    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override {
        FakeDaemon::startRecordingWindowLayerContextIDs(windowLayerContextIDs, windowSize, microphoneEnabled,
                                                        cameraEnabled, broadcast, systemRecording,
                                                        captureEnabled, listenerEndpoint, nullptr);
        isRecording = !startError.copy();
        if (const auto act = beforeStartIsAnswered.copy()) act();
        handler(startError.copy(), microphoneEnabled, false);
    }
    void stopRecordingWithHandler(MovieHandler handler) override {
        FakeDaemon::stopRecordingWithHandler(nullptr);
        isRecording = false;
        if (!staysSilent) handler(movie.copy(), stopError.copy());
    }
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override {
        FakeDaemon::saveVideoToCameraRoll(movieURL, nullptr);
        handler(saveError.copy());
    }
    void synchronousGetCurrentState(StateHandler handler) override {
        handler(Dictionary{{"isRecording", isRecording.load()},
                           {"isSystemRecording", isRecording.load()},
                           {"microphoneEnabled", false}});
    }

    std::atomic<bool> isRecording{false};
    std::atomic<bool> staysSilent{false};
    Guarded<std::function<void()>> beforeStartIsAnswered;
    Guarded<OptionalError> startError;
    Guarded<OptionalError> stopError;
    Guarded<OptionalError> saveError;
    Guarded<std::optional<URL>> movie;
};

class KelvoctlRecordingTest : public testing::Test {
  protected:
    KelvoctlRecordingTest() {
        daemon->movie.set(URL::file(root.write("store/movie.mp4", "pixels")));
        listener->setDelegate(door);
        listener->resume();
    }

    RemoteClient client() const { return remoteClient(*door->client.copy(), "cannot tell"); }
    std::string contentOf(const std::string& name) const {
        std::ifstream file(root.path() + "/" + name);
        return {std::istreambuf_iterator<char>(file), {}};
    }

    const TemporaryDirectory root;
    const std::string socket = root.path() + "/run/kelvod/com.quillon.kelvod";
    const std::shared_ptr<ScriptedDaemon> daemon = std::make_shared<ScriptedDaemon>();
    const std::shared_ptr<OpenDoor> door = std::make_shared<OpenDoor>(daemon);
    SocketTransport transport{std::make_shared<const DeviceRoot>(root.path(), ""), nullptr};
    const std::shared_ptr<IPCListener> listener = transport.createListener("com.quillon.kelvod");
};

}  // namespace kelvo::test
