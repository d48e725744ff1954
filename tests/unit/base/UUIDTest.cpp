#include "base/UUID.h"

#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr std::array<std::uint8_t, 16> kAllOnes{0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF,
                                                0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF};

TEST(UUIDTest, TextIsUpperCaseInFiveGroups) {
    const UUID uuid{
        {0x00, 0x11, 0x22, 0x33, 0x44, 0x55, 0x66, 0x77, 0x88, 0x99, 0xAA, 0xBB, 0xCC, 0xDD, 0xEE, 0xFF}};
    EXPECT_EQ(uuid.text(), "00112233-4455-6677-8899-AABBCCDDEEFF");
}

TEST(UUIDTest, RandomBytesGetTheVersionAndTheVariant) {
    EXPECT_EQ(UUID::fromRandomBytes({}).text(), "00000000-0000-4000-8000-000000000000");
    EXPECT_EQ(UUID::fromRandomBytes(kAllOnes).text(), "FFFFFFFF-FFFF-4FFF-BFFF-FFFFFFFFFFFF");
}

TEST(UUIDTest, EqualityIsOfTheBytes) {
    EXPECT_EQ(UUID::fromRandomBytes(kAllOnes), UUID::fromRandomBytes(kAllOnes));
    EXPECT_NE(UUID::fromRandomBytes(kAllOnes), UUID());
}

}  // namespace
}  // namespace kelvo
