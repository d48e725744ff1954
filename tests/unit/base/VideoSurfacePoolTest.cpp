#include "base/VideoSurfacePool.h"

#include <cerrno>
#include <thread>
#include <vector>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr VideoSurface::Geometry kSmall{16, 8, 64};

TEST(VideoSurfacePool, LendsNoMoreThanItsCapacity) {
    VideoSurfacePool pool(kSmall, 2);
    const VideoSurfaceRef first = *pool.take();
    const VideoSurfaceRef second = *pool.take();
    EXPECT_NE(first.get(), second.get());
    const auto third = pool.take();
    ASSERT_TRUE(third);
    EXPECT_EQ(*third, nullptr);
}

TEST(VideoSurfacePool, LendsAgainWhatCameBack) {
    VideoSurfacePool pool(kSmall, 1);
    VideoSurfaceRef surface = *pool.take();
    const VideoSurface* const address = surface.get();
    VideoSurfaceRef otherHolder = surface;
    surface.reset();
    EXPECT_EQ(*pool.take(), nullptr) << "somebody still holds it";
    otherHolder.reset();
    EXPECT_EQ(pool.take()->get(), address);
}

TEST(VideoSurfacePool, MakesSurfacesOnlyWhenTheyAreNeeded) {
    VideoSurfacePool pool(kSmall, 4);
    for (int i = 0; i < 10; ++i)
        EXPECT_TRUE(*pool.take());
    EXPECT_EQ(pool.size(), 1U);
}

TEST(VideoSurfacePool, PreparesEachSurfaceOnce) {
    int prepared = 0;
    VideoSurfacePool pool(kSmall, 2, [&](VideoSurface&) -> OptionalError {
        ++prepared;
        return std::nullopt;
    });
    for (int i = 0; i < 3; ++i) {
        const auto first = *pool.take();
        const auto second = *pool.take();
    }
    EXPECT_EQ(prepared, 2);
}

TEST(VideoSurfacePool, FailsWhenASurfaceCannotBePrepared) {
    VideoSurfacePool pool(kSmall, 2,
                          [](VideoSurface&) -> OptionalError { return KVError::posix(EACCES, "x"); });
    EXPECT_FALSE(pool.take());
    EXPECT_EQ(pool.size(), 0U);
}

TEST(VideoSurfacePool, FailsOnAnImpossibleGeometry) {
    VideoSurfacePool pool({0, 8, 64}, 2);
    EXPECT_FALSE(pool.take());
}

TEST(VideoSurfacePool, SurfaceMayComeBackAfterThePoolIsGone) {
    VideoSurfaceRef surface;
    {
        VideoSurfacePool pool(kSmall, 1);
        surface = *pool.take();
    }
    EXPECT_EQ(surface->pixels().size(), 512U);
    surface.reset();
}

TEST(VideoSurfacePool, SurfacesComeBackFromOtherThreads) {
    VideoSurfacePool pool(kSmall, 1);
    for (int i = 0; i < 100; ++i) {
        VideoSurfaceRef surface = *pool.take();
        ASSERT_TRUE(surface);
        std::thread([lent = std::move(surface)] { lent->writablePixels()[0] = std::byte{1}; }).join();
    }
}

TEST(VideoSurface, SealedSurfaceIsStillDrawnIntoByItsMaker) {
    const auto surface = VideoSurface::create(kSmall);
    ASSERT_TRUE(surface);
    ASSERT_FALSE((*surface)->seal());
    (*surface)->writablePixels()[3] = std::byte{7};
    EXPECT_EQ((*surface)->pixels()[3], std::byte{7});
}

TEST(VideoSurface, SealingTwiceFails) {
    const auto surface = VideoSurface::create(kSmall);
    ASSERT_FALSE((*surface)->seal());
    EXPECT_TRUE((*surface)->seal());
}

}  // namespace
}  // namespace kelvo
