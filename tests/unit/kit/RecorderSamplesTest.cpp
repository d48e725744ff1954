#include "RecorderFixture.h"

namespace kelvokit {
namespace {

class RecorderSamplesTest : public RecorderFixture {};

TEST_F(RecorderSamplesTest, FrameMayBeKeptPastItsHandlerAndGoesBackWhenDropped) {
    startRecording();
    std::optional<Frame> kept;
    recorder->onFrame([&](const Frame& frame) { kept = frame; });
    kelvo::VideoSurfaceRef surface =
        *kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2));
    surface->writablePixels()[5] = std::byte{9};
    const std::weak_ptr watched = surface;
    asDaemon([&](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(std::move(surface));
        client.captureHandlerWithSample(
            object, kelvo::bytesOfRecord(kelvo::TimingRecord{{}, kelvo::MediaTime::make(3, 2), {}}));
    });
    ASSERT_TRUE(kept);
    EXPECT_EQ(kept->width(), 4U);
    EXPECT_EQ(kept->height(), 2U);
    EXPECT_EQ(kept->bytesPerRow(), 16U);
    EXPECT_EQ(kept->pixels()[5], std::byte{9});
    EXPECT_EQ(kept->presentationTime(), std::chrono::milliseconds(1500));
    EXPECT_FALSE(watched.expired());
    kept.reset();
    EXPECT_TRUE(watched.expired());
}

TEST_F(RecorderSamplesTest, FrameThatNobodyWantsGoesBackAtOnce) {
    startRecording();
    kelvo::VideoSurfaceRef surface =
        *kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2));
    const std::weak_ptr watched = surface;
    asDaemon([&](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(std::move(surface));
        client.captureHandlerWithSample(object, {});
    });
    EXPECT_TRUE(watched.expired());
}

TEST_F(RecorderSamplesTest, HandlerKeepsWhatItHoldsFromCallToCall) {
    startRecording();
    int latest = 0;
    recorder->onFrame([&latest, count = 0](const Frame&) mutable { latest = ++count; });
    asDaemon([](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(*kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2)));
        client.captureHandlerWithSample(object, {});
        client.captureHandlerWithSample(object, {});
    });
    EXPECT_EQ(latest, 2);
}

TEST_F(RecorderSamplesTest, HandlerMayReplaceItself) {
    startRecording();
    std::string calls;
    recorder->onFrame([&, name = std::string("first")](const Frame&) {
        recorder->onFrame([&](const Frame&) { calls += " second"; });
        calls += name;
    });
    asDaemon([](auto& client) {
        const auto object = std::make_shared<kelvo::KVIOSurfaceObject>();
        object->setIOSurface(*kelvo::VideoSurface::create(kelvo::VideoSurface::Geometry::packed(4, 2)));
        client.captureHandlerWithSample(object, {});
        client.captureHandlerWithSample(object, {});
    });
    EXPECT_EQ(calls, "first second");
}

TEST_F(RecorderSamplesTest, SoundArrivesWithItsFormat) {
    startRecording();
    std::optional<AudioBuffer> heard;
    recorder->onAudio([&](const AudioBuffer& buffer) { heard = buffer; });
    asDaemon([](auto& client) {
        client.captureHandlerWithAudioSample(
            kelvo::Bytes(16, std::byte{1}), kelvo::bytesOfRecord(kelvo::AudioFormatRecord::float32(48000, 2)),
            2, kelvo::SampleBuffer::Type::microphone, {});
    });
    ASSERT_TRUE(heard);
    EXPECT_EQ(heard->source(), AudioBuffer::Source::microphone);
    EXPECT_EQ(heard->sampleRate(), 48000);
    EXPECT_EQ(heard->channels(), 2U);
    EXPECT_EQ(heard->bitsPerSample(), 32U);
    EXPECT_TRUE(heard->isFloat());
    EXPECT_FALSE(heard->isSigned());
    EXPECT_FALSE(heard->isPlanar());
    EXPECT_EQ(heard->frameCount(), 2);
    EXPECT_EQ(heard->bytes().size(), 16U);
    EXPECT_EQ(heard->presentationTime(), std::nullopt);
}

TEST_F(RecorderSamplesTest, SoundBeyondTheBoundIsDroppedAndCounted) {
    startRecording();
    int heard = 0;
    recorder->onAudio([&](const AudioBuffer&) { ++heard; });
    {
        const auto connection = daemon->client.copy();
        kelvo::RemoteClient client = kelvo::remoteClient(*connection, "client");
        for (int i = 0; i < kMostWaitingAudioBuffers + 3; ++i)
            client.captureHandlerWithAudioSample({}, {}, 0, kelvo::SampleBuffer::Type::applicationAudio, {});
        device.settle();
    }
    EXPECT_EQ(recorder->droppedAudioBuffers(), 3U);
    settle();
    EXPECT_EQ(heard, kMostWaitingAudioBuffers);
}

}  // namespace
}  // namespace kelvokit
