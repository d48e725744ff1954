#include "base/GlobalQueue.h"
#include "media/KVMovieWriter.h"
#include "platform/linux/media/LavMediaService.h"
#include "platform/linux/text/UnicodeTextFolding.h"
#include "platform/simulated/SimulatedClock.h"
#include "platform/simulated/SimulatedSettings.h"
#include "support/TemporaryDirectory.h"
#include "support/media/HostFileSystem.h"
#include "support/media/MovieProbe.h"
#include "support/media/TestMovie.h"

#include <cerrno>
#include <chrono>
#include <cstring>
#include <sys/mount.h>
#include <thread>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

/// A volume of half a megabyte.
class FullVolumeTest : public ::testing::Test {
  protected:
    using Status = MediaFileWriter::Status;

    void SetUp() override {
        if (::mount("none", folder.path().c_str(), "tmpfs", 0, "size=500k") != 0) {
            GTEST_SKIP() << "a small volume cannot be mounted here: " << std::strerror(errno);
        }
        isMounted = true;
    }
    void TearDown() override {
        if (isMounted) ::umount2(folder.path().c_str(), MNT_DETACH);
    }

    /// A frame that takes much room.
    static SampleBufferRef noise(std::int64_t nanoseconds) {
        static std::uint32_t state = 1;
        const SampleBufferRef frame = testFrame({320, 240}, 0, nanoseconds);
        for (std::byte& byte : frame->surface()->writablePixels()) {
            state = state * 1664525U + 1013904223U;
            byte = static_cast<std::byte>(state >> 24);
        }
        return frame;
    }
    static constexpr std::int64_t kFrame = kSecond / 30;
    static constexpr int kEnough = 3000;  // frames: far more than the volume holds

    TemporaryDirectory folder;
    const std::string path = folder.path() + "/movie.mp4";
    std::shared_ptr<HostFileSystem> files = std::make_shared<HostFileSystem>();
    std::shared_ptr<LavMediaService> service = std::make_shared<LavMediaService>(files);
    bool isMounted = false;
};

TEST_F(FullVolumeTest, WriterFailsAndItsMoviePlaysUpToThatPoint) {
    TestMovie movie(*service, path, {});
    ASSERT_TRUE(movie.start());
    for (int i = 0; i < kEnough && movie.writer()->status() == Status::writing; ++i)
        movie.appendWhenReady(movie.video(), noise(movie.timeAt(i / 30.0)));
    EXPECT_EQ(movie.writer()->status(), Status::failed);
    EXPECT_EQ(movie.writer()->error()->code(), ENOSPC);
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_GT(frameTimes(path, "v:0").size(), 10U);
    EXPECT_EQ(movie.finish(), Status::failed);
}

TEST_F(FullVolumeTest, MovieThatCannotBeIndexedStaysPlayable) {
    TestMovie movie(*service, path, {});
    ASSERT_TRUE(movie.start());
    movie.recordUntil(3);
    // Fills what is left once the movie's samples are written.
    outputOf("sleep 1; head -c 10000000 /dev/zero > " + folder.path() + "/filler 2>/dev/null");
    EXPECT_EQ(movie.finish(), Status::failed);
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_GT(frameTimes(path, "v:0").back(), 1.5);
}

TEST_F(FullVolumeTest, MovieWriterBeginsAgainFromTheNextFrame) {
    const auto clock = std::make_shared<SimulatedClock>();
    const auto store =
        std::make_shared<KVTemporaryFileStore>(files, std::make_shared<UnicodeTextFolding>(), clock);
    const auto writer = KVMovieWriter::create({320, 240}, path,
                                              {service, store, std::make_shared<SimulatedPreferences>(),
                                               std::make_shared<SimulatedDeviceProperties>()});
    writer->startWritingHandler(nullptr);
    writer->movieWriterQueue().sync([] {});
    GlobalQueue::drain();
    auto first = writer->assetWriter();
    std::int64_t time = kSecond;
    for (int i = 0; i < kEnough && first->status() != Status::failed; ++i, time += kFrame) {
        writer->appendVideoSampleBuffer(noise(time), {});
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    }
    ASSERT_EQ(first->status(), Status::failed);
    first.reset();  // holds the removed file open, and with it the room that the next one needs
    // A restart that the last noise set off may still have met the full volume; the next frame begins once
    // more.
    constexpr int kMostRestarts = 10;
    for (int i = 0; i < kMostRestarts; ++i, time += kFrame) {
        GlobalQueue::drain();
        if (i > 0 && writer->assetWriter()->status() == Status::writing) break;
        writer->appendVideoSampleBuffer(testFrame({320, 240}, 0, time), {});
    }
    ASSERT_EQ(writer->assetWriter()->status(), Status::writing);
    for (int i = 1; i < 10; ++i) {
        for (int wait = 0; wait < 5000 && !writer->videoInput()->isReadyForMoreMediaData(); ++wait)
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        writer->appendVideoSampleBuffer(testFrame({320, 240}, i, time + i * kFrame), {});
    }
    std::atomic<bool> finished = false;
    writer->finishWritingWithHandler([&](const auto& url) { finished = url == URL::file(path); });
    for (int i = 0; i < 5000 && !finished; ++i)
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
    EXPECT_TRUE(finished);
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_GE(frameTimes(path, "v:0").size(), 10U);
}

}  // namespace
}  // namespace kelvo::test
