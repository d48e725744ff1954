#include "MovieWriterFixture.h"
#include "platform/MediaErrors.h"

#include <atomic>

namespace kelvo::test {
namespace {

class KVMovieWriterFinishTest : public MovieWriterFixture {
  protected:
    using URLs = std::vector<std::optional<URL>>;
    const URLs kMovie{URL::file(kPath)};
    const URLs kNoMovie{std::nullopt};
};

TEST_F(KVMovieWriterFinishTest, FinishedMovieIsHandedOver) {
    startMovie();
    EXPECT_EQ(finish(), kMovie);
    EXPECT_EQ(fileWriter()->status(), MediaFileWriter::Status::completed);
    EXPECT_TRUE(log.contains("KVMovieWriter: finishWritingWithHandler: status = 1"));
    EXPECT_TRUE(writer->isFinishingWriting());
    EXPECT_FALSE(writer->didProcessFirstSample());
    EXPECT_FALSE(fileWriter()->sessionEnd().isValid());
}

TEST_F(KVMovieWriterFinishTest, FirstSampleFlagIsClearedOnlyAfterTheHandler) {
    startMovie();
    std::atomic<bool> wasSet = false;
    writer->finishWritingWithHandler([&](const auto&) { wasSet = writer->didProcessFirstSample(); });
    settle();
    EXPECT_TRUE(wasSet);
    EXPECT_FALSE(writer->didProcessFirstSample());
}

TEST_F(KVMovieWriterFinishTest, FinishWithoutAHandlerCompletesTheMovie) {
    startMovie();
    writer->finishWritingWithHandler(nullptr);
    settle();
    EXPECT_EQ(fileWriter()->status(), MediaFileWriter::Status::completed);
}

TEST_F(KVMovieWriterFinishTest, FinishingTwiceCallsOnlyTheFirstHandler) {
    startMovie();
    EXPECT_EQ(finish(), kMovie);
    EXPECT_EQ(finish(), URLs{});
}

TEST_F(KVMovieWriterFinishTest, FinishBeforeAnyVideoSampleHandsOverNoMovie) {
    start();
    EXPECT_EQ(finish(), kNoMovie);
    EXPECT_TRUE(log.contains(
        "KVMovieWriter: finishWritingWithHandler: first sample buffer was not processed or appended"));
    EXPECT_TRUE(log.contains("KVMovieWriter: finishWritingWithHandler: status = 0"));
}

TEST_F(KVMovieWriterFinishTest, FinishWithoutASetupHandsOverNoMovie) {
    EXPECT_EQ(finish(), kNoMovie);
    EXPECT_TRUE(log.contains("KVMovieWriter: finishWritingWithHandler: status = 0"));
}

TEST_F(KVMovieWriterFinishTest, FinishBeforeAnyVideoSampleNeedsNoHandler) {
    writer->finishWritingWithHandler(nullptr);
    settle();
    EXPECT_TRUE(writer->isFinishingWriting());
}

TEST_F(KVMovieWriterFinishTest, FinishOfAFailedMovieHandsOverTheWritersURL) {
    startMovie();
    fileWriter()->fail(KVError::posix(ENOSPC, "volume"));
    EXPECT_EQ(finish(), kMovie);
    EXPECT_TRUE(log.contains("KVMovieWriter: finishWritingWithHandler: status = 3"));
    EXPECT_EQ(
        log.count(LogLevel::info, "not writing, returning video url set on assetwriter (most likely nil)"),
        1U);
    EXPECT_EQ(log.count(LogLevel::error, "asset writer error = 28"), 1U);
    EXPECT_FALSE(writer->didProcessFirstSample());
}

TEST_F(KVMovieWriterFinishTest, FinishOfAFailedMovieNeedsNoHandler) {
    startMovie();
    fileWriter()->fail(KVError::posix(ENOSPC, "volume"));
    writer->finishWritingWithHandler(nullptr);
    settle();
    EXPECT_FALSE(writer->didProcessFirstSample());
}

TEST_F(KVMovieWriterFinishTest, FinishWhenTheWriterIsLostHandsOverNoMovie) {
    startMovie();
    device.failNext("MediaService.createFileWriter", ENOENT);
    writer->setupAssetWriter();
    EXPECT_EQ(finish(), kNoMovie);
    EXPECT_FALSE(log.contains("not writing, returning video url set on assetwriter (most likely nil)"));
    EXPECT_FALSE(writer->didProcessFirstSample());
}

TEST_F(KVMovieWriterFinishTest, PendingSamplesAreDroppedNotWritten) {
    startMovie();
    for (const auto& each : {video(), audio1(), audio2()})
        each->setBusy(true);
    appendVideo(200);
    appendAudio1(200);
    appendAudio2(200);
    finish();
    EXPECT_EQ(video()->presentationValues(), Values{100});
    EXPECT_TRUE(audio1()->samples().empty());
    EXPECT_TRUE(writer->videoBufferQueue()->isEmpty());
    EXPECT_TRUE(writer->audioBufferQueue1()->isEmpty());
    EXPECT_TRUE(writer->audioBufferQueue2()->isEmpty());
}

TEST_F(KVMovieWriterFinishTest, VideoAfterFinishingBeganIsRefused) {
    startMovie();
    finish();
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(200), {}));
    EXPECT_EQ(video()->presentationValues(), Values{100});
    EXPECT_EQ(device.media->writers().size(), 1U);
}

TEST_F(KVMovieWriterFinishTest, StopMarkEndsTheMovieAtTheLastFrameBeforeIt) {
    startMovie();
    appendVideo(200);
    writer->notifyRecordingMayBeStopped();
    EXPECT_EQ(writer->trimVideoPresentationTime(), MediaTime::make(200, kNanoseconds));
    appendVideo(300);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200, 300}));
    finish();
    EXPECT_EQ(fileWriter()->sessionEnd(), MediaTime::make(200, kNanoseconds));
    EXPECT_FALSE(writer->trimVideoPresentationTime().isValid());
}

