#pragma once

#include "daemon/KVRecordingManager.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/FakeRecordingSession.h"
#include "support/LogRecorder.h"

#include <atomic>
#include <memory>
#include <string>
#include <thread>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

/// A manager on a simulated device, whose sessions are fakes.
class ManagerFixture : public testing::Test {
  protected:
    static constexpr const char* kStore = "/private/var/mobile/Library/KelvoKit/";
    static constexpr const char* kPurgeService = "com.quillon.kelvod-cache-delete";

    /// What a session was never asked to complete may hold the session itself. A start that is still on its
    /// way is let through first.
    ~ManagerFixture() override {
        device.settle();
        for (const auto& made : sessions_) {
            made->start = nullptr;
            made->finish = nullptr;
            made->cleanup = nullptr;
        }
        device.settle();
        manager.reset();
        drainAlerts();
    }

    /// Takes every alert that nobody answered off the screen, and waits until no more come.
    void drainAlerts() {
        std::atomic<bool> isDrained = false;
        KVRecordingManager::kelvoAlertQueue().async([&] { isDrained = true; });
        while (!isDrained) {
            device.answerAlert(SystemAlertResponse::cancelled);
            std::this_thread::yield();
        }
    }

    void createManager() {
        manager = KVRecordingManager::create(device.platform(), [this](const std::string& bundleID) {
            sessions_.push_back(std::make_shared<FakeRecordingSession>(bundleID));
            return sessions_.back();
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

  private:
    std::vector<std::shared_ptr<FakeRecordingSession>> sessions_;
};

}  // namespace kelvo::test
