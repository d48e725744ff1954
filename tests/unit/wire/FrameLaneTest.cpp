#include "platform/linux/ipc/FrameLane.h"
#include "platform/linux/ipc/FrameLaneReceiver.h"
#include "platform/linux/ipc/FrameLaneSender.h"

#include <algorithm>
#include <cstring>
#include <fcntl.h>
#include <future>
#include <span>
#include <sys/mman.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using Moment = FrameLaneSender::Moment;
using std::chrono::milliseconds;

constexpr Moment kStart{std::chrono::hours(1)};

FrameLane otherEndOf(const FrameLane& lane) {
    return *FrameLane::fromDescriptor(UniqueFd(::dup(lane.descriptor())));
}

VideoSurfaceRef surfaceOf(std::uint32_t width) {
    return *VideoSurface::create(VideoSurface::Geometry::packed(width, 8));
}

UniqueFd memoryFile(off_t size, int seals) {
    UniqueFd file(::memfd_create("lane", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(::ftruncate(file.get(), size), 0);
    EXPECT_EQ(::fcntl(file.get(), F_ADD_SEALS, seals), 0);
    return file;
}

TEST(FrameLaneTest, EntriesReachTheOtherEnd) {
    FrameLane lane = *FrameLane::create();
    const FrameLane other = otherEndOf(lane);
    EXPECT_FALSE(other.hasEntry(0));
    FrameLane::Entry entry;
    entry.serial = 7;
    entry.method = 3;
    entry.surface = {4, 5};
    entry.size = 2;
    entry.bytes[1] = std::byte{9};
    lane.put(0, entry);
    ASSERT_TRUE(other.hasEntry(0));
    EXPECT_FALSE(other.hasEntry(1));
    const FrameLane::Entry received = other.entry(0);
    EXPECT_EQ(received.serial, 7U);
    EXPECT_EQ(received.method, 3U);
    EXPECT_EQ(received.surface, (VideoSurface::File{4, 5}));
    EXPECT_EQ(received.size, 2U);
    EXPECT_EQ(received.bytes, entry.bytes);
}

/// Clients that are not ours read it by its bytes.
TEST(FrameLaneTest, PageIsLaidOutAsItIsDocumented) {
    FrameLane lane = *FrameLane::create();
    constexpr std::size_t kSize = 128 + 128 * FrameLane::kPlaces;
    void* const page = ::mmap(nullptr, kSize, PROT_READ, MAP_SHARED, lane.descriptor(), 0);
    ASSERT_NE(page, MAP_FAILED);
    const auto numberAt = [&](std::size_t place, auto number) {
        std::memcpy(&number, static_cast<const char*>(page) + place, sizeof(number));
        return number;
    };
    FrameLane::Entry entry;
    entry.serial = 21;
    entry.method = 22;
    entry.surface = {0x2300000001, 0x2400000001};
    entry.size = 25;
    entry.bytes[0] = std::byte{26};
    lane.put(17, entry);
    lane.giveBack(2, 27);
    lane.ring();
    EXPECT_EQ(numberAt(0, std::uint32_t{}), 18U);
    EXPECT_EQ(numberAt(4, std::uint32_t{}), 1U);
    EXPECT_EQ(numberAt(64 + 4 * 2, std::uint32_t{}), 27U);
    const std::size_t first = 128 + 128 * 1;  // 17 is at place 1
    EXPECT_EQ(numberAt(first, std::uint32_t{}), 21U);
    EXPECT_EQ(numberAt(first + 4, std::uint32_t{}), 22U);
    EXPECT_EQ(numberAt(first + 8, std::uint64_t{}), 0x2300000001U);
    EXPECT_EQ(numberAt(first + 16, std::uint64_t{}), 0x2400000001U);
    EXPECT_EQ(numberAt(first + 24, std::uint32_t{}), 25U);
    EXPECT_EQ(numberAt(first + 28, std::uint8_t{}), 26U);
    ::munmap(page, kSize);
}

TEST(FrameLaneTest, PlaceIsGivenBackForOneSerial) {
    const FrameLane lane = *FrameLane::create();
    FrameLane other = otherEndOf(lane);
    EXPECT_FALSE(lane.isGivenBack(3, 8));
    other.giveBack(3, 8);
    EXPECT_TRUE(lane.isGivenBack(3, 8));
    EXPECT_FALSE(lane.isGivenBack(3, 9));
    EXPECT_FALSE(lane.isGivenBack(4, 8));
}

TEST(FrameLaneTest, BellThatWasRungIsNotWaitedFor) {
    FrameLane lane = *FrameLane::create();
    const FrameLane other = otherEndOf(lane);
    const std::uint32_t before = other.bell();
    lane.ring();
    EXPECT_NE(other.bell(), before);
    other.waitForBell(before);
}

TEST(FrameLaneTest, FileThatIsNoneIsRefused) {
    EXPECT_FALSE(FrameLane::fromDescriptor(UniqueFd()));
    EXPECT_FALSE(FrameLane::fromDescriptor(UniqueFd(::open("/dev/null", O_RDWR | O_CLOEXEC))));
    EXPECT_FALSE(FrameLane::fromDescriptor(memoryFile(64, F_SEAL_SHRINK)));
    EXPECT_FALSE(FrameLane::fromDescriptor(memoryFile(65536, 0)));
    EXPECT_TRUE(FrameLane::fromDescriptor(memoryFile(65536, F_SEAL_SHRINK)));
}

TEST(FrameLaneTest, FileCanNeitherGrowNorShrink) {
    const FrameLane lane = *FrameLane::create();
    EXPECT_EQ(::ftruncate(lane.descriptor(), 0), -1);
    EXPECT_EQ(::ftruncate(lane.descriptor(), 1 << 20), -1);
}

class FrameLaneSenderTest : public testing::Test {
  protected:
    bool put(const VideoSurfaceRef& which, Moment now = kStart, std::uint32_t serial = 1) {
        return sender.put(serial, {6, which, bytes}, now);
    }
    std::size_t countGivenBack() {
        LentSurfaces gone;
        sender.takeGivenBack(gone);
        return gone.size();
    }

    const FrameLane lane = *FrameLane::create();
    FrameLane client = otherEndOf(lane);
    FrameLaneSender sender{lane};
    const Bytes bytes = Bytes(72, std::byte{1});
    const VideoSurfaceRef surface = surfaceOf(8);
};

TEST_F(FrameLaneSenderTest, TakesOnlySurfacesThatTheClientHas) {
    EXPECT_FALSE(put(surface));
    EXPECT_FALSE(client.hasEntry(0));
    sender.sentInMessage(*surface, kStart);
    EXPECT_TRUE(put(surface));
    EXPECT_FALSE(put(surfaceOf(8)));
    sender.forgetSurfaces();
    EXPECT_FALSE(put(surface));
}

TEST_F(FrameLaneSenderTest, SurfaceThatWasNotSentForHalfASecondGoesInAMessage) {
    sender.sentInMessage(*surface, kStart);
    EXPECT_FALSE(put(surface, kStart + milliseconds(500)));
    EXPECT_TRUE(put(surface, kStart + milliseconds(499)));
    EXPECT_FALSE(put(surface, kStart + milliseconds(999)));
    EXPECT_TRUE(put(surface, kStart + milliseconds(998)));
}

TEST_F(FrameLaneSenderTest, SameFileAsAnotherSurfaceIsNotTheSame) {
    sender.sentInMessage(*surface, kStart);
    const auto half = *VideoSurface::fromDescriptor(UniqueFd(::dup(surface->descriptor())),
                                                    VideoSurface::Geometry::packed(4, 8));
    EXPECT_FALSE(put(half));
    sender.sentInMessage(*half, kStart);
    EXPECT_TRUE(put(half));
    EXPECT_FALSE(put(surface)) << "the client would take it for the one that was sent last";
}

TEST_F(FrameLaneSenderTest, ForgetsTheSurfaceThatTheClientForgets) {
    std::vector<VideoSurfaceRef> surfaces;
    for (std::size_t i = 0; i < SurfaceCache::kMostSurfaces; ++i) {
        surfaces.push_back(surfaceOf(8));
        sender.sentInMessage(*surfaces.back(), kStart + milliseconds(i));
    }
    EXPECT_TRUE(put(surfaces[0], kStart + milliseconds(20)));
    sender.sentInMessage(*surface, kStart + milliseconds(21));
    EXPECT_TRUE(put(surfaces[0]));
    EXPECT_FALSE(put(surfaces[1])) << "used longest ago";
    EXPECT_TRUE(put(surfaces[2]));
    EXPECT_TRUE(put(surface));
}

TEST_F(FrameLaneSenderTest, BytesThatDoNotFitGoInAMessage) {
    sender.sentInMessage(*surface, kStart);
    EXPECT_FALSE(sender.put(1, {0, surface, Bytes(FrameLane::kMostBytes + 1)}, kStart));
    EXPECT_EQ(sender.lentCount(), 0U);
    EXPECT_TRUE(sender.put(1, {0, surface, Bytes(FrameLane::kMostBytes)}, kStart));
}

TEST_F(FrameLaneSenderTest, PlaceIsTakenAgainOnlyWhenItsFrameIsBack) {
    sender.sentInMessage(*surface, kStart);
    for (std::uint32_t serial = 1; serial <= FrameLane::kPlaces; ++serial)
        ASSERT_TRUE(put(surface, kStart, serial));
    EXPECT_FALSE(put(surface));
    EXPECT_EQ(sender.lentCount(), FrameLane::kPlaces);
    client.giveBack(1, 2);
    EXPECT_EQ(countGivenBack(), 1U);
    EXPECT_FALSE(put(surface)) << "the oldest is not back";
    client.giveBack(0, 1);
    EXPECT_EQ(countGivenBack(), 1U);
    EXPECT_EQ(sender.lentCount(), FrameLane::kPlaces - 2);
    EXPECT_TRUE(put(surface));
}

TEST_F(FrameLaneSenderTest, FrameIsHeldUntilItIsGivenBack) {
    sender.sentInMessage(*surface, kStart);
    ASSERT_TRUE(put(surface, kStart, 5));
    EXPECT_EQ(surface.use_count(), 2);
    client.giveBack(0, 4);
    EXPECT_EQ(countGivenBack(), 0U) << "another frame's serial";
    client.giveBack(0, 5);
    EXPECT_EQ(countGivenBack(), 1U);
    EXPECT_EQ(surface.use_count(), 1);
    EXPECT_EQ(countGivenBack(), 0U);
}

TEST_F(FrameLaneSenderTest, FrameMayBeGivenBackByAMessage) {
    sender.sentInMessage(*surface, kStart);
    ASSERT_TRUE(put(surface, kStart, 5));
    LentSurfaces gone;
    sender.takeGivenBack(4, gone);
    EXPECT_EQ(gone.size(), 0U);
    sender.takeGivenBack(5, gone);
    sender.takeGivenBack(5, gone);
    EXPECT_EQ(gone.size(), 1U) << "it is back already";
    EXPECT_EQ(sender.lentCount(), 0U);
}

TEST_F(FrameLaneSenderTest, ReceiverHasTheFramesInTheirOrder) {
    FrameLaneReceiver receiver(client, [] {});
    sender.sentInMessage(*surface, kStart);
    for (std::uint32_t serial = 1; serial <= 40; ++serial) {
        ASSERT_TRUE(put(surface, kStart, serial));
        ASSERT_TRUE(receiver.hasFront());
        EXPECT_EQ(receiver.front().serial, serial);
        EXPECT_EQ(receiver.front().method, 6U);
        EXPECT_EQ(receiver.front().surface, surface->file());
        EXPECT_EQ(receiver.front().size, bytes.size());
        const FrameLane::Entry front = receiver.front();
        EXPECT_TRUE(std::ranges::equal(std::span(front.bytes).first(bytes.size()), bytes));
        receiver.giveBack(receiver.takeFront(), serial);
        EXPECT_FALSE(receiver.hasFront());
        EXPECT_EQ(countGivenBack(), 1U);
    }
}

TEST_F(FrameLaneSenderTest, ReceiverIsWokenOnceAtFirstAndThenByTheBell) {
    FrameLaneReceiver receiver(client, [] {});
    EXPECT_TRUE(receiver.wait()) << "there may have been something before";
    FrameLane bell = lane;
    bell.ring();
    bell.ring();
    EXPECT_TRUE(receiver.wait());
    receiver.stop();
    EXPECT_FALSE(receiver.wait());
}

/// Never rings, and tells of its end.
struct DoneBell : SocketBell {
    ~DoneBell() override { gone->set_value(); }
    bool wait() override { return false; }
    void ready() override {}
    void stop() override {}

    std::promise<void>* gone = nullptr;
};

TEST(SocketBellTest, LoopThatEndsStopsIt) {
    SocketLoop loop;
    const auto receiver = std::make_shared<FrameLaneReceiver>(*FrameLane::create(), [] {});
    loop.attend(receiver);
    loop.stop();
    EXPECT_FALSE(receiver->wait());
    EXPECT_EQ(receiver.use_count(), 1);
    loop.attend(receiver);
    EXPECT_EQ(receiver.use_count(), 1) << "a loop that has ended attends to nobody";
}

TEST(SocketBellTest, OneThatIsDoneIsForgotten) {
    SocketLoop loop;
    auto bell = std::make_shared<DoneBell>();
    std::promise<void> gone;
    bell->gone = &gone;
    loop.attend(bell);
    bell.reset();
    gone.get_future().wait();
}

}  // namespace
}  // namespace kelvo
