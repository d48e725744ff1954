#include "MovieWriterFixture.h"
#include "base/MediaRecords.h"
#include "platform/MediaErrors.h"
#include "platform/MediaSettings.h"

#include <atomic>
#include <cmath>
#include <limits>

namespace kelvo::test {
namespace {

class KVMovieWriterSetupTest : public MovieWriterFixture {
  protected:
    void startWithWindow(const Size& size) {
        writer = makeWriter(size);
        start();
    }
    Dictionary videoSettings() const { return video()->outputSettings(); }
    Dictionary compression() const {
        return *videoSettings().find(kVideoCompressionPropertiesKey)->asDictionary();
    }
    std::int64_t bitRate() const { return compression().find(kAverageBitRateKey)->asInteger().value(); }
    Size encodedSize() const {
        return {videoSettings().find(kVideoWidthKey)->asDouble().value(),
                videoSettings().find(kVideoHeightKey)->asDouble().value()};
    }
};

TEST_F(KVMovieWriterSetupTest, NewWriterHasQueuesButNoFileWriter) {
    EXPECT_EQ(writer->assetWriter(), nullptr);
    EXPECT_EQ(writer->videoInput(), nullptr);
    EXPECT_TRUE(writer->videoBufferQueue()->isEmpty());
    EXPECT_TRUE(writer->audioBufferQueue1()->isEmpty());
    EXPECT_TRUE(writer->audioBufferQueue2()->isEmpty());
    EXPECT_EQ(writer->movieWriterQueue().label(), "com.quillon.KelvoKit.KVMovieWriterQueue");
    EXPECT_FALSE(writer->didProcessFirstSample());
    EXPECT_FALSE(writer->isFinishingWriting());
    EXPECT_FALSE(writer->trimVideoPresentationTime().isValid());
    EXPECT_EQ(writer->outputPath(), kPath);
    EXPECT_EQ(writer->outputURL(), URL::file(kPath));
    EXPECT_EQ(writer->windowSize(), (Size{1080, 1920}));
}

TEST_F(KVMovieWriterSetupTest, SystemRecordingIsOnlyKept) {
    EXPECT_FALSE(writer->systemRecording());
    writer->setSystemRecording(true);
    EXPECT_TRUE(writer->systemRecording());
}

TEST_F(KVMovieWriterSetupTest, StartRemovesTheOldFileThenSetsUpThenCallsTheHandler) {
    device.fileSystem->addFile(kPath, 5);
    std::atomic<bool> fileWasGone = false;
    std::atomic<bool> hadWriter = false;
    writer->startWritingHandler([&] {
        fileWasGone = !device.fileSystem->itemExists(kPath);
        hadWriter = writer->assetWriter() != nullptr;
    });
    settle();
    EXPECT_TRUE(fileWasGone);
    EXPECT_TRUE(hadWriter);
    EXPECT_EQ(log.count(LogLevel::info, "KVMovieWriter: startWritingHandler"), 1U);
    EXPECT_EQ(log.count(LogLevel::info, "KVMovieWriter: setupAssetWriter"), 1U);
}

TEST_F(KVMovieWriterSetupTest, StartGoesOnWhenTheOldFileCannotBeRemoved) {
    device.fileSystem->addFile(kPath, 5);
    device.failNext("FileSystem.removeItem", EACCES);
    std::atomic<bool> called = false;
    writer->startWritingHandler([&] { called = true; });
    settle();
    EXPECT_TRUE(called);
    EXPECT_NE(writer->assetWriter(), nullptr);
}

TEST_F(KVMovieWriterSetupTest, StartWithoutAHandlerSetsUp) {
    start();
    EXPECT_EQ(writer->assetWriter(), fileWriter());
    EXPECT_EQ(writer->assetWriter()->status(), MediaFileWriter::Status::unknown);
}

TEST_F(KVMovieWriterSetupTest, InputsAreAddedVideoFirstAndExpectRealTime) {
    start();
    ASSERT_EQ(fileWriter()->inputs().size(), 3U);
    EXPECT_EQ(writer->videoInput(), video());
    EXPECT_EQ(writer->audioInput1(), audio1());
    EXPECT_EQ(writer->audioInput2(), audio2());
    EXPECT_EQ(video()->mediaType(), MediaType::video);
    EXPECT_EQ(audio1()->mediaType(), MediaType::audio);
    EXPECT_EQ(audio2()->mediaType(), MediaType::audio);
    for (const auto& each : fileWriter()->inputs())
        EXPECT_TRUE(each->expectsMediaDataInRealTime());
}

TEST_F(KVMovieWriterSetupTest, FailedSetupLeavesNoWriterAndNoInputs) {
    device.failNext("MediaService.createFileWriter", ENOENT);
    start();
    EXPECT_EQ(writer->assetWriter(), nullptr);
    EXPECT_EQ(writer->videoInput(), nullptr);
    EXPECT_EQ(log.count(LogLevel::error, "KVMovieWriter: setupAssetWriter error: 2"), 1U);
    EXPECT_FALSE(log.contains("bit rate set to 5000000"));
}

TEST_F(KVMovieWriterSetupTest, AppendsAfterAFailedSetupDoNothing) {
    device.failNext("MediaService.createFileWriter", ENOENT);
    start();
    log.clear();
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(100), {}));
    appendAudio1(100);
    appendAudio2(100);
    EXPECT_TRUE(log.lines().empty());
    EXPECT_FALSE(writer->appendInitialSampleBuffer(videoSample(100), {}));
    EXPECT_TRUE(log.contains("ERROR starting asset writer"));
}

