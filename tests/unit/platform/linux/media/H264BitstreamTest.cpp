#include "platform/linux/media/H264Bitstream.h"

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

Bytes bytesOf(std::initializer_list<int> numbers) {
    Bytes bytes;
    for (const int number : numbers)
        bytes.push_back(static_cast<std::byte>(number));
    return bytes;
}

Bytes withSizes(std::initializer_list<int> units) {
    Bytes output;
    appendWithSizes(bytesOf(units), output);
    return output;
}

TEST(H264BitstreamTest, StartCodesBecomeSizes) {
    EXPECT_EQ(withSizes({0, 0, 0, 1, 0x65, 9, 8, 0, 0, 1, 0x41, 7}),
              bytesOf({0, 0, 0, 3, 0x65, 9, 8, 0, 0, 0, 2, 0x41, 7}));
}

TEST(H264BitstreamTest, UnitsAreAppended) {
    Bytes output = bytesOf({42});
    appendWithSizes(bytesOf({0, 0, 1, 0x65}), output);
    EXPECT_EQ(output, bytesOf({42, 0, 0, 0, 1, 0x65}));
}

TEST(H264BitstreamTest, ZerosBehindAUnitAreNotOfIt) {
    EXPECT_EQ(withSizes({0, 0, 1, 0x65, 5, 0, 0, 0, 0, 1, 0x41, 0, 0}),
              bytesOf({0, 0, 0, 2, 0x65, 5, 0, 0, 0, 1, 0x41}));
}

TEST(H264BitstreamTest, OnesThatEndNoStartCodeStayInTheUnit) {
    EXPECT_EQ(withSizes({0, 0, 1, 0x65, 1, 0, 1, 1, 0, 2, 1}),
              bytesOf({0, 0, 0, 8, 0x65, 1, 0, 1, 1, 0, 2, 1}));
}

TEST(H264BitstreamTest, BytesBeforeTheFirstStartCodeAreDropped) {
    EXPECT_EQ(withSizes({9, 9, 0, 0, 1, 0x65}), bytesOf({0, 0, 0, 1, 0x65}));
    EXPECT_EQ(withSizes({9, 9, 9}), Bytes());
    EXPECT_EQ(withSizes({}), Bytes());
    EXPECT_EQ(withSizes({0, 0, 1}), Bytes());
}

TEST(H264BitstreamTest, HighProfileConfigurationSaysItsColourFormat) {
    EXPECT_EQ(avcConfiguration(bytesOf({0, 0, 0, 1, 0x67, 100, 0, 40, 0xAC, 0, 0, 0, 1, 0x68, 0xEB})),
              bytesOf({1,  100,  0, 40, 0xFF, 0xE1, 0,    5,    0x67, 100,  0,
                       40, 0xAC, 1, 0,  2,    0x68, 0xEB, 0xFD, 0xF8, 0xF8, 0}));
}

TEST(H264BitstreamTest, OlderProfilesEndWithTheParameterSets) {
    EXPECT_EQ(avcConfiguration(bytesOf({0, 0, 1, 0x67, 66, 0xC0, 30, 0, 0, 1, 0x68, 0xCE})),
              bytesOf({1, 66, 0xC0, 30, 0xFF, 0xE1, 0, 4, 0x67, 66, 0xC0, 30, 1, 0, 2, 0x68, 0xCE}));
}

TEST(H264BitstreamTest, OtherUnitsAndLaterSetsAreNoConfiguration) {
    const Bytes plain = avcConfiguration(bytesOf({0, 0, 1, 0x67, 66, 0xC0, 30, 0, 0, 1, 0x68, 0xCE}));
    EXPECT_EQ(avcConfiguration(bytesOf({0,    0,    1, 6, 5, 0,    0,  1, 0x67, 66, 0xC0, 30, 0,    0,   1,
                                        0x68, 0xCE, 0, 0, 1, 0x67, 77, 0, 31,   0,  0,    1,  0x68, 0xCF})),
              plain);
}

TEST(H264BitstreamTest, MissingParameterSetIsNoConfiguration) {
    EXPECT_TRUE(avcConfiguration(bytesOf({0, 0, 1, 0x67, 100, 0, 40})).empty());
    EXPECT_TRUE(avcConfiguration(bytesOf({0, 0, 1, 0x68, 0xEB})).empty());
    EXPECT_TRUE(avcConfiguration(bytesOf({0, 0, 1, 0x67, 100, 0, 0, 0, 1, 0x68, 0xEB})).empty());
    EXPECT_TRUE(avcConfiguration({}).empty());
}

}  // namespace
}  // namespace kelvo::test
