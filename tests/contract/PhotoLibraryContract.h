#pragma once

#include "base/URL.h"
#include "platform/PhotoLibrary.h"

#include <cerrno>
#include <string>

#include <gtest/gtest.h>

namespace kelvo::test {

/// What every photo library does. `World` supplies one that is empty:
///
///     struct World {
///         PhotoLibrary& library();
///         void addMovie(const std::string& path);      // a movie in a folder that is there
///         void removeMovie(const std::string& path);
///     };
template <typename World>
class PhotoLibraryContract : public testing::Test {
  protected:
    static constexpr const char* kMovie = "/movie.mp4";

    Result<PhotoAsset> create() {
        world.addMovie(kMovie);
        return world.library().createVideoAsset(URL::file(kMovie));
    }

    World world;
};

TYPED_TEST_SUITE_P(PhotoLibraryContract);

TYPED_TEST_P(PhotoLibraryContract, NewAssetIsFoundByItsIdentifier) {
    const auto asset = this->create();
    ASSERT_TRUE(asset);
    EXPECT_FALSE(asset->localIdentifier.empty());
    EXPECT_EQ(this->world.library().assetWithLocalIdentifier(asset->localIdentifier), *asset);
}

TYPED_TEST_P(PhotoLibraryContract, AssetOutlivesTheMovieThatItWasMadeFrom) {
    const auto asset = this->create();
    this->world.removeMovie(this->kMovie);
    EXPECT_TRUE(this->world.library().assetWithLocalIdentifier(asset->localIdentifier));
}

TYPED_TEST_P(PhotoLibraryContract, EachAssetHasAnIdentifierOfItsOwn) {
    const auto first = this->create();
    const auto second = this->world.library().createVideoAsset(URL::file(this->kMovie));
    ASSERT_TRUE(first && second);
    EXPECT_NE(first->localIdentifier, second->localIdentifier);
}

TYPED_TEST_P(PhotoLibraryContract, IdentifierIsNotUsedAgain) {
    const auto first = this->create();
    EXPECT_EQ(this->world.library().deleteAsset(*first), std::nullopt);
    const auto second = this->create();
    EXPECT_NE(first->localIdentifier, second->localIdentifier);
}

TYPED_TEST_P(PhotoLibraryContract, MissingMovieIsAnError) {
    const auto asset = this->world.library().createVideoAsset(URL::file("/missing.mp4"));
    ASSERT_FALSE(asset);
    EXPECT_EQ(asset.error().code(), ENOENT);
}

TYPED_TEST_P(PhotoLibraryContract, WhatIsNoFileIsAnError) {
    EXPECT_FALSE(this->world.library().createVideoAsset(URL("https://example.com/movie.mp4")));
}

TYPED_TEST_P(PhotoLibraryContract, DeletedAssetIsGone) {
    const auto asset = this->create();
    EXPECT_EQ(this->world.library().deleteAsset(*asset), std::nullopt);
    EXPECT_EQ(this->world.library().assetWithLocalIdentifier(asset->localIdentifier), std::nullopt);
    const auto again = this->world.library().deleteAsset(*asset);
    ASSERT_TRUE(again);
    EXPECT_EQ(again->code(), ENOENT);
}

TYPED_TEST_P(PhotoLibraryContract, AssetsAreListedWithWhatTheyAre) {
    ASSERT_TRUE(this->world.library().assets());
    EXPECT_TRUE(this->world.library().assets()->empty());
    const auto first = this->create();
    const auto second = this->create();
    ASSERT_TRUE(first && second);
    auto assets = this->world.library().assets();
    ASSERT_TRUE(assets);
    ASSERT_EQ(assets->size(), 2U);
    EXPECT_LE(assets->front().creationDate, assets->back().creationDate);
    EXPECT_GT(assets->front().creationDate, Date());
    EXPECT_GT(assets->front().size, 0U);
    EXPECT_EQ(this->world.library().deleteAsset(*first), std::nullopt);
    assets = this->world.library().assets();
    ASSERT_EQ(assets->size(), 1U);
    EXPECT_EQ(assets->front().asset, *second);
}

TYPED_TEST_P(PhotoLibraryContract, UnknownIdentifiersAreNoAssets) {
    EXPECT_EQ(this->world.library().assetWithLocalIdentifier(""), std::nullopt);
    EXPECT_EQ(this->world.library().assetWithLocalIdentifier("unknown"), std::nullopt);
    EXPECT_TRUE(this->world.library().deleteAsset(PhotoAsset{"unknown"}).has_value());
}

REGISTER_TYPED_TEST_SUITE_P(PhotoLibraryContract, NewAssetIsFoundByItsIdentifier,
                            AssetOutlivesTheMovieThatItWasMadeFrom, EachAssetHasAnIdentifierOfItsOwn,
                            IdentifierIsNotUsedAgain, MissingMovieIsAnError, WhatIsNoFileIsAnError,
                            DeletedAssetIsGone, AssetsAreListedWithWhatTheyAre,
                            UnknownIdentifiersAreNoAssets);

}  // namespace kelvo::test
