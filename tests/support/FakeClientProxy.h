#pragma once

#include "base/Guarded.h"
#include "ipc/KVClientProxyBase.h"

#include <vector>

namespace kelvo::test {

/// A client that remembers what it was told. Thread-safe.
class FakeClientProxy : public KVClientProxyBase {
  public:
    struct Stop {
        OptionalError error;
        std::optional<URL> movieURL;
        friend bool operator==(const Stop&, const Stop&) = default;
    };
    struct AudioSample {
        Bytes audioData;
        RecordBytes<AudioFormatRecord> absdData;
        std::int64_t itemCount;
        SampleBuffer::Type bufferType;
        RecordBytes<TimingRecord> timingData;
    };
    struct VideoSample {
        std::shared_ptr<KVIOSurfaceObject> surface;
        RecordBytes<TimingRecord> timingData;
    };

    void updateScreenRecordingState() override { note("updateScreenRecordingState"); }
    void updateBroadcastServiceInfo(const Dictionary& serviceInfo) override {
        serviceInfos.with([&](auto& all) { all.push_back(serviceInfo); });
        note("updateBroadcastServiceInfo");
    }
    void updateBroadcastURL(const URL& broadcastURL) override {
        broadcastURLs.with([&](auto& all) { all.push_back(broadcastURL); });
        note("updateBroadcastURL");
    }
    void recordingDidStopWithError(const OptionalError& error, const std::optional<URL>& movieURL) override {
        stops.with([&](auto& all) { all.push_back({error, movieURL}); });
        note("recordingDidStopWithError");
    }
    void recordingLockInterrupted(const KVError& error) override {
        lockInterruptions.with([&](auto& all) { all.push_back(error); });
        note("recordingLockInterrupted");
    }
    void recordingShouldResume() override { note("recordingShouldResume"); }
    void recordingDidPause() override { note("recordingDidPause"); }
    void recordingTimerDidUpdate(const std::string& timerText) override {
        timerTexts.with([&](auto& all) { all.push_back(timerText); });
        note("recordingTimerDidUpdate");
    }
    void captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                  const RecordBytes<TimingRecord>& timingData) override {
        videoSamples.with([&](auto& all) { all.push_back({surface, timingData}); });
        note("captureHandlerWithSample");
    }
    void captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                       const RecordBytes<AudioFormatRecord>& absdData, std::int64_t itemCount,
                                       SampleBuffer::Type bufferType,
                                       const RecordBytes<TimingRecord>& timingData) override {
        audioSamples.with([&](auto& all) {
            all.push_back(
                {Bytes(audioData.begin(), audioData.end()), absdData, itemCount, bufferType, timingData});
        });
        note("captureHandlerWithAudioSample");
    }
    void resetConnectionWithProcessIdentifier(std::int32_t processIdentifier) override {
        resetProcesses.with([&](auto& all) { all.push_back(processIdentifier); });
        note("resetConnectionWithProcessIdentifier");
    }

    /// The names of the messages so far, in order; what a message brought is kept before it is named.
    std::vector<std::string> messages() const { return messages_.copy(); }

    Guarded<std::vector<Dictionary>> serviceInfos;
    Guarded<std::vector<URL>> broadcastURLs;
    Guarded<std::vector<Stop>> stops;
    Guarded<std::vector<KVError>> lockInterruptions;
    Guarded<std::vector<std::string>> timerTexts;
    Guarded<std::vector<VideoSample>> videoSamples;
    Guarded<std::vector<AudioSample>> audioSamples;
    Guarded<std::vector<std::int32_t>> resetProcesses;

    /// When set, is told each message's name as well: for the order of messages to several receivers.
    std::function<void(const std::string& message)> onMessage;

  private:
    void note(const std::string& message) {
        messages_.with([&](auto& all) { all.push_back(message); });
        if (onMessage) onMessage(message);
    }

    Guarded<std::vector<std::string>> messages_;
};

}  // namespace kelvo::test