TEST_F(KVMovieWriterFinishTest, ResumedRecordingKeepsWhatCameAfterTheMark) {
    startMovie();
    appendVideo(200);
    writer->notifyRecordingMayBeStopped();
    writer->notifyRecordingResumed();
    EXPECT_FALSE(writer->trimVideoPresentationTime().isValid());
    appendVideo(300);
    finish();
    EXPECT_FALSE(fileWriter()->sessionEnd().isValid());
}

TEST_F(KVMovieWriterFinishTest, FileIsToldWhenTheCaptureEnded) {
    startMovie();
    writer->captureEnded(MediaTime::make(700, kNanoseconds));
    finish();
    EXPECT_EQ(fileWriter()->captureEnd(), MediaTime::make(700, kNanoseconds));
    EXPECT_FALSE(fileWriter()->sessionEnd().isValid());
}

TEST_F(KVMovieWriterFinishTest, StopMarkBeforeASecondFrameMarksNothing) {
    startMovie();
    writer->notifyRecordingMayBeStopped();
    finish();
    EXPECT_FALSE(fileWriter()->sessionEnd().isValid());
}

class KVMovieWriterTrimTest : public MovieWriterFixture {
  protected:
    void SetUp() override {
        device.media->addMovie(kSource, {MediaTime::make(10500, 1000), {MediaType::video}});
    }

    void trim(double startClip, double endClip, const URL& source) {
        writer->trimMovieWithURL(source, startClip, endClip, kTrimmed, [this](const auto& url) {
            results.with([&](auto& all) { all.push_back(url); });
        });
        settle();
    }
    std::shared_ptr<SimulatedExportSession> session() const { return device.media->exportSessions().back(); }

    const URL kSource = URL::file("/movies/source.mp4");
    const URL kTrimmed = URL::file("/movies/trimmed.mp4");
    Guarded<std::vector<std::optional<URL>>> results;
};

TEST_F(KVMovieWriterTrimTest, TrimmedMovieIsHandedOver) {
    trim(2, 3, kSource);
    EXPECT_EQ(results.copy(), std::vector<std::optional<URL>>{kTrimmed});
    EXPECT_EQ(session()->preset(), ExportPreset::passThrough);
    EXPECT_FALSE(session()->audioMix());
    EXPECT_EQ(session()->timeRange()->start, MediaTime::make(2, 1));
    EXPECT_EQ(session()->timeRange()->duration, MediaTime::make(5500, 1000));
    EXPECT_EQ(log.count(LogLevel::info, "KVMovieWriter: Export Trim succeeded"), 1U);
}

TEST_F(KVMovieWriterTrimTest, DurationsAreRoundedToWholeSeconds) {
    trim(1.6, 0.4, kSource);
    EXPECT_EQ(session()->timeRange()->start, MediaTime::make(2, 1));
    EXPECT_EQ(session()->timeRange()->duration, MediaTime::make(8500, 1000));
}

TEST_F(KVMovieWriterTrimTest, WhatStandsAtTheDestinationIsRemoved) {
    device.fileSystem->addFile(kTrimmed.path(), 7);
    trim(1, 1, kSource);
    EXPECT_EQ(results.copy().size(), 1U);
}

TEST_F(KVMovieWriterTrimTest, FailureToRemoveTheDestinationIsLeftToTheExport) {
    device.fileSystem->addFile(kTrimmed.path(), 7);
    device.failNext("FileSystem.removeItem", EACCES);
    trim(1, 1, kSource);
    EXPECT_TRUE(results.copy().empty());
    EXPECT_EQ(log.count(LogLevel::info, "KVMovieWriter: Export Trim Video Failed, due to error: 17"), 1U);
}

TEST_F(KVMovieWriterTrimTest, CuttingMoreThanThereIsHandsANegativeDurationOver) {
    trim(6, 6, kSource);
    EXPECT_EQ(session()->timeRange()->duration, MediaTime::make(-1500, 1000));
    EXPECT_TRUE(results.copy().empty());
    EXPECT_TRUE(log.contains("KVMovieWriter: Export Trim Video Failed, due to error: 3"));
}

TEST_F(KVMovieWriterTrimTest, MovieThatCannotBeOpenedCountsAsEmpty) {
    trim(2, 3, URL::file("/movies/none.mp4"));
    EXPECT_EQ(session()->timeRange()->start, MediaTime::make(2, 1));
    EXPECT_EQ(session()->timeRange()->duration, MediaTime::make(-5, 1));
    EXPECT_TRUE(results.copy().empty());
    EXPECT_TRUE(log.contains("KVMovieWriter: Export Trim Video Failed, due to error: 1"));
}

TEST_F(KVMovieWriterTrimTest, CancelledTrimCallsNobody) {
    device.media->holdExports(true);
    trim(1, 1, kSource);
    session()->cancelExport();
    settle();
    EXPECT_TRUE(results.copy().empty());
    EXPECT_EQ(log.count(LogLevel::info, "KVMovieWriter: Export Trim Video Cancelled"), 1U);
}

TEST_F(KVMovieWriterTrimTest, TrimNeedsNoHandler) {
    writer->trimMovieWithURL(kSource, 1, 1, kTrimmed, nullptr);
    settle();
    EXPECT_TRUE(log.contains("KVMovieWriter: Export Trim succeeded"));
    EXPECT_TRUE(device.fileSystem->itemExists(kTrimmed.path()));
}

}  // namespace
}  // namespace kelvo::test
