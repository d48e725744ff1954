#include "ipc/CBOR.h"
#include "ipc/KVArchive.h"
#include "ipc/KVBroadcastConfigurationCoding.h"
#include "ipc/KVIOSurfaceObjectCoding.h"

#include <cmath>
#include <limits>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo {
namespace {

constexpr cbor::Bounds kBounds{16, 1000};

std::string hex(const Bytes& bytes) {
    std::string text;
    for (const std::byte byte : bytes) {
        constexpr const char* kDigits = "0123456789abcdef";
        text += kDigits[std::to_integer<int>(byte >> 4)];
        text += kDigits[std::to_integer<int>(byte & std::byte{15})];
    }
    return text;
}

Bytes fromHex(const std::string& text) {
    Bytes bytes;
    for (std::size_t i = 0; i + 1 < text.size(); i += 2)
        bytes.push_back(static_cast<std::byte>(std::stoi(text.substr(i, 2), nullptr, 16)));
    return bytes;
}

/// "KVBroadcastConfiguration" under "$class", and the key "clipDuration".
constexpr const char* kClassEntry = "6624636c61737378184b5642726f616463617374436f6e66696775726174696f6e";
constexpr const char* kClipDurationKey = "6c636c69704475726174696f6e";

using Configuration = KVBroadcastConfigurationCoding;

TEST(BroadcastConfigurationArchive, WithoutPropertiesHoldsTheClipDurationAlone) {
    const Bytes archive = archivedData<Configuration>(KVBroadcastConfiguration());
    EXPECT_EQ(hex(archive), std::string("a2") + kClassEntry + kClipDurationKey + "fb0000000000000000");
    const auto decoded = unarchived<Configuration>(archive);
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->clipDuration(), 0.0);
    EXPECT_FALSE(decoded->videoCompressionProperties());
}

TEST(BroadcastConfigurationArchive, HoldsItsPropertiesByteForByte) {
    KVBroadcastConfiguration configuration;
    configuration.setClipDuration(5.5);
    configuration.setVideoCompressionProperties(Dictionary{{"rate", 300}});
    const Bytes archive = archivedData<Configuration>(configuration);
    EXPECT_EQ(hex(archive), std::string("a3") + kClassEntry + kClipDurationKey + "fb4016000000000000" +
                                "781a766964656f436f6d7072657373696f6e50726f70657274696573" +
                                "a1647261746519012c");
    const auto decoded = unarchived<Configuration>(archive);
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->clipDuration(), 5.5);
    EXPECT_EQ(decoded->videoCompressionProperties(), (Dictionary{{"rate", 300}}));
}

TEST(BroadcastConfigurationArchive, EmptyPropertiesAreLeftOut) {
    KVBroadcastConfiguration configuration;
    configuration.setVideoCompressionProperties(Dictionary());
    EXPECT_EQ(archivedData<Configuration>(configuration),
              archivedData<Configuration>(KVBroadcastConfiguration()));
}

TEST(BroadcastConfigurationArchive, MissingOrWronglyTypedEntriesReadAsAbsent) {
    for (const Dictionary& entries :
         {Dictionary(), Dictionary{{"clipDuration", "5"}, {"videoCompressionProperties", Array{1}}},
          Dictionary{{"clipDuration", true}, {"videoCompressionProperties", true}},
          Dictionary{{"clipDuration", Array{5.0}}}, Dictionary{{"clipDuration", Value()}}}) {
        const auto decoded = unarchived<Configuration>(archiveRecord(Configuration::kClassName, entries));
        ASSERT_TRUE(decoded);
        EXPECT_EQ(decoded->clipDuration(), 0.0);
        EXPECT_FALSE(decoded->videoCompressionProperties());
    }
}

TEST(BroadcastConfigurationArchive, WholeNumberIsAClipDuration) {
    const auto decoded =
        unarchived<Configuration>(archiveRecord(Configuration::kClassName, {{"clipDuration", 5}}));
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->clipDuration(), 5.0);
}

TEST(BroadcastConfigurationArchive, ClipDurationThatIsNotFiniteIsANumberAllTheSame) {
    const auto durationOf = [](double archived) {
        KVBroadcastConfiguration configuration;
        configuration.setClipDuration(archived);
        const auto decoded = unarchived<Configuration>(archivedData<Configuration>(configuration));
        return decoded ? decoded->clipDuration() : 0;
    };
    constexpr double kInfinity = std::numeric_limits<double>::infinity();
    EXPECT_TRUE(std::isnan(durationOf(std::numeric_limits<double>::quiet_NaN())));
    EXPECT_EQ(durationOf(kInfinity), kInfinity);
    EXPECT_EQ(durationOf(-kInfinity), -kInfinity);
}