TEST_F(KVMovieWriterSetupTest, SetupEmptiesTheQueuesAndForgetsTheTimes) {
    startMovie();
    appendVideo(200);
    appendAudio1(200);
    appendAudio2(200);
    video()->setBusy(true);
    appendVideo(300);
    ASSERT_FALSE(writer->videoBufferQueue()->isEmpty());
    ASSERT_TRUE(writer->lastAudio2PresentationTime().isValid());
    writer->setupAssetWriter();
    EXPECT_TRUE(writer->videoBufferQueue()->isEmpty());
    EXPECT_FALSE(writer->lastVideoPresentationTime().isValid());
    EXPECT_FALSE(writer->lastAudio1PresentationTime().isValid());
    EXPECT_FALSE(writer->lastAudio2PresentationTime().isValid());
    EXPECT_EQ(device.media->writers().size(), 2U);
}

TEST_F(KVMovieWriterSetupTest, TabletHasTheHighestBitRateWhateverTheSize) {
    device.device->setIdiom(DeviceIdiom::tablet);
    startWithWindow({320, 240});
    EXPECT_EQ(bitRate(), 7000000);
    EXPECT_TRUE(log.contains("bit rate set to 7000000"));
}

TEST_F(KVMovieWriterSetupTest, LargeWidthOrHeightHasTheMiddleBitRate) {
    startWithWindow({1080, 1920});
    EXPECT_EQ(bitRate(), 5000000);
    startWithWindow({1920, 1080});
    EXPECT_EQ(bitRate(), 5000000);
}

TEST_F(KVMovieWriterSetupTest, SmallWindowHasTheLowestBitRate) {
    startWithWindow({1919, 1919.9});
    EXPECT_EQ(bitRate(), 3000000);
    EXPECT_TRUE(log.contains("bit rate set to 3000000"));
}

TEST_F(KVMovieWriterSetupTest, BitRateOverrideReplacesTheChoice) {
    device.preferences->set("KVBitRateOverride", 1234567);
    start();
    EXPECT_EQ(bitRate(), 1234567);
    EXPECT_TRUE(log.contains("bit rate set to 1234567"));
}

TEST_F(KVMovieWriterSetupTest, BitRateOverrideOfZeroIsUsedAsItStands) {
    device.preferences->set("KVBitRateOverride", 0);
    start();
    EXPECT_EQ(bitRate(), 0);
    EXPECT_TRUE(log.contains("bit rate set to 0"));
}

TEST_F(KVMovieWriterSetupTest, BitRateOverrideMayBeAbsurd) {
    device.preferences->set("KVBitRateOverride", std::numeric_limits<std::int64_t>::min());
    start();
    EXPECT_EQ(bitRate(), std::numeric_limits<std::int64_t>::min());
    device.preferences->set("KVBitRateOverride", "fast");
    start();
    EXPECT_EQ(bitRate(), 0);
}

