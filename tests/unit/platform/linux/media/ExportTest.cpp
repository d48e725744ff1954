#include "MovieFixture.h"
#include "platform/MediaErrors.h"

#include <chrono>
#include <cmath>
#include <filesystem>
#include <fstream>
#include <future>
#include <numeric>
#include <thread>

namespace kelvo::test {
namespace {

class ExportTest : public MovieFixture {
  protected:
    using Outcome = ExportSession::Status;

    void makeSource(double seconds, TestMovie::Options options = {}) {
        ASSERT_EQ(TestMovie(service, path, std::move(options)).make(seconds), Status::completed);
    }

    std::shared_ptr<ExportSession> session(ExportPreset preset, const std::string& source) {
        const auto made = service.createExportSession(service.openAsset(URL::file(source)), preset);
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
    Outcome trim(double start, double duration) {
        const auto made = session(ExportPreset::passThrough, path);
        made->setTimeRange({MediaTime::fromSeconds(start, 1000), MediaTime::fromSeconds(duration, 1000)});
        lastSession = made;
        return run(made);
    }
    Outcome mix() {
        lastSession = session(ExportPreset::highestQuality, path);
        return run(lastSession);
    }

    const std::string output = inFolder("output.mp4");
    std::shared_ptr<ExportSession> lastSession;
};

TEST_F(ExportTest, AssetTellsItsDurationAndTracks) {
    makeSource(1.5);
    const auto asset = service.openAsset(URL::file(path));
    ASSERT_TRUE(asset);
    EXPECT_NEAR(asset->duration().seconds(), 1.5, 0.05);
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::video), (std::vector<AssetTrack>{{1, MediaType::video}}));
    EXPECT_EQ(asset->tracksWithMediaType(MediaType::audio),
              (std::vector<AssetTrack>{{2, MediaType::audio}, {3, MediaType::audio}}));
}

TEST_F(ExportTest, TrimShowsExactlyTheRange) {
    makeSource(5);
    EXPECT_EQ(trim(1.5, 2), Outcome::completed);
    EXPECT_EQ(decodingComplaints(output), "");
    EXPECT_EQ(probeFormat(output, "duration"), "2.000000");
    const auto times = frameTimes(output, "v:0");
    EXPECT_EQ(times.size(), 60U);
    EXPECT_NEAR(times.front(), 0, 0.0002);
    EXPECT_EQ(lastSession->progress(), 1);
    EXPECT_EQ(lastSession->outputURL(), URL::file(output));
    EXPECT_EQ(probeStream(output, "a:1", "codec_name"), "aac");
}

TEST_F(ExportTest, TrimKeepsSoundAndPictureTogether) {
    makeSource(4);
    trim(1, 2);
    const auto whole = decodedSound(path, "a:0");
    const auto part = decodedSound(output, "a:0");
    ASSERT_GT(part.size(), 80000U);
    // The tone's phase tells whether the sound lies where it lay.
    double difference = 0;
    for (std::size_t i = 4410; i < 80000; ++i)
        difference = std::max<double>(difference, std::abs(part[i] - whole[i + 44100]));
    EXPECT_LT(difference, 0.05);
}

TEST_F(ExportTest, TrimDoesNotEncodeAgain) {
    makeSource(2);
    trim(0, 2);
    const auto hash = [](const std::string& file) {
        return outputOf("ffmpeg -nostdin -v error -i '" + file + "' -map 0:v -c copy -f md5 -");
    };
    EXPECT_EQ(hash(output), hash(path));
}

TEST_F(ExportTest, TrimmedMovieCanBeTrimmedAgain) {
    makeSource(5);
    trim(1.5, 3);
    std::filesystem::rename(output, path);
    EXPECT_EQ(trim(1, 1), Outcome::completed);
    EXPECT_EQ(probeFormat(output, "duration"), "1.000000");
    EXPECT_EQ(frameTimes(output, "v:0").size(), 30U);
}

TEST_F(ExportTest, TrimKeepsTheTransform) {
    makeSource(1, {.transform = {0, 1, -1, 0, 240, 0}});
    trim(0, 1);
    EXPECT_EQ(rotation(output), -90);
}

TEST_F(ExportTest, RangeBeyondTheEndIsCut) {
    makeSource(2);
    EXPECT_EQ(trim(1, 100), Outcome::completed);
    EXPECT_NEAR(std::atof(probeFormat(output, "duration").c_str()), 1, 0.05);
}

TEST_F(ExportTest, EmptyRangesFail) {
    makeSource(1);
    for (const auto& [start, duration] : {std::pair(0.0, 0.0), {0.0, -1.0}, {2.0, 1.0}, {-3.0, 1.0}}) {
        EXPECT_EQ(trim(start, duration), Outcome::failed);
        EXPECT_EQ(lastSession->error()->code(), kMediaErrorInvalidRange);
        EXPECT_FALSE(std::filesystem::exists(output));
    }
}

TEST_F(ExportTest, MovieThatWasNeverFinishedCanBeTrimmed) {
    {
        TestMovie movie(service, path, {});
        ASSERT_TRUE(movie.start());
        movie.recordUntil(4);
    }
    EXPECT_GT(service.openAsset(URL::file(path))->duration().seconds(), 3);
    EXPECT_EQ(trim(1, 1.5), Outcome::completed);
    EXPECT_EQ(frameTimes(output, "v:0").size(), 45U);
}

TEST_F(ExportTest, MixHasOneSoundTrackWithAllTones) {
    makeSource(3);
    EXPECT_EQ(mix(), Outcome::completed);
    EXPECT_EQ(decodingComplaints(output), "");
    EXPECT_EQ(boxTypes(output), "ftyp mdat moov");
    EXPECT_EQ(probeStream(output, "a", "codec_name"), "aac");
    EXPECT_EQ(probeStream(output, "v:0", "codec_name,profile,width,height"), "h264,High,320,240");
    EXPECT_EQ(frameTimes(output, "v:0").size(), 90U);
    const auto mixed = decodedSound(output, "a:0");
    const auto one = decodedSound(path, "a:0");
    const auto two = decodedSound(path, "a:1");
    double difference = 0;
    for (std::size_t i = 4410; i < 120000; ++i)
        difference = std::max<double>(difference, std::abs(mixed.at(i) - (one.at(i) + two.at(i))));
    EXPECT_LT(difference, 0.1);
}

TEST_F(ExportTest, MixKeepsColoursAndTransform) {
    makeSource(1, {.transform = {-1, 0, 0, -1, 320, 240}});
    mix();
    EXPECT_EQ(probeStream(output, "v:0", "color_range,color_space"), "tv,smpte170m");
    EXPECT_EQ(rotation(output), -180);
}

TEST_F(ExportTest, MixLosesNothingThatIsSeen) {
    makeSource(1);
    mix();
    const std::string psnr = outputOf("ffmpeg -nostdin -i '" + path + "' -i '" + output +
                                      "' -lavfi psnr -f null - 2>&1 | grep -o 'average:[0-9.]*'");
    ASSERT_TRUE(psnr.starts_with("average:"));
    EXPECT_GT(std::atof(psnr.substr(8).c_str()), 40);
}

TEST_F(ExportTest, LoudTracksAreLimitedWithoutWrapping) {
    TestMovie movie(service, path, {});
    ASSERT_TRUE(movie.start());
    movie.appendWhenReady(movie.video(), testFrame({320, 240}, 0, movie.timeAt(0)));
    for (int i = 0; i < 100; ++i) {
        for (WriterInput* input : {&movie.audio1(), &movie.audio2()})
            movie.appendWhenReady(*input, testTone(movie.timeAt(i * 0.01), 441, 100, 0.95));
    }
    movie.finish();
    mix();
    const auto sound = decodedSound(output, "a:0");
    for (std::size_t i = 4410; i < 39690; ++i) {
        const double phase = 2 * 3.14159265358979 * 100 * static_cast<double>(i) / 44100;
        const bool isHigh = std::sin(phase) > 0.8;  // the timeline begins with a whole period
        ASSERT_TRUE(!isHigh || sound.at(i) > 0.5);
    }
}

TEST_F(ExportTest, MovieWithoutSoundIsMixedToOneWithoutSound) {
    outputOf("ffmpeg -nostdin -v error -f lavfi -i testsrc=s=320x240:d=1 -c:v libx264 -pix_fmt yuv420p '" +
             path + "'");
    EXPECT_EQ(mix(), Outcome::completed);
    EXPECT_EQ(probeStream(output, "a", "codec_name"), "");
    EXPECT_EQ(frameTimes(output, "v:0").size(), 25U);
}

TEST_F(ExportTest, ReorderedFramesSurviveTrimAndMix) {
    outputOf(
        "ffmpeg -nostdin -v error -f lavfi -i testsrc=s=320x240:d=4 -f lavfi -i sine=d=4 -c:v libx264 -bf 3 "
        "-g 25 -pix_fmt yuv420p -c:a aac '" +
        path + "'");
    EXPECT_EQ(trim(1.2, 2), Outcome::completed);
    EXPECT_EQ(decodingComplaints(output), "");
    EXPECT_EQ(frameTimes(output, "v:0").size(), 50U);
    EXPECT_NEAR(frameTimes(output, "v:0").front(), 0, 0.001);
    std::filesystem::remove(output);
    EXPECT_EQ(mix(), Outcome::completed);
    EXPECT_EQ(frameTimes(output, "v:0").size(), 100U);
}

TEST_F(ExportTest, TracksThatTheMixDoesNotNameAreLeftOut) {
    makeSource(1);
    const auto made = session(ExportPreset::highestQuality, path);
    made->setAudioMix({});
    EXPECT_EQ(run(made), Outcome::completed);
    EXPECT_EQ(probeStream(output, "a", "codec_name"), "");
}

TEST_F(ExportTest, TrackThatBeginsLateIsMixedAtItsTime) {
    TestMovie movie(service, path, {.hasAudio2 = false});
    ASSERT_TRUE(movie.start());
    movie.recordUntil(8);
    for (int i = 0; i < 100; ++i)
        movie.appendWhenReady(movie.audio2(), testTone(movie.timeAt(6 + i * 0.01), 441, 2000));
    movie.finish();
    EXPECT_EQ(mix(), Outcome::completed);
    const auto mixed = decodedSound(output, "a:0");
    const auto one = decodedSound(path, "a:0");
    double early = 0;
    double late = 0;
    for (std::size_t i = 44100; i < 44100 * 5; ++i)
        early = std::max<double>(early, std::abs(mixed.at(i) - one.at(i)));
    for (std::size_t i = 44100 * 6 + 4410; i < 44100 * 7 - 4410; ++i)
        late = std::max<double>(late, std::abs(mixed.at(i) - one.at(i)));
    EXPECT_LT(early, 0.1);
    EXPECT_NEAR(late, 0.5, 0.1);
}

TEST_F(ExportTest, CancelledExportLeavesNothing) {
    makeSource(10);
    const auto made = session(ExportPreset::highestQuality, path);
    std::promise<void> done;
    made->exportAsynchronously([&] { done.set_value(); });
    made->cancelExport();
    done.get_future().wait();
    EXPECT_EQ(made->status(), Outcome::cancelled);
    EXPECT_FALSE(made->error());
    EXPECT_FALSE(std::filesystem::exists(output));
}

TEST_F(ExportTest, ProgressGrows) {
    makeSource(10);
    const auto made = session(ExportPreset::highestQuality, path);
    EXPECT_EQ(made->progress(), 0);
    std::promise<void> done;
    made->exportAsynchronously([&] { done.set_value(); });
    auto finished = done.get_future();
    double last = 0;
    bool sawMiddle = false;
    while (finished.wait_for(std::chrono::milliseconds(1)) != std::future_status::ready) {
        const double now = made->progress();
        EXPECT_GE(now, last);
        sawMiddle = sawMiddle || (now > 0.05 && now < 0.95);
        last = now;
    }
    EXPECT_TRUE(sawMiddle);
    EXPECT_EQ(made->progress(), 1);
}

TEST_F(ExportTest, FileInTheWayFailsTheExportAndStays) {
    makeSource(1);
    std::ofstream(output) << "precious";
    EXPECT_EQ(trim(0, 1), Outcome::failed);
    EXPECT_EQ(lastSession->error()->code(), EEXIST);
    EXPECT_EQ(std::filesystem::file_size(output), 8U);
}

TEST_F(ExportTest, ExportWithoutAnOutputFails) {
    makeSource(1);
    const auto made =
        service.createExportSession(service.openAsset(URL::file(path)), ExportPreset::passThrough);
    EXPECT_EQ(run(made), Outcome::failed);
    EXPECT_EQ(made->error()->code(), kMediaErrorMisuse);
}

TEST_F(ExportTest, ScrambledContentDoesNoHarm) {
    makeSource(2);
    std::fstream(path, std::ios::in | std::ios::out | std::ios::binary).seekp(5000)
        << std::string(40000, '\xA5');
    EXPECT_EQ(trim(0, 2), Outcome::completed);
    std::filesystem::remove(output);
    const Outcome outcome = mix();
    EXPECT_EQ(std::filesystem::exists(output), outcome == Outcome::completed);
}

/// How a file that is no good movie is made, at the path that stands for "$1".
struct BadMovie {
    const char* name;
    const char* command;
};

class BadMovieTest : public ExportTest, public ::testing::WithParamInterface<BadMovie> {
  protected:
    void SetUp() override {
        makeSource(2);
        const std::string good = inFolder("good.mp4");
        std::filesystem::rename(path, good);
        outputOf("GOOD='" + good + "' BAD='" + path + "'; " + GetParam().command);
    }
};

TEST_P(BadMovieTest, TrimAndMixFailQuicklyAndLeaveNothing) {
    const auto begin = std::chrono::steady_clock::now();
    for (const ExportPreset preset : {ExportPreset::passThrough, ExportPreset::highestQuality}) {
        const auto made = session(preset, path);
        EXPECT_EQ(run(made), Outcome::failed);
        EXPECT_TRUE(made->error());
        EXPECT_FALSE(std::filesystem::exists(output));
    }
    EXPECT_LT(std::chrono::steady_clock::now() - begin, std::chrono::seconds(10));
}

INSTANTIATE_TEST_SUITE_P(
    Kinds, BadMovieTest,
    ::testing::Values(
        BadMovie{"Missing", "true"}, BadMovie{"Empty", ": > $BAD"}, BadMovie{"Folder", "mkdir $BAD"},
        BadMovie{"Pipe", "mkfifo $BAD"}, BadMovie{"Text", "yes 'this is no movie' | head -c 100000 > $BAD"},
        BadMovie{"Zeros", "head -c 1000000 /dev/zero > $BAD"},
        BadMovie{"CutInHalf", "head -c $(($(stat -c %s $GOOD) / 2)) $GOOD > $BAD"},
        BadMovie{"LastByteMissing", "head -c -1 $GOOD > $BAD"},
        BadMovie{"DataMissing",
                 "ffmpeg -nostdin -v error -i $GOOD -c copy -movflags faststart -f mp4 $BAD.f; "
                 "head -c $(($(stat -c %s $BAD.f) * 3 / 4)) $BAD.f > $BAD"},
        BadMovie{"OnlySound", "ffmpeg -nostdin -v error -i $GOOD -map 0:a -c copy $BAD"},
        BadMovie{"SixtyFourTracks",
                 "ffmpeg -nostdin -v error -i $GOOD -map 0:v $(yes -- '-map 0:a:0' | head -63) -c copy $BAD"},
        BadMovie{"OtherFormat", "ffmpeg -nostdin -v error -i $GOOD -map 0 -c copy -f matroska $BAD"}),
    [](const auto& movie) { return movie.param.name; });

}  // namespace
}  // namespace kelvo::test
