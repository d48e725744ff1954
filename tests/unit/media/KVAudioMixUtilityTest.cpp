#include "base/GlobalQueue.h"
#include "base/Guarded.h"
#include "media/KVAudioMixUtility.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/LogRecorder.h"

#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

class KVAudioMixUtilityTest : public ::testing::Test {
  protected:
    struct Outcome {
        std::optional<URL> url;
        std::optional<std::int64_t> code;
        std::thread::id thread;
    };

    KVAudioMixUtilityTest() {
        const auto localization = std::make_shared<KVLocalization>(device.bundles, device.languages);
        utility = std::make_unique<KVAudioMixUtility>(device.media, device.clock,
                                                      std::make_shared<KVUserErrors>(localization));
    }

    void addMovie(const std::vector<MediaType>& tracks) {
        device.media->addMovie(kMovie, {MediaTime::make(5, 1), tracks});
    }

    void mix(const std::optional<URL>& url) {
        utility->mixAudioForMovie(url, [this](const auto& mixed, const OptionalError& error) {
            const auto code = error ? std::optional(error->code()) : std::nullopt;
            EXPECT_TRUE(!error || error->domain() == KVRecordingErrorDomain);
            outcomes.with([&](auto& all) { all.push_back({mixed, code, std::this_thread::get_id()}); });
        });
    }
    Outcome mixed(const std::optional<URL>& url) {
        mix(url);
        GlobalQueue::drain();
        const auto all = outcomes.copy();
        EXPECT_EQ(all.size(), 1U);
        return all.empty() ? Outcome{} : all.front();
    }
    std::shared_ptr<SimulatedExportSession> session() const { return device.media->exportSessions().back(); }

    const URL kMovie = URL::file("/movies/recording.mp4");
    LogRecorder log;
    SimulatedDevice device;
    std::unique_ptr<KVAudioMixUtility> utility;
    Guarded<std::vector<Outcome>> outcomes;
};

TEST_F(KVAudioMixUtilityTest, OutputIsNamedAfterTheSecondAndKeepsTheDoubledSlash) {
    device.clock->advance(std::chrono::milliseconds(900));
    const URL expected = URL::file("/private/var/mobile/Library/KelvoKit//KVKelvo_Final1700000000.mp4");
    EXPECT_EQ(utility->tempFileURL(), expected);
}

TEST_F(KVAudioMixUtilityTest, TwoNamesWithinOneSecondAreTheSame) {
    const URL first = utility->tempFileURL();
    device.clock->advance(std::chrono::milliseconds(999));
    EXPECT_EQ(utility->tempFileURL(), first);
    device.clock->advance(std::chrono::milliseconds(1));
    EXPECT_NE(utility->tempFileURL(), first);
}

TEST_F(KVAudioMixUtilityTest, EveryAudioTrackIsNamedInOrder) {
    addMovie({MediaType::video, MediaType::audio, MediaType::audio});
    const Outcome outcome = mixed(kMovie);
    EXPECT_EQ(outcome.url, utility->tempFileURL());
    EXPECT_FALSE(outcome.code);
    EXPECT_EQ(session()->preset(), ExportPreset::highestQuality);
    EXPECT_EQ(session()->audioMix(), (AudioMix{{{2}, {3}}}));
    EXPECT_FALSE(session()->timeRange());
}

TEST_F(KVAudioMixUtilityTest, MovieWithOneAudioTrackIsExportedUnderANewName) {
    addMovie({MediaType::video, MediaType::audio});
    const Outcome outcome = mixed(kMovie);
    EXPECT_EQ(outcome.url, utility->tempFileURL());
    EXPECT_EQ(session()->audioMix()->inputParameters.size(), 1U);
}

TEST_F(KVAudioMixUtilityTest, MovieWithoutAudioIsExportedWithAnEmptyMix) {
    addMovie({MediaType::video});
    EXPECT_TRUE(mixed(kMovie).url);
    ASSERT_TRUE(session()->audioMix());
    EXPECT_TRUE(session()->audioMix()->inputParameters.empty());
}

TEST_F(KVAudioMixUtilityTest, TheMovieStays) {
    addMovie({MediaType::video, MediaType::audio});
    mixed(kMovie);
    EXPECT_TRUE(device.fileSystem->itemExists(kMovie.path()));
}

TEST_F(KVAudioMixUtilityTest, CompletionNeverRunsOnTheCallersThread) {
    addMovie({MediaType::video});
    EXPECT_NE(mixed(kMovie).thread, std::this_thread::get_id());
}

TEST_F(KVAudioMixUtilityTest, MissingMovieIsAMixingFailureAtOnce) {
    mix(std::nullopt);
    const auto all = outcomes.copy();
    ASSERT_EQ(all.size(), 1U);
    EXPECT_FALSE(all[0].url);
    EXPECT_EQ(all[0].code, kRecordingErrorMixingFailure);
    EXPECT_TRUE(device.media->exportSessions().empty());
}

TEST_F(KVAudioMixUtilityTest, FailedExportIsAFailureToSave) {
    addMovie({MediaType::video});
    device.failNext("ExportSession.export", ENOSPC);
    const Outcome outcome = mixed(kMovie);
    EXPECT_FALSE(outcome.url);
    EXPECT_EQ(outcome.code, kRecordingErrorFailedToSave);
    EXPECT_EQ(log.count(LogLevel::console, "KVAudioMixUtility: MXAssetExportSessionFailed"), 1U);
}

TEST_F(KVAudioMixUtilityTest, MovieThatCannotBeOpenedIsAFailureToSave) {
    const Outcome outcome = mixed(kMovie);
    EXPECT_EQ(outcome.code, kRecordingErrorFailedToSave);
    EXPECT_TRUE(log.contains("KVAudioMixUtility: MXAssetExportSessionFailed"));
}

TEST_F(KVAudioMixUtilityTest, CancelledExportIsAFailureToSave) {
    addMovie({MediaType::video});
    device.media->holdExports(true);
    mix(kMovie);
    session()->cancelExport();
    GlobalQueue::drain();
    ASSERT_EQ(outcomes.copy().size(), 1U);
    EXPECT_FALSE(outcomes.copy()[0].url);
    EXPECT_EQ(outcomes.copy()[0].code, kRecordingErrorFailedToSave);
    EXPECT_EQ(log.count(LogLevel::console, "KVAudioMixUtility: MXAssetExportSessionStatusCancelled"), 1U);
}

}  // namespace
}  // namespace kelvo::test