TEST(BroadcastConfigurationArchive, OtherClassIsRefused) {
    EXPECT_FALSE(unarchived<Configuration>(archiveRecord("KVIOSurfaceObject", {})));
    EXPECT_FALSE(unarchived<Configuration>(cbor::encode(Dictionary{{"clipDuration", 1.0}})));
    EXPECT_FALSE(unarchived<Configuration>(cbor::encode(Dictionary{{"$class", 1}})));
    EXPECT_FALSE(unarchived<Configuration>(cbor::encode(Array())));
    EXPECT_FALSE(unarchived<Configuration>(Bytes()));
}

TEST(BroadcastConfigurationArchive, LargerThanTheBoundIsRefused) {
    const Bytes archive = archiveRecord(Configuration::kClassName, {{"x", Bytes(kLargestArchive)}});
    EXPECT_EQ(unarchived<Configuration>(archive).error().code(), EMSGSIZE);
}

class SurfaceObjectCodingTest : public testing::Test {
  protected:
    VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
};

TEST_F(SurfaceObjectCodingTest, MessageCarriesTheSurface) {
    KVIOSurfaceObject object;
    object.setIOSurface(surface);
    KVCoder coder(KVCoder::Kind::ipc);
    KVIOSurfaceObjectCoding::encodeWithCoder(object, coder);
    EXPECT_TRUE(coder.entries().contains("ioSurface"));
    EXPECT_EQ(KVIOSurfaceObjectCoding::initWithCoder(coder).ioSurface(), surface);
}

TEST_F(SurfaceObjectCodingTest, OrdinaryArchiveHasNoSurfaceKeyAndReadsBackWithoutASurface) {
    KVIOSurfaceObject object;
    object.setIOSurface(surface);
    const Bytes archive = archivedData<KVIOSurfaceObjectCoding>(object);
    EXPECT_EQ(hex(archive), "a16624636c617373714b56494f537572666163654f626a656374");
    const auto decoded = unarchived<KVIOSurfaceObjectCoding>(archive);
    ASSERT_TRUE(decoded);
    EXPECT_EQ(decoded->ioSurface(), nullptr);
}

TEST_F(SurfaceObjectCodingTest, SurfaceInAnArchiveThatIsNoMessageIsNotTaken) {
    const Dictionary entries{{"ioSurface", std::shared_ptr<ObjectHandle>(surface)}};
    const auto surfaceBy = [&](KVCoder::Kind kind) {
        return KVIOSurfaceObjectCoding::initWithCoder(KVCoder(kind, entries)).ioSurface();
    };
    EXPECT_EQ(surfaceBy(KVCoder::Kind::archive), nullptr);
    EXPECT_EQ(surfaceBy(KVCoder::Kind::ipc), surface);
}

TEST_F(SurfaceObjectCodingTest, AnotherSurfaceTakesThePlaceOfTheOneHeldWhichIsReleased) {
    const VideoSurfaceRef other = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
    KVIOSurfaceObject object;
    object.setIOSurface(surface);
    object.setIOSurface(other);
    EXPECT_EQ(object.ioSurface(), other);
    EXPECT_EQ(surface.use_count(), 1);
    EXPECT_EQ(other.use_count(), 2);
}

TEST_F(SurfaceObjectCodingTest, SettingNothingReleasesTheSurfaceHeld) {
    KVIOSurfaceObject object;
    object.setIOSurface(surface);
    object.setIOSurface(nullptr);
    EXPECT_EQ(object.ioSurface(), nullptr);
    EXPECT_EQ(surface.use_count(), 1);
    object.setIOSurface(nullptr);
    EXPECT_EQ(object.ioSurface(), nullptr);
}

TEST_F(SurfaceObjectCodingTest, ObjectWithoutASurfaceWritesNothing) {
    KVCoder coder(KVCoder::Kind::ipc);
    KVIOSurfaceObjectCoding::encodeWithCoder(KVIOSurfaceObject(), coder);
    EXPECT_TRUE(coder.entries().empty());
}

TEST_F(SurfaceObjectCodingTest, EntryThatIsNoSurfaceLeavesTheObjectEmpty) {
    for (const Value& entry : {Value(1), Value(std::shared_ptr<ObjectHandle>())}) {
        const KVCoder coder(KVCoder::Kind::ipc, {{"ioSurface", entry}});
        EXPECT_EQ(KVIOSurfaceObjectCoding::initWithCoder(coder).ioSurface(), nullptr);
    }
}

