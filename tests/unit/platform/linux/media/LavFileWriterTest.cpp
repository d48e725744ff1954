#include "MovieFixture.h"
#include "platform/MediaErrors.h"
#include "platform/MediaSettings.h"

#include <array>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <limits>
#include <random>

namespace kelvo::test {
namespace {

/// One unit of the file's clock, and a little for how programs print it.
constexpr double kExact = 0.0002;

class LavFileWriterTest : public MovieFixture {
  protected:
    Status makeVideoOnly(const Size& size, const Dictionary& compression) {
        TestMovie::Options options;
        options.size = size;
        options.hasAudio1 = options.hasAudio2 = false;
        options.videoSettings = videoSettings(size, compression);
        return TestMovie(service, path, options).make(1);
    }
    static Dictionary property(std::string_view key, const Value& value) {
        return Dictionary{{std::string(key), value}};
    }
};

TEST_F(LavFileWriterTest, FinishedMovieIsOrdinaryAndDecodesWithoutComplaint) {
    TestMovie movie(service, path, {});
    EXPECT_EQ(movie.make(2), Status::completed);
    EXPECT_EQ(movie.writer()->outputURL(), URL::file(path));
    EXPECT_FALSE(movie.writer()->error());
    EXPECT_EQ(boxTypes(path), "ftyp mdat moov");
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_EQ(probeStream(path, "v:0", "codec_name,profile,width,height"), "h264,High,320,240");
    EXPECT_EQ(frameTimes(path, "v:0").size(), 60U);
    EXPECT_NEAR(std::atof(probeFormat(path, "duration").c_str()), 2, 0.05);
}

TEST_F(LavFileWriterTest, BothSoundTracksAreStereoAAC) {
    TestMovie(service, path, {}).make(2);
    for (const char* stream : {"a:0", "a:1"}) {
        EXPECT_EQ(probeStream(path, stream, "codec_name,profile,sample_rate,channels"), "aac,LC,44100,2");
        EXPECT_NEAR(std::atof(probeStream(path, stream, "bit_rate").c_str()), 128000, 64000);
    }
}

TEST_F(LavFileWriterTest, MovieWithSilentTracksDecodesWithoutComplaint) {
    TestMovie(service, path, {.hasAudio1 = false, .hasAudio2 = false}).make(1);
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_EQ(probeStream(path, "a:1", "codec_name"), "aac");
}

TEST_F(LavFileWriterTest, FramesKeepTheirTimes) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    const std::vector<double> times{0, 0.0101, 0.0299, 0.5, 0.5167, 1.9, 3.25, 3.2583};
    for (std::size_t i = 0; i < times.size(); ++i)
        movie.appendWhenReady(movie.video(),
                              testFrame({320, 240}, static_cast<std::int64_t>(i), movie.timeAt(times[i])));
    movie.finish();
    const std::vector<double> found = frameTimes(path, "v:0");
    ASSERT_EQ(found.size(), times.size());
    for (std::size_t i = 0; i < times.size(); ++i)
        EXPECT_NEAR(found[i], times[i], 0.001);
}

TEST_F(LavFileWriterTest, WhatLiesBeforeTheSessionIsNotInTheMovie) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(-0.5)));
    movie.appendWhenReady(movie.audio1(), testTone(movie.timeAt(-0.05), 4410));
    movie.recordUntil(0.5);
    movie.finish();
    EXPECT_NEAR(frameTimes(path, "v:0").at(0), 0, kExact);
    EXPECT_EQ(frameTimes(path, "v:0").size(), 15U);
    EXPECT_NEAR(frameTimes(path, "a:0").at(0), 0, kExact);
}

TEST_F(LavFileWriterTest, FirstFrameThatComesLateIsShownLate) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(0.75)));
    movie.appendWhenReady(movie.video(), testFrame({320, 240}, 1, movie.timeAt(1)));
    movie.finish();
    EXPECT_NEAR(frameTimes(path, "v:0").at(0), 0.75, kExact);
}

TEST_F(LavFileWriterTest, TransformIsTheTracksMatrix) {
    TestMovie(service, path, {.transform = {0, 1, -1, 0, 240, 0}}).make(0.5);
    EXPECT_EQ(rotation(path), -90);
    EXPECT_EQ(probeStream(path, "v:0", "width,height"), "320,240");
}

TEST_F(LavFileWriterTest, AbsurdTransformIsClipped) {
    const double infinity = std::numeric_limits<double>::infinity();
    const double none = std::numeric_limits<double>::quiet_NaN();
    TestMovie movie(service, path, {.transform = {none, infinity, -infinity, 1e300, 0, 0}});
    EXPECT_EQ(movie.make(0.2), Status::completed);
}

TEST_F(LavFileWriterTest, ColoursAreTaggedAndKept) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), plainFrame({320, 240}, 200, 40, 90, movie.timeAt(0)));
    movie.finish();
    EXPECT_EQ(probeStream(path, "v:0", "color_range,color_space,color_transfer,color_primaries"),
              "tv,smpte170m,smpte170m,smpte170m");
    const auto picture = decodedPicture(path, 0);
    const std::size_t middle = (120 * 320 + 160) * 3;
    EXPECT_NEAR(picture.at(middle), 200, 6);
    EXPECT_NEAR(picture.at(middle + 1), 40, 6);
    EXPECT_NEAR(picture.at(middle + 2), 90, 6);
}

