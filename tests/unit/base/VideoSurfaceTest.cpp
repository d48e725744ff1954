#include "base/VideoSurface.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <sys/mman.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

using Geometry = VideoSurface::Geometry;

constexpr Geometry kSmall{4, 2, 16};

/// A memory file of `size` bytes with these seals.
UniqueFd memoryFile(off_t size, int seals) {
    UniqueFd file(::memfd_create("foreign", MFD_CLOEXEC | MFD_ALLOW_SEALING));
    EXPECT_EQ(::ftruncate(file.get(), size), 0);
    EXPECT_EQ(::fcntl(file.get(), F_ADD_SEALS, seals), 0);
    return file;
}

UniqueFd duplicate(int descriptor) {
    return UniqueFd(::fcntl(descriptor, F_DUPFD_CLOEXEC, 0));
}

/// The code of the error with which a surface of `geometry` is refused.
std::int64_t refusal(UniqueFd descriptor, const Geometry& geometry = kSmall) {
    const auto surface = VideoSurface::fromDescriptor(std::move(descriptor), geometry);
    return surface ? 0 : surface.error().code();
}

class BadGeometryTest : public testing::TestWithParam<Geometry> {};

TEST_P(BadGeometryTest, IsRefused) {
    EXPECT_FALSE(GetParam().isValid());
    const auto created = VideoSurface::create(GetParam());
    ASSERT_FALSE(created);
    EXPECT_EQ(created.error().code(), EINVAL);
    EXPECT_EQ(refusal(memoryFile(1 << 20, F_SEAL_SHRINK), GetParam()), EINVAL);
}

INSTANTIATE_TEST_SUITE_P(VideoSurface, BadGeometryTest,
                         testing::Values(Geometry{0, 1, 4}, Geometry{1, 0, 4}, Geometry{16385, 1, 65540},
                                         Geometry{1, 16385, 4}, Geometry{2, 1, 7}, Geometry{1, 1, 131073},
                                         Geometry{0x40000001, 1, 4}, Geometry{},
                                         Geometry{1, 1, 4, VideoSurface::PixelFormat{0}}));

TEST(VideoSurfaceTest, SmallestAndLargestGeometriesAreValid) {
    EXPECT_TRUE(Geometry::packed(1, 1).isValid());
    EXPECT_TRUE(Geometry::packed(16384, 16384).isValid());
    EXPECT_TRUE((Geometry{16384, 16384, 131072}.isValid()));
    EXPECT_EQ((Geometry{16384, 16384, 131072}.byteCount()), 2147483648U);
}

TEST(VideoSurfaceTest, NewSurfaceIsBlackAndWritable) {
    const auto surface = VideoSurface::create(kSmall);
    ASSERT_TRUE(surface);
    EXPECT_EQ((*surface)->geometry(), kSmall);
    EXPECT_EQ((*surface)->width(), 4U);
    EXPECT_EQ((*surface)->height(), 2U);
    ASSERT_EQ((*surface)->pixels().size(), 32U);
    EXPECT_TRUE(
        std::ranges::all_of((*surface)->pixels(), [](std::byte byte) { return byte == std::byte{0}; }));
    ASSERT_EQ((*surface)->writablePixels().size(), 32U);
    (*surface)->writablePixels()[31] = std::byte{7};
    EXPECT_EQ((*surface)->pixels()[31], std::byte{7});
}

TEST(VideoSurfaceTest, MemoryFileOfANewSurfaceCanNeitherShrinkNorGrow) {
    const auto surface = VideoSurface::create(kSmall);
    ASSERT_TRUE(surface);
    EXPECT_NE(::ftruncate((*surface)->descriptor(), 1), 0);
    EXPECT_NE(::ftruncate((*surface)->descriptor(), 4096), 0);
}

TEST(VideoSurfaceTest, OtherSideSeesThePixelsOfOneMemoryFile) {
    const auto ours = VideoSurface::create(kSmall);
    ASSERT_TRUE(ours);
    const auto theirs = VideoSurface::fromDescriptor(duplicate((*ours)->descriptor()), kSmall);
    ASSERT_TRUE(theirs);
    (*ours)->writablePixels()[5] = std::byte{9};
    EXPECT_EQ((*theirs)->pixels()[5], std::byte{9});
}

