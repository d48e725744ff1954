#include "SessionFixture.h"

namespace kelvo::test {
namespace {

struct MicRow {
    bool isSystem;
    bool hasDevice;
    bool isEnabled;
    bool hasConsent;
    bool isBroadcast;
    bool isTapped;
};

TEST_F(SessionFixture, MicrophoneIsTappedWhenItMayBeNeeded) {
    for (const MicRow& row : {
             MicRow{true, true, true, false, false, true},    // system: wanted
             MicRow{true, true, false, true, false, false},   // system: not wanted
             MicRow{true, false, true, true, false, false},   // system: no device
             MicRow{false, true, true, true, false, true},    // in-app: wanted, with consent
             MicRow{false, true, true, false, false, false},  // in-app: no consent
             MicRow{false, true, false, true, false, false},  // in-app: not wanted
             MicRow{false, true, false, true, true, true},    // in-app broadcast: ready, in silence
             MicRow{false, false, true, true, true, false},   // in-app: no device
         }) {
        captureManager->calls.clear();
        captureManager->hasDevice = row.hasDevice;
        makeSession("com.example.paint");
        session->setSystemRecording(row.isSystem);
        session->setMicrophoneEnabled(row.isEnabled);
        session->setDaemonUserConsentForMicrophone(row.hasConsent);
        if (row.isBroadcast) broadcast(BroadcastProcessMode::movieClips);
        start();
        EXPECT_EQ(captureManager->called("start microphone"), row.isTapped);
    }
    EXPECT_TRUE(log.contains("starting mic capture"));
}

TEST_F(SessionFixture, TapCountsOnceItRuns) {
    session->setupMicTap();
    EXPECT_FALSE(session->haveMicTap());
    captureManager->microphoneDidStart();
    EXPECT_TRUE(session->haveMicTap());
    session->stopAllCapture();
    EXPECT_FALSE(session->haveMicTap());
}

TEST_F(SessionFixture, MicrophoneSwitchedOnDuringASystemRecordingIsTapped) {
    makeSystemSession();
    start();
    EXPECT_FALSE(captureManager->called("start microphone"));
    session->setMicrophoneEnabled(true);
    EXPECT_TRUE(captureManager->called("start microphone"));
}

TEST_F(SessionFixture, MicrophoneSwitchedOnIsNotTappedOtherwise) {
    session->setMicrophoneEnabled(true);
    start();
    captureManager->calls.clear();
    session->setMicrophoneEnabled(true);  // in-app
    EXPECT_FALSE(captureManager->called("start microphone"));

    makeSystemSession();
    session->setMicrophoneEnabled(true);  // not recording
    EXPECT_FALSE(captureManager->called("start microphone"));
    session->setRecording(true);
    captureManager->hasDevice = false;
    session->setMicrophoneEnabled(true);  // no device
    EXPECT_FALSE(captureManager->called("start microphone"));
    captureManager->hasDevice = true;
    session->setMicrophoneEnabled(false);
    EXPECT_FALSE(captureManager->called("start microphone"));
}

TEST_F(SessionFixture, RunningTapIsNotStartedTwiceAndNotStoppedByTheSwitch) {
    makeSystemSession();
    session->setMicrophoneEnabled(true);
    start();
    captureManager->microphoneDidStart();
    captureManager->calls.clear();
    session->setMicrophoneEnabled(false);
    session->setMicrophoneEnabled(true);
    EXPECT_TRUE(captureManager->calls.empty());
}

TEST_F(SessionFixture, MicrophoneGoesToTheSecondAudioTrack) {
    session->setMicrophoneEnabled(true);
    start();
    session->processMicrophoneSample(audioSample(10));
    ASSERT_EQ(writer->audio2.size(), 1U);
    EXPECT_EQ(writer->audio2.front()->audioBytes()[0], std::byte{7});
    EXPECT_EQ(session->reportingAgent()->micFrameCount(), 1);
}

TEST_F(SessionFixture, SwitchedOffMicrophoneIsSilenceInsteadOfAGap) {
    start();
    session->processMicrophoneSample(audioSample(10));
    ASSERT_EQ(writer->audio2.size(), 1U);
    for (const std::byte byte : writer->audio2.front()->audioBytes())
        EXPECT_EQ(byte, std::byte{0});
    EXPECT_EQ(writer->audio2.front()->sampleCount(), 4);
}

TEST_F(SessionFixture, ApplicationAudioGoesToTheFirstAudioTrackUnchanged) {
    start();
    session->processAppAudioSample(audioSample(10));
    ASSERT_EQ(writer->audio1.size(), 1U);
    EXPECT_EQ(writer->audio1.front()->audioBytes()[0], std::byte{7});
    EXPECT_EQ(session->reportingAgent()->appAudioFrameCount(), 1);
}

TEST_F(SessionFixture, SoundIsDroppedWhilePausedButItsDurationIsTold) {
    start();
    session->pauseSession();
    delegate->durations.clear();
    session->processMicrophoneSample(audioSample(10));
    session->processAppAudioSample(audioSample(20));
    EXPECT_TRUE(writer->audio1.empty() && writer->audio2.empty());
    EXPECT_EQ(delegate->durations.size(), 2U);
    EXPECT_EQ(session->reportingAgent()->micFrameCount(), 0);
    EXPECT_EQ(session->reportingAgent()->appAudioFrameCount(), 0);
}

TEST_F(SessionFixture, SoundIsNotRebased) {
    start();
    frame(1000);
    session->pauseSession();
    session->resumeSessionWithContextID(11);
    frame(6000);
    session->processAppAudioSample(audioSample(7000));
    EXPECT_EQ(writer->audio1.front()->presentationTime(), at(7000));
}

TEST_F(SessionFixture, SampleBroadcastSendsSoundToTheExtension) {
    const auto link = broadcast(BroadcastProcessMode::sampleBuffers);
    start();
    session->processMicrophoneSample(audioSample(10));
    session->processAppAudioSample(audioSample(20));
    ASSERT_EQ(link->samples.size(), 2U);
    EXPECT_EQ(link->samples[0].first, SampleBuffer::Type::microphone);
    EXPECT_EQ(link->samples[1].first, SampleBuffer::Type::applicationAudio);
    EXPECT_EQ(session->reportingAgent()->micFrameCount(), 1);
}

TEST_F(SessionFixture, ClipBroadcastCutsOnApplicationAudioAndWritesTheMicrophone) {
    const auto link = broadcast(BroadcastProcessMode::movieClips);
    start();
    session->processMicrophoneSample(audioSample(10));
    session->processAppAudioSample(audioSample(20));
    EXPECT_EQ(writer->audio2.size(), 1U);
    EXPECT_TRUE(writer->audio1.empty());
    EXPECT_EQ(link->clipAudio.size(), 1U);
    EXPECT_EQ(session->reportingAgent()->appAudioFrameCount(), 1);
}

TEST_F(SessionFixture, CaptureSendsSoundToTheClient) {
    session->setCaptureRecording(true);
    session->setMicrophoneEnabled(true);
    start();
    session->processMicrophoneSample(audioSample(10));
    session->processAppAudioSample(audioSample(20));
    ASSERT_EQ(client->sounds.size(), 2U);
    const auto& sound = client->sounds.front();
    EXPECT_EQ(sound.audio, Bytes(8, std::byte{7}));
    EXPECT_EQ(sound.format, AudioFormatRecord::signed16(44100, 1));
    EXPECT_EQ(sound.itemCount, 4);
    EXPECT_EQ(sound.type, SampleBuffer::Type::microphone);
    EXPECT_EQ(sound.timing, (TimingRecord{at(4), at(10), at(10)}));
    EXPECT_EQ(client->sounds.back().type, SampleBuffer::Type::applicationAudio);
    EXPECT_TRUE(writer->audio1.empty() && writer->audio2.empty());
}

TEST_F(SessionFixture, TapsReachTheSessionAndOutliveIt) {
    session->setDaemonUserConsentForMicrophone(true);
    session->setMicrophoneEnabled(true);
    session->setFrontmostPIDForAudioTap(kClientPID);
    start();
    captureManager->microphone(audioSample(1));
    captureManager->appAudio(audioSample(2));
    EXPECT_EQ(writer->audio1.size(), 1U);
    EXPECT_EQ(writer->audio2.size(), 1U);
    session.reset();
    captureManager->microphone(audioSample(3));
    captureManager->appAudio(audioSample(4));
    captureManager->microphoneDidStart();
    captureManager->appAudioDidStart();
    EXPECT_EQ(writer->audio1.size(), 1U);
}

TEST_F(SessionFixture, TapFollowsTheFrontmostApplication) {
    start();
    session->frontmostApplicationDidChange(kClientPID);
    EXPECT_EQ(session->frontmostPIDForAudioTap(), kClientPID);
    EXPECT_TRUE(captureManager->called("stop app audio"));
    EXPECT_TRUE(captureManager->called("resume app audio 501"));
    for (const char* text : {"updateProcessIDForAudioCaptureWithPID: 501", "stopping audio capture",
                             "update foreground app bundleId", "resuming audio capture for pid: 501"})
        EXPECT_TRUE(log.contains(text)) << text;
    captureManager->calls.clear();
    session->frontmostApplicationDidChange(kClientPID);
    EXPECT_TRUE(captureManager->calls.empty()) << "it is tapped already";
}

TEST_F(SessionFixture, IdleSessionTapsNobody) {
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    EXPECT_EQ(session->frontmostPIDForAudioTap(), 0);
    EXPECT_TRUE(captureManager->calls.empty());
    EXPECT_TRUE(log.contains("updateProcessIDForAudioCaptureWithPID: 501"));
    EXPECT_FALSE(log.contains("stopping audio capture"));
}

TEST_F(SessionFixture, InvalidProcessLeavesTheRunningTap) {
    start();
    session->updateProcessIDForAudioCaptureWithPID(0);
    EXPECT_TRUE(captureManager->calls.empty());
    EXPECT_TRUE(log.contains("invalid pid stopping audio capture"));
    EXPECT_EQ(session->frontmostPIDForAudioTap(), 0);
}

TEST_F(SessionFixture, TerminatedApplicationsTapIsStopped) {
    start();
    session->setFrontmostPIDForAudioTap(kClientPID);
    session->frontmostApplicationWasTerminated(1);
    EXPECT_TRUE(captureManager->calls.empty());
    session->frontmostApplicationWasTerminated(kClientPID);
    EXPECT_TRUE(captureManager->called("stop app audio"));
}

TEST_F(SessionFixture, BackgroundedApplicationIsForgottenButItsTapGoesOn) {
    start();
    session->setFrontmostPIDForAudioTap(kClientPID);
    session->frontmostApplicationDidEnterBackground(1);
    EXPECT_EQ(session->frontmostPIDForAudioTap(), kClientPID);
    session->frontmostApplicationDidEnterBackground(kClientPID);
    EXPECT_EQ(session->frontmostPIDForAudioTap(), -1);
    EXPECT_TRUE(captureManager->calls.empty());
}

TEST_F(SessionFixture, ExtensionHearsOfTheFirstApplicationOfEachStart) {
    const auto link = broadcast(BroadcastProcessMode::movieClips);
    start();
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    EXPECT_EQ(link->frontmostBundleIDs, std::vector<std::string>{"com.example.paint"});
    EXPECT_EQ(session->bundleIDOfFirstForegroundApp(), "com.example.paint");
    finish();
    session->setBroadcasting(true);
    start();
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    EXPECT_EQ(link->frontmostBundleIDs.size(), 2U);
}

TEST_F(SessionFixture, ApplicationWithoutABundleLeavesTheFirstPlaceOpen) {
    const auto link = broadcast(BroadcastProcessMode::movieClips);
    start();
    session->updateProcessIDForAudioCaptureWithPID(999);
    EXPECT_TRUE(link->frontmostBundleIDs.empty());
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    EXPECT_EQ(link->frontmostBundleIDs.size(), 1U);
}

TEST_F(SessionFixture, RecordingThatIsNoBroadcastNamesNoApplication) {
    start();
    session->updateProcessIDForAudioCaptureWithPID(kClientPID);
    EXPECT_EQ(session->bundleIDOfFirstForegroundApp(), std::nullopt);
}

}  // namespace
}  // namespace kelvo::test
