#pragma once

#include "daemon/KVRecordingManager.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeRecordingSession.h"
#include "support/LogRecorder.h"

#include <memory>
#include <string>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

/// A manager on a simulated device, whose sessions are fakes.
class ManagerFixture : public testing::Test {
  protected:
    static constexpr const char* kStore = "/private/var/mobile/Library/KelvoKit/";
    static constexpr const char* kPurgeService = "com.quillon.kelvod-cache-delete";

    void createManager() {
        manager = KVRecordingManager::create(device.platform(), [](const std::string& bundleID) {
            return std::make_shared<FakeRecordingSession>(bundleID);
        });
    }

    /// The session of a bundle, created when there is none.
    std::shared_ptr<FakeRecordingSession> session(const std::string& bundleID) {
        return std::static_pointer_cast<FakeRecordingSession>(
            manager->sessionManager()->recordingSessionInstanceWithBundleIdentifier(bundleID));
    }
    std::shared_ptr<FakeRecordingSession> recordingSession(const std::string& bundleID) {
        auto found = session(bundleID);
        found->recording = true;
        return found;
    }
    std::shared_ptr<FakeRecordingSession> recordingSystemSession() {
        auto found = recordingSession("com.quillon.plinth");
        found->systemRecording = true;
        return found;
    }

    static std::vector<std::int64_t> stopCodes(const FakeRecordingSession& session) {
        std::vector<std::int64_t> codes;
        for (const auto& stop : session.client->stops.copy())
            codes.push_back(stop.error ? stop.error->code() : 0);
        return codes;
    }

    const LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<KVRecordingManager> manager;
};

}  // namespace kelvo::test
