#include "MovieWriterFixture.h"
#include "platform/MediaErrors.h"

namespace kelvo::test {
namespace {

class KVMovieWriterAppendTest : public MovieWriterFixture {
  protected:
    static constexpr const char* kStartError = "ERROR starting asset writer";
    static constexpr const char* kVideoDiscard =
        "discarding video sample buffer due to timestamp earlier than previous";

    void failFileWriter() { fileWriter()->fail(mediaError(kMediaErrorEncodingFailed, "test")); }
};

TEST_F(KVMovieWriterAppendTest, FirstVideoSampleBeginsTheTimeline) {
    start();
    const AffineTransform turned{0, 1, -1, 0, 1080, 0};
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(100), turned));
    EXPECT_EQ(fileWriter()->status(), MediaFileWriter::Status::writing);
    EXPECT_EQ(fileWriter()->sessionStart(), MediaTime::make(100, kNanoseconds));
    EXPECT_EQ(video()->transform(), turned);
    EXPECT_EQ(video()->presentationValues(), Values{100});
    EXPECT_TRUE(writer->didProcessFirstSample());
    EXPECT_FALSE(writer->lastVideoPresentationTime().isValid());
}

TEST_F(KVMovieWriterAppendTest, FirstSampleIsDroppedWhenWritingCannotStart) {
    start();
    device.failNext("MediaFileWriter.startWriting", ENOSPC);
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(100), {}));
    EXPECT_EQ(log.count(kStartError), 1U);
    EXPECT_FALSE(writer->didProcessFirstSample());
    EXPECT_FALSE(fileWriter()->sessionStart().isValid());
}

TEST_F(KVMovieWriterAppendTest, FirstSampleWithoutATimeIsDroppedAndTheNextCannotStartAgain) {
    start();
    EXPECT_TRUE(writer->appendInitialSampleBuffer(videoSample(TimingRecord{}), {}));
    EXPECT_FALSE(fileWriter()->sessionStart().isValid());
    EXPECT_FALSE(writer->didProcessFirstSample());
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(100), {}));
    EXPECT_EQ(log.count(kStartError), 1U);
    EXPECT_TRUE(video()->samples().empty());
}

TEST_F(KVMovieWriterAppendTest, FirstSampleIsDroppedWhileTheInputIsBusy) {
    start();
    video()->setBusy(true);
    EXPECT_TRUE(writer->appendInitialSampleBuffer(videoSample(100), {}));
    EXPECT_TRUE(fileWriter()->sessionStart().isValid());
    EXPECT_FALSE(writer->didProcessFirstSample());
    EXPECT_TRUE(video()->samples().empty());
}

TEST_F(KVMovieWriterAppendTest, VideoSamplesAreAppendedInOrder) {
    startMovie();
    appendVideo(200);
    appendVideo(300);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200, 300}));
    EXPECT_EQ(writer->lastVideoPresentationTime(), MediaTime::make(300, kNanoseconds));
    EXPECT_EQ(log.count(LogLevel::sample, "appending video sample"), 2U);
}

TEST_F(KVMovieWriterAppendTest, EveryFrameTellsWhenItWasCapturedAndWhenItIsPresented) {
    start();
    const auto append = [&](std::int64_t captured, std::int64_t presented) {
        const TimingRecord rebased = timingAt(presented);
        writer->appendVideoSampleBuffer(videoSample(captured)->copyWithTiming(std::span(&rebased, 1)), {});
    };
    append(150, 100);
    append(250, 200);
    append(900, 200);  // the first one after a pause, which is discarded
    EXPECT_EQ(log.count(kVideoDiscard), 1U);
    const auto stretches = fileWriter()->timeline().stretches();
    ASSERT_EQ(stretches.size(), 2U);
    EXPECT_EQ(stretches[0].firstFrame.value, 150);
    EXPECT_EQ(stretches[0].lastFrame.value, 250);
    EXPECT_EQ(stretches[0].shift.value, 50);
    EXPECT_EQ(stretches[1].firstFrame.value, 900);
    EXPECT_EQ(stretches[1].shift.value, 700);
}

TEST_F(KVMovieWriterAppendTest, SamplesAreHeldBackWhileTheInputIsBusy) {
    startMovie();
    video()->setBusy(true);
    appendVideo(200);
    appendVideo(300);
    EXPECT_EQ(video()->presentationValues(), Values{100});
    video()->setBusy(false);
    appendVideo(400);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200, 300, 400}));
    EXPECT_TRUE(writer->videoBufferQueue()->isEmpty());
}

