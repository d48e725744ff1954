#pragma once

#include "platform/MediaErrors.h"
#include "platform/MediaService.h"
#include "support/media/TestMovie.h"

#include <future>
#include <optional>

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every media service does. `World` supplies one, and a folder of the device that is there:
///
///     struct World {
///         MediaService& media();
///         std::string path(const std::string& name);  // in that folder
///         bool fileExists(const std::string& path);
///     };
template <typename World>
class MediaContract : public testing::Test {
  protected:
    using Status = MediaFileWriter::Status;
    using Outcome = ExportSession::Status;

    MediaService& media() { return world.media(); }
    TestMovie movie() { return {media(), path, {}}; }
    void makeMovie() { ASSERT_EQ(movie().make(1), Status::completed); }

    std::shared_ptr<ExportSession> session(ExportPreset preset) {
        const auto made = media().createExportSession(media().openAsset(URL::file(path)), preset);
        made->setOutputURL(URL::file(output));
        made->setOutputFileType(MediaFileType::mpeg4);
        return made;
    }
    static Outcome run(const std::shared_ptr<ExportSession>& session) {
        std::promise<void> done;
        session->exportAsynchronously([&] { done.set_value(); });
        done.get_future().wait();
        return session->status();
    }

    World world;
    const std::string path = world.path("movie.mp4");
    const std::string output = world.path("output.mp4");
};

TYPED_TEST_SUITE_P(MediaContract);

TYPED_TEST_P(MediaContract, BufferQueueKeepsTheOrderOfArrival) {
    const auto queue = this->media().createBufferQueue();
    EXPECT_TRUE(queue->isEmpty());
    EXPECT_EQ(queue->dequeue(), nullptr);
    const auto later = testTone(2 * kSecond, 10);
    const auto earlier = testTone(kSecond, 10);
    EXPECT_EQ(queue->enqueue(later), 0);
    EXPECT_EQ(queue->enqueue(earlier), 0);
    EXPECT_FALSE(queue->isEmpty());
    EXPECT_EQ(queue->dequeue(), later);
    EXPECT_EQ(queue->dequeue(), earlier);
    EXPECT_TRUE(queue->isEmpty());
}

TYPED_TEST_P(MediaContract, ResetEmptiesTheBufferQueue) {
    const auto queue = this->media().createBufferQueue();
    queue->enqueue(testTone(0, 10));
    queue->reset();
    EXPECT_TRUE(queue->isEmpty());
    EXPECT_EQ(queue->dequeue(), nullptr);
}

TYPED_TEST_P(MediaContract, InputRemembersHowItWasMade) {
    const auto input = this->media().createWriterInput(MediaType::audio, audioSettings());
    EXPECT_EQ(input->mediaType(), MediaType::audio);
    EXPECT_EQ(input->outputSettings(), audioSettings());
    EXPECT_FALSE(input->expectsMediaDataInRealTime());
    input->setExpectsMediaDataInRealTime(true);
    EXPECT_TRUE(input->expectsMediaDataInRealTime());
    EXPECT_EQ(input->transform(), AffineTransform());
    input->setTransform({0, 1, -1, 0, 5, 6});
    EXPECT_EQ(input->transform(), (AffineTransform{0, 1, -1, 0, 5, 6}));
    EXPECT_FALSE(input->isReadyForMoreMediaData());
}

TYPED_TEST_P(MediaContract, WriterNeedsAFile) {
    EXPECT_FALSE(this->media().createFileWriter(URL("https://example.com/movie.mp4"), MediaFileType::mpeg4));
}

TYPED_TEST_P(MediaContract, WriterGoesFromUnknownToWritingToCompleted) {
    TestMovie movie = this->movie();
    EXPECT_EQ(movie.writer()->status(), TestFixture::Status::unknown);
    EXPECT_EQ(movie.writer()->outputURL(), URL::file(this->path));
    EXPECT_TRUE(movie.start());
    EXPECT_EQ(movie.writer()->status(), TestFixture::Status::writing);
    EXPECT_TRUE(this->world.fileExists(this->path));
    movie.recordUntil(0.2);
    EXPECT_EQ(movie.finish(), TestFixture::Status::completed);
    EXPECT_FALSE(movie.writer()->error());
    EXPECT_TRUE(this->world.fileExists(this->path));
}

