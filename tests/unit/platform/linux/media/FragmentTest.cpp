#include "base/UniqueFd.h"
#include "platform/MediaErrors.h"
#include "platform/linux/media/FileWriting.h"
#include "platform/linux/media/Fragment.h"
#include "platform/linux/media/FragmentReader.h"
#include "support/TemporaryDirectory.h"

#include <fcntl.h>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

/// A file of fragments, as a movie file holds them.
class FragmentTest : public testing::Test {
  protected:
    static SampleRun run(std::int64_t decodeTime, std::uint32_t duration, std::vector<std::uint32_t> sizes) {
        SampleRun made;
        for (const std::uint32_t size : sizes) {
            const bool isFirst = made.empty();
            made.samples.push_back({{decodeTime, isFirst ? 0 : -3, duration, isFirst}, size});
            made.data.resize(made.data.size() + size, std::byte{0x55});
            decodeTime += duration;
        }
        return made;
    }

    void append(const std::vector<SampleRun>& runs) {
        const FragmentHeader header = makeFragmentHeader(1, tracks, runs);
        bytes.insert(bytes.end(), header.bytes.begin(), header.bytes.end());
        for (const SampleRun& each : runs)
            bytes.insert(bytes.end(), each.data.begin(), each.data.end());
        bytes.resize(bytes.size() + header.padding);
    }

    std::vector<FragmentReader::Run> read(OptionalError& error) {
        EXPECT_FALSE(writeAt(file.get(), 0, bytes));
        std::vector<FragmentReader::Run> runs;
        error = FragmentReader(file.get(), 0, bytes.size()).forEachRun([&](const auto& each) {
            runs.push_back(each);
        });
        return runs;
    }
    bool isDamaged() {
        OptionalError error;
        read(error);
        return error && error->code() == kMediaErrorUnreadableMovie;
    }

    TemporaryDirectory folder;
    const UniqueFd file{::open((folder.path() + "/movie").c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600)};
    const std::vector<TrackFormat> tracks{
        {}, {.type = MediaType::audio, .timescale = 44100, .lead = 1024, .codecConfiguration = Bytes(2)}};
    Bytes bytes;
};

TEST_F(FragmentTest, ReaderFindsEveryRunOfEveryFragment) {
    append({run(0, 1500, {10, 20, 30}), run(-1024, 1024, {7})});
    const std::size_t second = bytes.size();
    append({run(4500, 1500, {40}), {}});
    OptionalError error;
    const auto runs = read(error);
    EXPECT_FALSE(error);
    ASSERT_EQ(runs.size(), 3U);
    EXPECT_EQ(runs[0].track, 0U);
    EXPECT_EQ(runs[0].firstDecodeTime, 0);
    ASSERT_EQ(runs[0].samples.size(), 3U);
    EXPECT_EQ(runs[0].samples[1].size, 20U);
    EXPECT_EQ(runs[0].samples[1].timing.duration, 1500U);
    EXPECT_EQ(runs[0].samples[1].timing.compositionOffset, -3);
    EXPECT_TRUE(runs[0].samples[0].timing.isKeyFrame);
    EXPECT_FALSE(runs[0].samples[1].timing.isKeyFrame);
    EXPECT_EQ(runs[1].track, 1U);
    EXPECT_EQ(runs[1].firstDecodeTime, 0) << "the file's times include the lead";
    EXPECT_EQ(runs[2].track, 0U);
    EXPECT_EQ(runs[2].firstDecodeTime, 4500);
    EXPECT_GT(runs[2].dataOffset, second);
}

TEST_F(FragmentTest, RunsSayWhereTheirBytesLie) {
    SampleRun video = run(0, 1500, {3});
    SampleRun audio = run(0, 1024, {2});
    video.data = {std::byte{1}, std::byte{2}, std::byte{3}};
    audio.data = {std::byte{4}, std::byte{5}};
    append({video, audio});
    OptionalError error;
    const auto runs = read(error);
    ASSERT_EQ(runs.size(), 2U);
    EXPECT_EQ(bytes.at(runs[0].dataOffset), std::byte{1});
    EXPECT_EQ(bytes.at(runs[1].dataOffset), std::byte{4});
}

TEST_F(FragmentTest, SizesAreMultiplesOfEight) {
    for (const std::uint32_t size : {1U, 2U, 7U, 8U}) {
        bytes.clear();
        append({run(0, 1500, {size}), {}});
        EXPECT_EQ(bytes.size() % 8, 0U);
        EXPECT_FALSE(isDamaged());
    }
}

TEST_F(FragmentTest, HeaderLargerThanTheFirstReadIsReadWhole) {
    append({run(0, 1500, std::vector<std::uint32_t>(2000, 1)), {}});
    OptionalError error;
    const auto runs = read(error);
    EXPECT_FALSE(error);
    ASSERT_EQ(runs.size(), 1U);
    EXPECT_EQ(runs[0].samples.size(), 2000U);
}

TEST_F(FragmentTest, CutHeaderIsDamage) {
    append({run(0, 1500, std::vector<std::uint32_t>(20, 1)), {}});
    bytes.resize(100);
    EXPECT_TRUE(isDamaged());
}

TEST_F(FragmentTest, TimeBeyondAnyMovieIsDamage) {
    append({run(std::int64_t{1} << 57, 1500, {1}), {}});
    EXPECT_TRUE(isDamaged());
}

TEST_F(FragmentTest, SomethingElseThanAFragmentIsDamage) {
    append({run(0, 1500, {1}), {}});
    bytes[4] = std::byte{'f'};
    EXPECT_TRUE(isDamaged());
}

TEST_F(FragmentTest, MoreSamplesThanTheHeaderHoldsIsDamage) {
    append({run(0, 1500, {1}), {}});
    constexpr std::size_t kCountOffset = 8 + 16 + 8 + 16 + 20 + 12;
    ASSERT_EQ(bytes.at(kCountOffset + 3), std::byte{1});
    bytes[kCountOffset] = std::byte{0x10};
    EXPECT_TRUE(isDamaged());
}

}  // namespace
}  // namespace kelvo::test