TEST_F(KVMovieWriterAppendTest, DrainingStopsWhenTheInputTurnsBusy) {
    startMovie();
    video()->setBusy(true);
    appendVideo(200);
    appendVideo(300);
    video()->setBusy(false);
    video()->setReadyCount(2);
    appendVideo(400);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200, 300}));
    EXPECT_FALSE(writer->videoBufferQueue()->isEmpty());
}

TEST_F(KVMovieWriterAppendTest, VideoSampleWithAnEqualTimeIsDiscardedAndTheRestWaits) {
    startMovie();
    appendVideo(200);
    video()->setBusy(true);
    appendVideo(200);
    appendVideo(300);
    video()->setBusy(false);
    appendVideo(400);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200}));
    EXPECT_EQ(log.count(kVideoDiscard), 1U);
    appendVideo(500);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200, 300, 400, 500}));
}

TEST_F(KVMovieWriterAppendTest, VideoSampleThatGoesBackwardsIsDiscarded) {
    startMovie();
    appendVideo(200);
    appendVideo(150);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200}));
    EXPECT_EQ(log.count(kVideoDiscard), 1U);
    EXPECT_EQ(writer->lastVideoPresentationTime().value, 200);
}

TEST_F(KVMovieWriterAppendTest, FirstSampleDoesNotTakePartInTheComparison) {
    startMovie();
    appendVideo(50);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 50}));
}

TEST_F(KVMovieWriterAppendTest, TimesAreComparedByTheirRawValues) {
    startMovie();
    appendVideo(200);
    TimingRecord later;
    later.presentationTime = MediaTime::make(150, 1);  // far later, but a smaller value
    writer->appendVideoSampleBuffer(videoSample(later), {});
    EXPECT_EQ(video()->presentationValues(), (Values{100, 200}));
}

TEST_F(KVMovieWriterAppendTest, MissingVideoSampleDoesNothing) {
    startMovie();
    EXPECT_TRUE(writer->appendVideoSampleBuffer(nullptr, {}));
    EXPECT_EQ(video()->samples().size(), 1U);
}

TEST_F(KVMovieWriterAppendTest, VideoBeforeTheSetupDoesNothing) {
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(100), {}));
    EXPECT_TRUE(log.lines().empty());
}

TEST_F(KVMovieWriterAppendTest, VideoThatCannotBeEnqueuedIsDropped) {
    startMovie();
    device.failNext("BufferQueue.enqueue", ENOMEM);
    appendVideo(200);
    EXPECT_EQ(log.count(LogLevel::info, "ERROR Enqueing the Sample Video Buffer"), 1U);
    appendVideo(300);
    EXPECT_EQ(video()->presentationValues(), (Values{100, 300}));
}

TEST_F(KVMovieWriterAppendTest, FailedMovieIsRemovedAndBegunAgainFromTheNextFrame) {
    startMovie();
    appendVideo(200);
    failFileWriter();
    ASSERT_TRUE(device.fileSystem->itemExists(kPath));
    const AffineTransform mirrored{-1, 0, 0, 1, 1080, 0};
    EXPECT_TRUE(writer->appendVideoSampleBuffer(videoSample(300), mirrored));
    settle();
    ASSERT_EQ(device.media->writers().size(), 2U);
    EXPECT_EQ(fileWriter()->status(), MediaFileWriter::Status::writing);
    EXPECT_EQ(fileWriter()->sessionStart(), MediaTime::make(300, kNanoseconds));
    EXPECT_EQ(video()->presentationValues(), Values{300});
    EXPECT_EQ(video()->transform(), mirrored);
    appendVideo(400);
    EXPECT_EQ(video()->presentationValues(), (Values{300, 400}));
}

TEST_F(KVMovieWriterAppendTest, RestartGoesOnWhenTheFailedMovieCannotBeRemoved) {
    startMovie();
    failFileWriter();
    device.failNext("FileSystem.removeItem", EACCES);
    appendVideo(300);
    settle();
    EXPECT_EQ(device.media->writers().size(), 2U);
    EXPECT_EQ(log.count(kStartError), 1U);  // the old file stands in the way
}

TEST_F(KVMovieWriterAppendTest, AudioOfAFailedMovieIsDropped) {
    startMovie();
    failFileWriter();
    appendAudio1(300);
    appendAudio2(300);
    settle();
    EXPECT_EQ(device.media->writers().size(), 1U);
    EXPECT_TRUE(writer->audioBufferQueue1()->isEmpty());
    EXPECT_TRUE(writer->audioBufferQueue2()->isEmpty());
}