TEST(VideoSurfaceTest, FileTellsSurfacesApartInEveryProcess) {
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 4));
    const auto another = *VideoSurface::create(VideoSurface::Geometry::packed(4, 4));
    const auto sameFile = *VideoSurface::fromDescriptor(UniqueFd(::dup(surface->descriptor())),
                                                        VideoSurface::Geometry::packed(2, 4));
    EXPECT_EQ(surface->file(), sameFile->file());
    EXPECT_NE(surface->file(), another->file());
    EXPECT_EQ(VideoSurface::fileOf(surface->descriptor()), surface->file());
    EXPECT_EQ(VideoSurface::fileOf(-1), std::nullopt);
}

TEST(VideoSurfaceTest, HandleKnowsWhetherItIsASurface) {
    struct Other : ObjectHandle {};
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 4));
    EXPECT_EQ(VideoSurface::fromHandle(surface), surface);
    EXPECT_EQ(VideoSurface::fromHandle(std::make_shared<Other>()), nullptr);
    EXPECT_EQ(VideoSurface::fromHandle(nullptr), nullptr);
}

TEST(VideoSurfaceTest, SurfaceOfSomebodyElseIsReadOnly) {
    const auto theirs = VideoSurface::fromDescriptor(memoryFile(32, F_SEAL_SHRINK), kSmall);
    ASSERT_TRUE(theirs);
    EXPECT_TRUE((*theirs)->writablePixels().empty());
    EXPECT_EQ((*theirs)->pixels().size(), 32U);
}

TEST(VideoSurfaceDeathTest, WriteThroughAForeignMappingEndsTheProcess) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto theirs = VideoSurface::fromDescriptor(memoryFile(32, F_SEAL_SHRINK), kSmall);
    ASSERT_TRUE(theirs);
    auto* pixel = const_cast<volatile std::byte*>((*theirs)->pixels().data());
    EXPECT_DEATH(*pixel = std::byte{1}, "");
}

TEST(VideoSurfaceTest, DescriptorThatMayOnlyBeReadIsEnough) {
    const auto ours = VideoSurface::create(kSmall);
    ASSERT_TRUE(ours);
    const std::string path = "/proc/self/fd/" + std::to_string((*ours)->descriptor());
    UniqueFd readOnly(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    ASSERT_TRUE(readOnly);
    EXPECT_TRUE(VideoSurface::fromDescriptor(std::move(readOnly), kSmall));
}

TEST(VideoSurfaceTest, ForeignFileThatIsTooSmallIsRefused) {
    EXPECT_EQ(refusal(memoryFile(31, F_SEAL_SHRINK)), EINVAL);
}

TEST(VideoSurfaceTest, ForeignFileMayBeLarger) {
    EXPECT_EQ(refusal(memoryFile(33, F_SEAL_SHRINK)), 0);
}

TEST(VideoSurfaceTest, ForeignFileThatCouldShrinkIsRefused) {
    EXPECT_EQ(refusal(memoryFile(32, F_SEAL_GROW)), EINVAL);
}

TEST(VideoSurfaceTest, FileThatCannotBeSealedIsRefused) {
    std::FILE* file = std::tmpfile();
    ASSERT_NE(file, nullptr);
    ASSERT_EQ(::ftruncate(::fileno(file), 4096), 0);
    EXPECT_EQ(refusal(duplicate(::fileno(file))), EINVAL);
    static_cast<void>(std::fclose(file));
}

TEST(VideoSurfaceTest, DescriptorThatIsNoRegularFileIsRefused) {
    EXPECT_EQ(refusal(UniqueFd(::open("/dev/zero", O_RDWR | O_CLOEXEC))), EINVAL);
    EXPECT_EQ(refusal(UniqueFd(::open("/", O_RDONLY | O_CLOEXEC))), EINVAL);
}

TEST(VideoSurfaceTest, MissingDescriptorIsRefused) {
    EXPECT_EQ(refusal(UniqueFd()), EBADF);
}

TEST(VideoSurfaceTest, DescriptorIsClosedWithTheSurfaceAndOnRefusal) {
    UniqueFd file = memoryFile(32, F_SEAL_SHRINK);
    const int number = file.get();
    { const auto surface = VideoSurface::fromDescriptor(std::move(file), kSmall); }
    EXPECT_LT(::fcntl(number, F_GETFD), 0);
    UniqueFd small = memoryFile(1, F_SEAL_SHRINK);
    const int refused = small.get();
    EXPECT_EQ(refusal(std::move(small)), EINVAL);
    EXPECT_LT(::fcntl(refused, F_GETFD), 0);
}

}  // namespace
}  // namespace kelvo