TEST_F(LavFileWriterTest, FrameOfAnotherShapeIsScaledWithItsAspectKept) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), plainFrame({320, 240}, 255, 255, 255, movie.timeAt(0)));
    movie.appendWhenReady(movie.video(), plainFrame({240, 320}, 255, 255, 255, movie.timeAt(1)));
    movie.finish();
    const auto turned = decodedPicture(path, 1);
    const auto brightness = [&](std::size_t x, std::size_t y) { return turned.at((y * 320 + x) * 3); };
    EXPECT_GT(brightness(160, 120), 240);
    EXPECT_GT(brightness(160, 2), 240);  // 180 x 240 in the middle
    EXPECT_GT(brightness(76, 120), 240);
    EXPECT_LT(brightness(64, 120), 16);
    EXPECT_LT(brightness(256, 120), 16);
}

TEST_F(LavFileWriterTest, ExampleSizesAreEncodedAsTheyAre) {
    for (const Size& size : {Size{886, 1920}, Size{1126, 2436}}) {
        std::filesystem::remove(path);
        TestMovie::Options options{.size = size, .frameRate = 10};
        options.videoSettings = videoSettings(size, 5000000);
        EXPECT_EQ(TestMovie(service, path, options).make(0.5), Status::completed);
        EXPECT_EQ(decodingComplaints(path), "");
        EXPECT_EQ(probeStream(path, "v:0", "profile,width,height"),
                  "High," + std::to_string(static_cast<int>(size.width)) + "," +
                      std::to_string(static_cast<int>(size.height)));
    }
}

TEST_F(LavFileWriterTest, OddFrameIsNotScaledToItsEvenSize) {
    const Size odd{319, 239};
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), plainFrame(odd, 255, 255, 255, movie.timeAt(0)));
    movie.finish();
    const auto picture = decodedPicture(path, 0);
    EXPECT_GT(picture.at((120 * 320 + 316) * 3), 230);
    EXPECT_GT(picture.at((236 * 320 + 160) * 3), 230);
}

TEST_F(LavFileWriterTest, AverageBitRateIsMet) {
    TestMovie::Options options{.hasAudio1 = false, .hasAudio2 = false};
    options.videoSettings = videoSettings(options.size, 400000);
    TestMovie movie(service, path, options);
    ASSERT_TRUE(movie.start());
    std::minstd_rand random;  // the same noise in every run
    for (int i = 0; i < 120; ++i) {
        const SampleBufferRef frame = testFrame(options.size, i, movie.timeAt(i / 30.0));
        for (std::byte& byte : frame->surface()->writablePixels())
            byte ^= static_cast<std::byte>(random() & 0x3F);
        movie.appendWhenReady(movie.video(), frame);
    }
    movie.finish();
    EXPECT_NEAR(std::atof(probeStream(path, "v:0", "bit_rate").c_str()), 400000, 200000);
}

TEST_F(LavFileWriterTest, AbsurdBitRatesDoNotHurt) {
    const std::int64_t most = std::numeric_limits<std::int64_t>::max();
    for (const std::int64_t rate : {std::int64_t{0}, std::int64_t{1}, -most - 1, most}) {
        std::filesystem::remove(path);
        EXPECT_EQ(makeVideoOnly({320, 240}, property(kAverageBitRateKey, rate)), Status::completed);
        EXPECT_EQ(decodingComplaints(path), "");
    }
}

TEST_F(LavFileWriterTest, KeyFramesComeAtTheIntervalInFrames) {
    makeVideoOnly({320, 240}, property(kMaxKeyFrameIntervalKey, 10));
    const std::string flags = outputOf(
        "ffprobe -v error -select_streams v:0 -show_entries frame=key_frame "
        "-of csv=p=0 '" +
        path + "' | tr -d '\\n,'");
    EXPECT_EQ(flags, "100000000010000000001000000000");
}

TEST_F(LavFileWriterTest, KeyFramesComeAtTheIntervalInSeconds) {
    makeVideoOnly({320, 240}, property(kMaxKeyFrameIntervalDurationKey, 0.5));
    const std::string flags = outputOf(
        "ffprobe -v error -select_streams v:0 -show_entries frame=key_frame "
        "-of csv=p=0 '" +
        path + "' | tr -d '\\n,'");
    EXPECT_EQ(flags, "100000000000000100000000000000");
}

TEST_F(LavFileWriterTest, ProfilesAreHonoured) {
    makeVideoOnly({320, 240}, property(kProfileLevelKey, kProfileLevelH264Main));
    EXPECT_EQ(probeStream(path, "v:0", "profile"), "Main");
    std::filesystem::remove(path);
    makeVideoOnly({320, 240}, property(kProfileLevelKey, kProfileLevelH264Baseline));
    EXPECT_EQ(probeStream(path, "v:0", "profile"), "Constrained Baseline");
}