TYPED_TEST_P(MediaContract, WriterStartsOnce) {
    TestMovie movie = this->movie();
    EXPECT_TRUE(movie.start());
    EXPECT_FALSE(movie.writer()->startWriting());
    EXPECT_EQ(movie.writer()->status(), TestFixture::Status::writing);
}

TYPED_TEST_P(MediaContract, WriterDoesNotOverwrite) {
    this->makeMovie();
    TestMovie second = this->movie();
    EXPECT_FALSE(second.start());
    EXPECT_EQ(second.writer()->status(), TestFixture::Status::failed);
    EXPECT_EQ(second.writer()->error()->code(), EEXIST);
}

TYPED_TEST_P(MediaContract, InputTakesSamplesOnlyWithinTheSession) {
    TestMovie movie = this->movie();
    const auto frame = [&](double time) { return testFrame({320, 240}, 0, movie.timeAt(time)); };
    EXPECT_FALSE(movie.video().append(frame(0)));
    ASSERT_TRUE(movie.writer()->startWriting());
    EXPECT_FALSE(movie.video().append(frame(0)));
    movie.writer()->startSession(MediaTime::make(movie.timeAt(0), 1000000000));
    EXPECT_TRUE(movie.video().isReadyForMoreMediaData());
    EXPECT_TRUE(movie.video().append(frame(0)));
    EXPECT_FALSE(movie.video().append(testTone(movie.timeAt(0), 100)));
    movie.finish();
    EXPECT_FALSE(movie.video().isReadyForMoreMediaData());
    EXPECT_FALSE(movie.video().append(frame(1)));
}

TYPED_TEST_P(MediaContract, FinishedMovieOpensAsAnAsset) {
    this->makeMovie();
    const auto asset = this->media().openAsset(URL::file(this->path));
    ASSERT_TRUE(asset);
    EXPECT_NEAR(asset->duration().seconds(), 1, 0.1);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::video).size(), 1U);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::audio).size(), 2U);
}

TYPED_TEST_P(MediaContract, EndedSessionEndsTheMovie) {
    TestMovie movie = this->movie();
    ASSERT_TRUE(movie.start());
    movie.recordUntil(1);
    movie.writer()->endSession(MediaTime::make(movie.timeAt(0.5), 1000000000));
    movie.finish();
    EXPECT_NEAR(this->media().openAsset(URL::file(this->path))->duration().seconds(), 0.5, 0.001);
}

TYPED_TEST_P(MediaContract, SoundOfWhatTheFramesSkipIsNotInTheMovie) {
    TestMovie movie = this->movie();
    ASSERT_TRUE(movie.start());
    // Two stretches of half a second, four seconds apart, that follow one another in the frames' times.
    for (int i = 0; i <= 30; ++i) {
        const double presented = (i <= 15 ? i : i - 1) / 30.0;
        const double captured = i <= 15 ? presented : presented + 4;
        const MediaTime captureTime = MediaTime::make(movie.timeAt(captured), 1000000000);
        movie.writer()->relateTimes(captureTime, MediaTime::make(movie.timeAt(presented), 1000000000));
        const auto frame = testFrame({320, 240}, i, movie.timeAt(presented));
        if (i != 16) movie.appendWhenReady(movie.video(), frame);
        movie.appendWhenReady(movie.audio1(), testTone(movie.timeAt(captured), 1470));
        movie.appendWhenReady(movie.audio2(), testTone(movie.timeAt(captured), 1470));
    }
    EXPECT_EQ(movie.finish(), TestFixture::Status::completed);
    EXPECT_NEAR(this->media().openAsset(URL::file(this->path))->duration().seconds(), 1, 0.1);
}

