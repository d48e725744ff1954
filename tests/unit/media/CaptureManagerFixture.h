#pragma once

#include "media/KVCaptureManager.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/LogRecorder.h"

#include <chrono>
#include <memory>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::test {

using namespace std::chrono_literals;

/// A capture manager on a simulated device, with places to collect what it delivers.
class CaptureManagerFixture : public testing::Test {
  protected:
    static constexpr std::int32_t kProcess = 42;

    /// Samples in the order of their delivery.
    using Samples = Guarded<std::vector<SampleBufferRef>>;

    ~CaptureManagerFixture() override { manager->stopAllCapture(); }

    CaptureManager::SampleHandler collect(Samples& samples) {
        return [&samples](const SampleBufferRef& sample) {
            samples.with([&](auto& all) { all.push_back(sample); });
        };
    }
    CaptureManager::DidStartHandler countInto(std::atomic<int>& count) {
        return [&count] { ++count; };
    }

    /// Waits until everything that was asked for or delivered has been dealt with.
    void settle() const {
        KVCaptureManager::audioDispatchQueue().sync([] {});
        manager->sessionSampleBufferQueue()->sync([] {});
    }
    void startMicrophone() {
        manager->startMicrophoneCaptureWithOutput(collect(microphone), countInto(micStarts));
        settle();
    }
    void startTap() {
        manager->startAppAudioCaptureForProcessID(kProcess, collect(appAudio), countInto(tapStarts));
        settle();
        settle();  // the did-start handler is a task of its own
    }
    /// What is heard during `duration`, captured and delivered.
    void hear(std::chrono::nanoseconds duration) {
        device.advance(duration);
        device.audio->play(duration);
        settle();
    }
    /// On the dispatch queue's time.
    std::shared_ptr<const AppAudioTap> tap() const {
        std::shared_ptr<const AppAudioTap> found;
        KVCaptureManager::audioDispatchQueue().sync([&] { found = manager->audioRecorderQueue(); });
        return found;
    }

    LogRecorder log;
    SimulatedDevice device;
    std::shared_ptr<KVCaptureManager> manager = KVCaptureManager::create(device.platform());
    Samples microphone;
    Samples appAudio;
    std::atomic<int> micStarts{0};
    std::atomic<int> tapStarts{0};
};

}  // namespace kelvo::test
