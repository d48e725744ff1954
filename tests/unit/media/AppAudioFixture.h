#pragma once

#include "CaptureManagerFixture.h"

#include <memory>
#include <string>
#include <vector>

namespace kelvo::test {

/// A capture manager that taps the application's sound.
class AppAudioFixture : public CaptureManagerFixture {
  protected:
    void startTapWithinARecording() {
        manager->setCaptureStartTime(MediaTime::make(0, 1000000000));
        startTap();
    }
    void resumeTap() {
        manager->resumeAppAudioCaptureForProcessID(kProcess, collect(appAudio));
        settle();
    }
    std::shared_ptr<SimulatedInputQueue> queue() const { return device.audio->inputQueue(); }

    static std::string startError(int code) {
        return "KVRecordingManager: startAudioCapture error: " + std::to_string(code);
    }

    /// What every start logs, whether it went well or not.
    const std::vector<std::string> startTexts{
        "KVRecordingManager: startAudioCapture: Created Audio Queue Input",
        "KVRecordingManager: startAudioCapture: Successfully set Audio Queue to PID",
        "KVRecordingManager: startAudioCapture: Successfully started Audio Queue Recording",
    };
};

}  // namespace kelvo::test