TYPED_TEST_P(MediaContract, TimesThatAreNotValidRelateNothing) {
    TestMovie movie = this->movie();
    ASSERT_TRUE(movie.start());
    movie.writer()->relateTimes(MediaTime::invalid(), MediaTime::make(1, 1));
    movie.writer()->relateTimes(MediaTime::make(1, 1), MediaTime::invalid());
    movie.recordUntil(0.5);
    EXPECT_EQ(movie.finish(), TestFixture::Status::completed);
    EXPECT_NEAR(this->media().openAsset(URL::file(this->path))->duration().seconds(), 0.5, 0.1);
}

TYPED_TEST_P(MediaContract, MissingMovieIsNoAsset) {
    EXPECT_EQ(this->media().openAsset(URL::file(this->path)), nullptr);
    EXPECT_EQ(this->media().openAsset(URL("https://example.com/movie.mp4")), nullptr);
}

TYPED_TEST_P(MediaContract, ExportWithoutAnAssetFails) {
    const auto session = this->session(ExportPreset::highestQuality);
    EXPECT_EQ(session->status(), TestFixture::Outcome::unknown);
    EXPECT_EQ(this->run(session), TestFixture::Outcome::failed);
    EXPECT_EQ(session->error()->code(), kMediaErrorUnreadableMovie);
    EXPECT_FALSE(this->world.fileExists(this->output));
}

TYPED_TEST_P(MediaContract, ExportOfANegativeDurationFails) {
    this->makeMovie();
    const auto session = this->session(ExportPreset::passThrough);
    session->setTimeRange({MediaTime::make(2, 1), MediaTime::make(-3, 1)});
    EXPECT_EQ(this->run(session), TestFixture::Outcome::failed);
    EXPECT_EQ(session->error()->code(), kMediaErrorInvalidRange);
    EXPECT_FALSE(this->world.fileExists(this->output));
}

TYPED_TEST_P(MediaContract, ExportDoesNotOverwrite) {
    this->makeMovie();
    EXPECT_EQ(this->run(this->session(ExportPreset::passThrough)), TestFixture::Outcome::completed);
    const auto again = this->session(ExportPreset::passThrough);
    EXPECT_EQ(this->run(again), TestFixture::Outcome::failed);
    EXPECT_EQ(again->error()->code(), EEXIST);
    EXPECT_TRUE(this->world.fileExists(this->output));
}

TYPED_TEST_P(MediaContract, PassThroughKeepsAllTracksOfTheRange) {
    this->makeMovie();
    const auto session = this->session(ExportPreset::passThrough);
    session->setTimeRange({MediaTime::zero(), MediaTime::make(1, 2)});
    EXPECT_EQ(this->run(session), TestFixture::Outcome::completed);
    EXPECT_EQ(session->progress(), 1);
    EXPECT_EQ(session->outputURL(), URL::file(this->output));
    const auto asset = this->media().openAsset(URL::file(this->output));
    ASSERT_TRUE(asset);
    EXPECT_NEAR(asset->duration().seconds(), 0.5, 0.001);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::audio).size(), 2U);
}

TYPED_TEST_P(MediaContract, MixHasOneAudioTrack) {
    this->makeMovie();
    EXPECT_EQ(this->run(this->session(ExportPreset::highestQuality)), TestFixture::Outcome::completed);
    const auto asset = this->media().openAsset(URL::file(this->output));
    ASSERT_TRUE(asset);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::video).size(), 1U);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::audio).size(), 1U);
}

REGISTER_TYPED_TEST_SUITE_P(MediaContract, BufferQueueKeepsTheOrderOfArrival, ResetEmptiesTheBufferQueue,
                            InputRemembersHowItWasMade, WriterNeedsAFile,
                            WriterGoesFromUnknownToWritingToCompleted, WriterStartsOnce,
                            WriterDoesNotOverwrite, InputTakesSamplesOnlyWithinTheSession,
                            FinishedMovieOpensAsAnAsset, EndedSessionEndsTheMovie,
                            SoundOfWhatTheFramesSkipIsNotInTheMovie, TimesThatAreNotValidRelateNothing,
                            MissingMovieIsNoAsset, ExportWithoutAnAssetFails, ExportOfANegativeDurationFails,
                            ExportDoesNotOverwrite, PassThroughKeepsAllTracksOfTheRange, MixHasOneAudioTrack);

}  // namespace kelvo::test