TEST_F(KVMovieWriterSetupTest, CompressionPropertiesStandInTheirOrder) {
    start();
    const Dictionary expected{{std::string(kExpectedSourceFrameRateKey), 60},
                              {std::string(kProfileLevelKey), kProfileLevelH264High},
                              {std::string(kAverageBitRateKey), 5000000},
                              {std::string(kMaxKeyFrameIntervalKey), 60}};
    EXPECT_EQ(compression(), expected);
    EXPECT_FALSE(log.contains("using custom video compression properties"));
}

TEST_F(KVMovieWriterSetupTest, CustomCompressionPropertiesWin) {
    auto configuration = std::make_shared<KVBroadcastConfiguration>();
    configuration->setVideoCompressionProperties(
        Dictionary{{std::string(kAverageBitRateKey), 900000}, {"Other", "text"}});
    writer->setBroadcastConfig(configuration);
    start();
    EXPECT_EQ(bitRate(), 900000);
    EXPECT_EQ(compression().find("Other")->asString()[0], "text");
    EXPECT_EQ(compression().find(kMaxKeyFrameIntervalKey)->asInteger(), 60);
    EXPECT_TRUE(log.contains("using custom video compression properties"));
}

TEST_F(KVMovieWriterSetupTest, BroadcastConfigurationWithoutPropertiesChangesNothing) {
    auto configuration = std::make_shared<KVBroadcastConfiguration>();
    configuration->setClipDuration(5);
    writer->setBroadcastConfig(configuration);
    start();
    EXPECT_EQ(bitRate(), 5000000);
    EXPECT_FALSE(log.contains("using custom video compression properties"));
    EXPECT_EQ(writer->broadcastConfig(), configuration);
}

TEST_F(KVMovieWriterSetupTest, FractionalWindowIsEncodedAtItsWholePixels) {
    startWithWindow({886.5, 1920});
    EXPECT_EQ(encodedSize(), (Size{886, 1920}));
    EXPECT_EQ(bitRate(), 5000000);
}

TEST_F(KVMovieWriterSetupTest, OddSidesAreRoundedUpToEven) {
    startWithWindow({1125, 2436});
    EXPECT_EQ(encodedSize(), (Size{1126, 2436}));
    startWithWindow({1124, 2435});
    EXPECT_EQ(encodedSize(), (Size{1124, 2436}));
}

TEST_F(KVMovieWriterSetupTest, AbsurdWindowSizesAreHandedOn) {
    startWithWindow({-3, 1e300});
    EXPECT_EQ(encodedSize(), (Size{-2, 1e300}));
    startWithWindow({std::numeric_limits<double>::quiet_NaN(), std::numeric_limits<double>::infinity()});
    EXPECT_TRUE(std::isnan(encodedSize().width));
}

TEST_F(KVMovieWriterSetupTest, VideoIsH264) {
    start();
    EXPECT_EQ(*videoSettings().find(kVideoCodecKey)->asString(), kVideoCodecH264);
}

TEST_F(KVMovieWriterSetupTest, BothAudioInputsAreStereoAAC) {
    start();
    EXPECT_EQ(audio1()->outputSettings(), audio2()->outputSettings());
    const Dictionary settings = audio1()->outputSettings();
    EXPECT_EQ(settings.find(kAudioFormatKey)->asInteger(), 0x61616320);
    EXPECT_EQ(settings.find(kAudioChannelCountKey)->asInteger(), 2);
    EXPECT_EQ(settings.find(kAudioSampleRateKey)->asDouble(), 44100.0);
    EXPECT_EQ(settings.find(kAudioBitRateKey)->asInteger(), 128000);
    Bytes layout(32, std::byte{0});
    layout[0] = std::byte{0x02};
    layout[2] = std::byte{0x65};
    EXPECT_EQ(*settings.find(kAudioChannelLayoutKey)->as<Bytes>(), layout);
}

}  // namespace
}  // namespace kelvo::test