TEST_F(SurfaceObjectCodingTest, SameSurfaceTwiceIsHeldOnce) {
    {
        KVIOSurfaceObject object;
        object.setIOSurface(surface);
        object.setIOSurface(surface);
        EXPECT_EQ(surface.use_count(), 2);
    }
    EXPECT_EQ(surface.use_count(), 1);
}

struct Sample {
    const char* hexText;
    Value value;

    friend void PrintTo(const Sample& sample, std::ostream* out) { *out << sample.hexText; }
};
class CBORTest : public testing::TestWithParam<Sample> {};

TEST_P(CBORTest, WritesExactlyTheseBytesAndReadsThemBack) {
    EXPECT_EQ(hex(cbor::encode(GetParam().value)), GetParam().hexText);
    const auto decoded = cbor::decode(fromHex(GetParam().hexText), kBounds);
    ASSERT_TRUE(decoded) << decoded.error().description();
    EXPECT_EQ(*decoded, GetParam().value);
}

INSTANTIATE_TEST_SUITE_P(
    Values, CBORTest,
    testing::Values(
        Sample{"00", 0}, Sample{"17", 23}, Sample{"1818", 24}, Sample{"18ff", 255}, Sample{"190100", 256},
        Sample{"1a000f4240", 1000000}, Sample{"1b000000e8d4a51000", 1000000000000},
        Sample{"1bffffffffffffffff", std::uint64_t{UINT64_MAX}}, Sample{"20", -1}, Sample{"3903e7", -1000},
        Sample{"3b7fffffffffffffff", std::int64_t{INT64_MIN}}, Sample{"f4", false}, Sample{"f5", true},
        Sample{"f6", Value()}, Sample{"fb3ff199999999999a", 1.1}, Sample{"62c3bc", "ü"},
        Sample{"64f0908591", "\xf0\x90\x85\x91"}, Sample{"420102", Bytes{std::byte{1}, std::byte{2}}},
        Sample{"8201820203", Array{1, Array{2, 3}}},
        Sample{"a26162016161f5", Dictionary{{"b", 1}, {"a", true}}}, Sample{"d820616c", URL("l")},
        Sample{"c1fb3ff8000000000000", Date{1500000000}}, Sample{"d99f6183616426a0", KVError("d", -7)}));

class BrokenCBORTest : public testing::TestWithParam<const char*> {};

TEST_P(BrokenCBORTest, IsAnError) {
    EXPECT_FALSE(cbor::decode(fromHex(GetParam()), kBounds));
}

INSTANTIATE_TEST_SUITE_P(Inputs, BrokenCBORTest,
                         testing::Values("", "18", "1900", "62c3", "61ff", "62c080", "63eda080", "64f4908080",
                                         "42", "0000", "81", "9f00ff", "5f4101ff", "a10101", "a2616101616102",
                                         "a1", "c1", "c16161", "d82001", "f7f7", "f8ff", "f93c00",
                                         "fa3f800000", "3bffffffffffffffff", "9bffffffffffffffff",
                                         "bbffffffffffffffff", "5bffffffffffffffff", "d99f6101",
                                         "d99f618361640100", "c600", "1c", "c1fb7ff8000000000000"));

TEST(CBORBounds, DeepNestingIsRefused) {
    EXPECT_TRUE(cbor::decode(fromHex("8181818100"), {4, 1000}));
    EXPECT_FALSE(cbor::decode(fromHex("818181818100"), {4, 1000}));
    EXPECT_FALSE(cbor::decode(Bytes(100000, std::byte{0x81}), kBounds));
    EXPECT_FALSE(cbor::decode(Bytes(100000, std::byte{0xc1}), kBounds)) << "tags nest, too";
}

TEST(CBORBounds, ManyItemsAreRefused) {
    EXPECT_TRUE(cbor::decode(cbor::encode(Array(9)), {4, 10}));
    EXPECT_FALSE(cbor::decode(cbor::encode(Array(10)), {4, 10}));
}

TEST(CBORBounds, ObjectByHandleReadsAsNothing) {
    const auto surface = *VideoSurface::create(VideoSurface::Geometry::packed(2, 2));
    const Bytes bytes = cbor::encode(Value(std::shared_ptr<ObjectHandle>(surface)));
    EXPECT_EQ(hex(bytes), "f7");
    EXPECT_TRUE(cbor::decode(bytes, kBounds)->isNothing());
}

}  // namespace
}  // namespace kelvo
