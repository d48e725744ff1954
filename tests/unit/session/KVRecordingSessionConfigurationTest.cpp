#include "SessionFixture.h"

#include <cstdlib>

namespace kelvo::test {
namespace {

struct SizeRow {
    const char* name;
    DeviceIdiom idiom;
    std::int64_t chip;
    bool fullResolution;
    Size given;
    Size expected;
};

class CaptureSize : public SessionFixture, public testing::WithParamInterface<SizeRow> {};

TEST_P(CaptureSize, IsLimitedByTheDevice) {
    const SizeRow& row = GetParam();
    device.device->setIdiom(row.idiom);
    device.device->setChipIdentifier(row.chip);
    device.preferences->set("KVFullResCapture", row.fullResolution);
    session->setWindowSize(row.given);
    EXPECT_DOUBLE_EQ(session->windowSize().width, row.expected.width);
    EXPECT_DOUBLE_EQ(session->windowSize().height, row.expected.height);
    EXPECT_EQ(session->originalWindowSize(), row.given);
    EXPECT_EQ(log.contains("full res capture enabled"), row.fullResolution);
}

INSTANTIATE_TEST_SUITE_P(
    AllRules, CaptureSize,
    testing::Values(
        SizeRow{"WideIsReducedByWidth", DeviceIdiom::phone, 1, false, {3000, 2000}, {1920, 1280}},
        SizeRow{"HighIsReducedByHeight", DeviceIdiom::phone, 1, false, {1000, 4000}, {480, 1920}},
        SizeRow{"BothTooLong", DeviceIdiom::phone, 1, false, {5760, 3840}, {1920, 1280}},
        SizeRow{"SmallIsNotEnlarged", DeviceIdiom::phone, 1, false, {320, 200}, {320, 200}},
        SizeRow{"LimitItselfFits", DeviceIdiom::phone, 1, false, {1080, 1920}, {1080, 1920}},
        SizeRow{"FullResolution", DeviceIdiom::phone, 1, true, {3000, 2000}, {3000, 2000}},
        SizeRow{"SmallTablet", DeviceIdiom::tablet, 35168, false, {2048, 1536}, {1600, 1200}},
        SizeRow{"OtherTablet", DeviceIdiom::tablet, 35169, false, {3840, 2160}, {1920, 1080}},
        SizeRow{"PhoneWithTheTabletsChip", DeviceIdiom::phone, 35168, false, {3840, 2160}, {1920, 1080}}),
    [](const auto& row) { return std::string(row.param.name); });

TEST_F(SessionFixture, ChipIsReadOnceAndAgainWhileItIsUnknown) {
    device.device->setChipIdentifier(0);
    EXPECT_EQ(session->chipId(), 0);
    device.device->setChipIdentifier(7);
    EXPECT_EQ(session->chipId(), 7);
    device.device->setChipIdentifier(8);
    EXPECT_EQ(session->chipId(), 7);
}

TEST_F(SessionFixture, NewSessionIsIdle) {
    const auto fresh = KVRecordingSession::create("com.example.paint", services());
    EXPECT_EQ(fresh->bundleID(), "com.example.paint");
    EXPECT_FALSE(fresh->isRecording() || fresh->isPaused() || fresh->isBroadcasting() ||
                 fresh->isCapturing());
    EXPECT_FALSE(fresh->isSystemRecording() || fresh->microphoneEnabled() || fresh->haveMicTap());
    EXPECT_TRUE(fresh->contextIDs().empty());
    EXPECT_EQ(fresh->windowSize(), Size());
    EXPECT_EQ(fresh->frontmostPIDForAudioTap(), 0);
    EXPECT_TRUE(fresh->firstSampleTimestamp().isZero());
    EXPECT_FALSE(fresh->lastSampleTimestamp().isValid());
    EXPECT_TRUE(fresh->sampleTimeOffset().isZero());
    EXPECT_FALSE(fresh->sessionWasResumed());
    EXPECT_EQ(fresh->captureStartTime(), std::nullopt);
    EXPECT_EQ(fresh->movieWriter(), nullptr);
    EXPECT_EQ(fresh->reportingAgent(), nullptr);
    EXPECT_EQ(fresh->broadcastServiceInfoQueue().label(), "com.quillon.kelvod.ServiceInfoQueue");
}

TEST_F(SessionFixture, ScreenIsPortraitUnlessTheDeviceSaysOtherwise) {
    device.device->setMainScreenOrientation(std::nullopt);
    EXPECT_TRUE(session->isNativeScreenOrientationPortrait());
    device.device->setMainScreenOrientation(0.0F);
    EXPECT_TRUE(session->isNativeScreenOrientationPortrait());
    device.device->setMainScreenOrientation(90.0F);
    EXPECT_FALSE(session->isNativeScreenOrientationPortrait());
}

TEST_F(SessionFixture, InAppMovieIsNamedAfterTheApplication) {
    EXPECT_EQ(session->outputPath(), std::string(kStore) + "Paint.mp4");
    EXPECT_EQ(session->outputURL(), URL::file(std::string(kStore) + "Paint.mp4"));
}

TEST_F(SessionFixture, NameThatWasSetIsNotConsulted) {
    session->setOutputURL(URL::file("/elsewhere.mp4"));
    EXPECT_EQ(session->outputURL(), URL::file(std::string(kStore) + "Paint.mp4"));
}

TEST_F(SessionFixture, SystemMovieIsNamedAfterTheMoment) {
    makeSystemSession();
    const std::string expected = std::string(kStore) + "ScreenRecording_" +
                                 localTimeText(device.clock->now(), "%m-%d-%Y %H-%M-%S") + ".mp4";
    EXPECT_EQ(session->outputPath(), expected);
    EXPECT_EQ(expected.find(':'), std::string::npos);
}

TEST_F(SessionFixture, SystemMoviesNameIsMadeAnew) {
    makeSystemSession();
    const std::string before = session->outputPath();
    device.advance(std::chrono::seconds(1));
    EXPECT_NE(session->outputPath(), before);
}

TEST_F(SessionFixture, FragmentIsNamedAfterBundleTimeAndIndexAlsoInASystemBroadcast) {
    makeSystemSession();
    broadcast(BroadcastProcessMode::movieClips);
    session->setBroadcastFragmentIndex(3);
    EXPECT_EQ(session->outputPath(),
              std::string(kStore) + "KVMovie_com.quillon.plinth_1700000000.000000_3.mp4");
}

TEST_F(SessionFixture, TrimmedMovieIsNamedAfterTheApplicationInEveryCase) {
    EXPECT_EQ(session->trimmedOutputURL(), URL::file(std::string(kStore) + "Paint_trimmed.mp4"));
    broadcast(BroadcastProcessMode::movieClips);
    EXPECT_EQ(session->trimmedOutputPath(), std::string(kStore) + "Paint_trimmed.mp4");
}

TEST_F(SessionFixture, MoviesUnderTheApplicationsNameAreItsOwn) {
    EXPECT_TRUE(session->ownsMovie(session->outputURL()));
    EXPECT_TRUE(session->ownsMovie(session->trimmedOutputURL()));
    EXPECT_TRUE(session->ownsMovie(URL::file("/private/var/mobile/Library/KelvoKit/Paint.mp4")));
    for (const char* other : {"/private/var/mobile/Library/KelvoKit/Other.mp4", "/home/Paint.mp4", ""})
        EXPECT_FALSE(session->ownsMovie(URL::file(other))) << other;
}

TEST_F(SessionFixture, MovieIsBeingWrittenWhileItsSessionRecords) {
    EXPECT_FALSE(session->isWritingMovie(session->outputURL()));
    start();
    EXPECT_TRUE(session->isWritingMovie(session->outputURL()));
    EXPECT_FALSE(session->isWritingMovie(session->trimmedOutputURL()));
    session->setRecording(false);
    EXPECT_FALSE(session->isWritingMovie(session->outputURL()));
}

TEST_F(SessionFixture, ApplicationsNameCannotLeaveTheStore) {
    SimulatedBundleContent evil;
    evil.bundleIdentifier = "com.example.evil";
    evil.name = "../../../etc/evil";
    device.bundles->addBundle("/Applications/Evil.app", evil);
    makeSession("com.example.evil");
    EXPECT_EQ(session->outputPath(), std::string(kStore) + "..-..-..-etc-evil.mp4");
}

TEST_F(SessionFixture, UnknownApplicationHasTheNameOfAMissingText) {
    makeSession("com.example.gone");
    EXPECT_EQ(session->outputPath(), std::string(kStore) + "(null).mp4");
}

struct ServiceRow {
    bool isSystem;
    bool isBroadcasting;
    bool isCapture;
    const char* name;
};

TEST_F(SessionFixture, ReportingServiceIsNamedAfterTheKindOfRecording) {
    for (const ServiceRow& row :
         {ServiceRow{true, true, true, "SystemBroadcast"}, ServiceRow{true, false, true, "SystemRecording"},
          ServiceRow{false, true, true, "InAppBroadcast"}, ServiceRow{false, false, true, "InAppCapture"},
          ServiceRow{false, false, false, "InAppRecording"}}) {
        session->setSystemRecording(row.isSystem);
        session->setBroadcasting(row.isBroadcasting);
        session->setCaptureRecording(row.isCapture);
        EXPECT_EQ(session->_serviceNameForReporting(), row.name);
    }
}

TEST_F(SessionFixture, BothCamerasCountAsTheFrontOne) {
    session->sessionReportCameraUsage(1);  // no agent yet
    start();
    const auto agent = session->reportingAgent();
    session->sessionReportCameraUsage(3);
    EXPECT_FALSE(agent->frontCameraUsed());
    session->sessionReportCameraUsage(1);
    EXPECT_TRUE(agent->frontCameraUsed());
    EXPECT_FALSE(agent->backCameraUsed());
}

TEST_F(SessionFixture, FrontCameraCountsAsTheFrontOne) {
    start();
    session->sessionReportCameraUsage(2);
    EXPECT_TRUE(session->reportingAgent()->frontCameraUsed());
    EXPECT_FALSE(session->reportingAgent()->backCameraUsed());
}

TEST_F(SessionFixture, BackCameraThatIsMarkedUsedChangesNothing) {
    start();
    session->reportingAgent()->setBackCameraUsed(true);
    session->sessionReportCameraUsage(1);
    EXPECT_FALSE(session->reportingAgent()->frontCameraUsed());
}

}  // namespace
}  // namespace kelvo::test