TEST_F(LavFileWriterTest, UnknownCompressionPropertyIsLoggedAndIgnored) {
    EXPECT_EQ(makeVideoOnly({320, 240}, property("Sharpness", 11)), Status::completed);
    EXPECT_EQ(log.count("ignoring unknown video compression property Sharpness"), 1U);
}

TEST_F(LavFileWriterTest, WronglyTypedCompressionPropertiesAreLoggedAndIgnored) {
    const Dictionary wrong{{std::string(kAverageBitRateKey), "fast"},
                           {std::string(kExpectedSourceFrameRateKey), -1},
                           {std::string(kMaxKeyFrameIntervalKey), 0},
                           {std::string(kMaxKeyFrameIntervalDurationKey), Array{}},
                           {std::string(kProfileLevelKey), 5}};
    EXPECT_EQ(makeVideoOnly({320, 240}, wrong), Status::completed);
    EXPECT_EQ(probeStream(path, "v:0", "profile"), "High");
    std::size_t ignored = 0;
    for (const std::string& text : log.texts())
        ignored += text.starts_with("ignoring video compression property ") ? 1 : 0;
    EXPECT_EQ(ignored, 5U);
}

TEST_F(LavFileWriterTest, SizesThatCannotBeEncodedFailTheStart) {
    const double none = std::numeric_limits<double>::quiet_NaN();
    for (const Size& size :
         {Size{0, 0}, Size{-2, 100}, Size{none, 100}, Size{1e300, 2}, Size{321, 240}, Size{16384, 16384}}) {
        EXPECT_EQ(makeVideoOnly(size, {}), Status::failed);
        EXPECT_FALSE(std::filesystem::exists(path));
    }
}

TEST_F(LavFileWriterTest, OtherCodecsFailTheStart) {
    TestMovie::Options options;
    options.videoSettings = videoSettings(options.size);
    options.videoSettings.set(kVideoCodecKey, "hvc1");
    TestMovie movie(service, path, options);
    EXPECT_FALSE(movie.start());
    EXPECT_EQ(movie.writer()->error()->code(), kMediaErrorUnsupportedFormat);
}

TEST_F(LavFileWriterTest, FileInTheWayFailsTheStartAndStays) {
    std::ofstream(path) << "precious";
    TestMovie movie(service, path, {});
    EXPECT_FALSE(movie.start());
    EXPECT_EQ(movie.writer()->status(), Status::failed);
    EXPECT_EQ(movie.writer()->error()->code(), EEXIST);
    EXPECT_EQ(std::filesystem::file_size(path), 8U);
}

TEST_F(LavFileWriterTest, MissingFolderFailsTheCreation) {
    const auto writer = service.createFileWriter(URL::file(inFolder("none/movie.mp4")), MediaFileType::mpeg4);
    ASSERT_FALSE(writer);
    EXPECT_EQ(writer.error().code(), ENOENT);
}

TEST_F(LavFileWriterTest, InputFallsBehindAndCatchesUp) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    std::vector<SampleBufferRef> frames;
    frames.reserve(60);
    for (int i = 0; i < 60; ++i)
        frames.push_back(testFrame({320, 240}, i, movie.timeAt(i / 60.0)));
    bool wasBusy = false;
    for (const SampleBufferRef& frame : frames) {
        movie.video().append(frame);
        wasBusy = wasBusy || !movie.video().isReadyForMoreMediaData();
    }
    EXPECT_TRUE(wasBusy);
    EXPECT_TRUE(movie.appendWhenReady(movie.video(), testFrame({320, 240}, 60, movie.timeAt(4))));
    movie.finish();
    EXPECT_EQ(frameTimes(path, "v:0").size(), 61U);
}

TEST_F(LavFileWriterTest, AppendedFrameIsTheScreensAgainAtOnce) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    const SampleBufferRef frame = testFrame({320, 240}, 0, movie.timeAt(0));
    const VideoSurfaceRef surface = frame->surface();
    const auto held = surface.use_count();
    for (int i = 0; i < 10; ++i) {
        TimingRecord timing;
        timing.presentationTime = MediaTime::make(movie.timeAt(i / 60.0), kSecond);
        movie.video().append(frame->copyWithTiming(std::array{timing}));
        EXPECT_EQ(surface.use_count(), held);
    }
    movie.finish();
    EXPECT_EQ(frameTimes(path, "v:0").size(), 10U);
}

TEST_F(LavFileWriterTest, FragmentsAreAtMostASecondLong) {
    {
        TestMovie movie(service, path, {.frameRate = 60});
        ASSERT_TRUE(movie.start());
        movie.recordUntil(4);
    }
    const std::string types = boxTypes(path);
    std::size_t fragments = 0;
    for (std::size_t at = types.find("moof"); at != std::string::npos; at = types.find("moof", at + 1))
        ++fragments;
    EXPECT_GE(fragments, 7U);
}

}  // namespace
}  // namespace kelvo::test