/// The two audio paths, which differ in their input, queue and texts.
struct AudioPath {
    int number;
    void (KVMovieWriter::*append)(const SampleBufferRef&);
    const std::shared_ptr<BufferQueue>& (KVMovieWriter::*queue)() const;
    MediaTime (KVMovieWriter::*lastTime)() const;
};

class KVMovieWriterAudioTest : public MovieWriterFixture, public ::testing::WithParamInterface<AudioPath> {
  protected:
    void appendAudio(std::int64_t value) { ((*writer).*GetParam().append)(audioSample(value)); }
    std::shared_ptr<SimulatedWriterInput> audio() const {
        return input(static_cast<std::size_t>(GetParam().number));
    }
    BufferQueue& queue() const { return *((*writer).*GetParam().queue)(); }
    MediaTime lastTime() const { return ((*writer).*GetParam().lastTime)(); }
    std::string numbered(const std::string& before, const std::string& after) const {
        return before + std::to_string(GetParam().number) + after;
    }
};

TEST_P(KVMovieWriterAudioTest, AudioBeforeTheFirstVideoSampleIsDroppedNotHeld) {
    start();
    appendAudio(50);
    EXPECT_TRUE(queue().isEmpty());
    appendVideo(100);
    appendAudio(110);
    EXPECT_EQ(audio()->presentationValues(), Values{110});
}

TEST_P(KVMovieWriterAudioTest, AudioIsAppendedToItsOwnInput) {
    startMovie();
    appendAudio(110);
    EXPECT_EQ(audio()->presentationValues(), Values{110});
    EXPECT_EQ(audio1()->samples().size() + audio2()->samples().size(), 1U);
    EXPECT_EQ(lastTime(), MediaTime::make(110, kNanoseconds));
    EXPECT_EQ(
        log.count(LogLevel::sample, numbered("appending audio ", " sample with timestamp:110 duration:10")),
        1U);
}

TEST_P(KVMovieWriterAudioTest, AudioIsHeldBackWhileTheInputIsBusy) {
    startMovie();
    audio()->setBusy(true);
    appendAudio(110);
    EXPECT_FALSE(queue().isEmpty());
    audio()->setBusy(false);
    appendAudio(120);
    EXPECT_EQ(audio()->presentationValues(), (Values{110, 120}));
}

TEST_P(KVMovieWriterAudioTest, AudioWithAnEqualTimeIsDiscardedAndTheRestWaits) {
    startMovie();
    appendAudio(110);
    audio()->setBusy(true);
    appendAudio(110);
    appendAudio(120);
    audio()->setBusy(false);
    appendAudio(130);
    EXPECT_EQ(audio()->presentationValues(), Values{110});
    EXPECT_EQ(
        log.count(numbered("discarding audio ", " sample buffer due to timestamp earlier than previous")),
        1U);
    appendAudio(140);
    EXPECT_EQ(audio()->presentationValues(), (Values{110, 120, 130, 140}));
}

TEST_P(KVMovieWriterAudioTest, AudioThatCannotBeEnqueuedIsDropped) {
    startMovie();
    device.failNext("BufferQueue.enqueue", ENOMEM);
    appendAudio(110);
    EXPECT_EQ(log.count(LogLevel::info, "ERROR Enqueing the Sample Audio Buffer"), 1U);
    EXPECT_TRUE(audio()->samples().empty());
}

TEST_P(KVMovieWriterAudioTest, MissingAudioSampleDoesNothing) {
    startMovie();
    ((*writer).*GetParam().append)(nullptr);
    EXPECT_TRUE(audio()->samples().empty());
}

TEST_P(KVMovieWriterAudioTest, AudioAfterFinishingBeganIsRefused) {
    startMovie();
    finish();
    appendAudio(200);
    EXPECT_TRUE(audio()->samples().empty());
    EXPECT_TRUE(queue().isEmpty());
}

INSTANTIATE_TEST_SUITE_P(BothPaths, KVMovieWriterAudioTest,
                         ::testing::Values(AudioPath{1, &KVMovieWriter::appendAudio1SampleBuffer,
                                                     &KVMovieWriter::audioBufferQueue1,
                                                     &KVMovieWriter::lastAudio1PresentationTime},
                                           AudioPath{2, &KVMovieWriter::appendAudio2SampleBuffer,
                                                     &KVMovieWriter::audioBufferQueue2,
                                                     &KVMovieWriter::lastAudio2PresentationTime}),
                         [](const auto& path) { return "Audio" + std::to_string(path.param.number); });

}  // namespace
}  // namespace kelvo::test
