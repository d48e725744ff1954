#include "base/KVError.h"
#include "base/VideoSurface.h"
#include "platform/IPCBounds.h"
#include "platform/linux/ipc/Authentication.h"
#include "platform/linux/ipc/DBusMessage.h"
#include "platform/linux/ipc/Signature.h"

#include <fcntl.h>
#include <sys/socket.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace kelvo::dbus {
namespace {

std::string hex(const Bytes& bytes) {
    std::string text;
    for (const std::byte byte : bytes) {
        constexpr const char* kDigits = "0123456789abcdef";
        text += kDigits[std::to_integer<int>(byte >> 4)];
        text += kDigits[std::to_integer<int>(byte & std::byte{15})];
    }
    return text;
}

struct Body {
    const char* signature;
    Array values;
    const char* hexText;

    friend void PrintTo(const Body& body, std::ostream* out) {
        *out << body.signature << " as " << body.hexText;
    }
};
class BodyTest : public testing::TestWithParam<Body> {};

TEST_P(BodyTest, WritesExactlyTheseBytesAndReadsThemBack) {
    Message message;
    message.signature = GetParam().signature;
    ASSERT_FALSE(writeBody(GetParam().values, message));
    EXPECT_EQ(hex(message.body), GetParam().hexText);
    const auto values = readBody(message, false);
    ASSERT_TRUE(values) << values.error().description();
    EXPECT_EQ(*values, GetParam().values);
}

INSTANTIATE_TEST_SUITE_P(
    Types, BodyTest,
    testing::Values(Body{"", {}, ""}, Body{"b", {true}, "01000000"}, Body{"i", {-2}, "feffffff"},
                    Body{"u", {std::uint32_t{0xffffffff}}, "ffffffff"}, Body{"x", {-1}, "ffffffffffffffff"},
                    Body{"d", {1.5}, "000000000000f83f"}, Body{"s", {"hé"}, "0300000068c3a900"},
                    Body{"bx", {true, 1}, "01000000000000000100000000000000"},
                    Body{"(dd)", {Array{0.0, 1.5}}, "0000000000000000000000000000f83f"},
                    Body{"au", {Array{1, 2}}, "080000000100000002000000"},
                    Body{"ay", {Bytes{std::byte{7}}}, "0100000007"}, Body{"as", {Array{}}, "00000000"},
                    Body{"ax", {Array{}}, "0000000000000000"},
                    Body{"a{sv}",
                         {Dictionary{{"k", true}}},
                         "1000000000000000010000006b00016200000000"
                         "01000000"},
                    Body{"a{sv}", {Dictionary{{"k", Value()}}}, "0a00000000000000010000006b0001790000"},
                    Body{"a{sv}",
                         {Dictionary{{"u", URL("l")}}},
                         "1600000000000000010000007500032873290000000000000100"
                         "00006c00"},
                    Body{"a(sxa{sv})",
                         {Array{Array{"d", -5, Dictionary{}}}},
                         "1800000000000000"
                         "0100000064000000"
                         "fbffffffffffffff"
                         "0000000000000000"}));

struct Kind {
    const char* name;
    Value value;

    friend void PrintTo(const Kind& kind, std::ostream* out) { *out << kind.name; }
};
class ValueTest : public testing::TestWithParam<Kind> {};

TEST_P(ValueTest, SurvivesAVariant) {
    Message message;
    message.signature = "a{sv}";
    const Array sent{Dictionary{{"key", GetParam().value}}};
    ASSERT_FALSE(writeBody(sent, message));
    EXPECT_EQ(*readBody(message, false), sent);
}

INSTANTIATE_TEST_SUITE_P(Kinds, ValueTest,
                         testing::Values(Kind{"nothing", Value()}, Kind{"boolean", false},
                                         Kind{"negative", -7}, Kind{"large", std::uint64_t{UINT64_MAX}},
                                         Kind{"double", 0.5}, Kind{"text", "text"}, Kind{"bytes", Bytes(5)},
                                         Kind{"date", Date{-3}}, Kind{"URL", URL("file:///a b")},
                                         Kind{"error", KVError("d", -5800, {{"k", Array{1}}})},
                                         Kind{"array", Array{1, Array{"x"}}},
                                         Kind{"dictionary", Dictionary{{"a", Dictionary{{"b", 1}}}}}));

TEST(BodyWriter, RefusesWhatDoesNotFit) {
    const std::vector<std::pair<const char*, Array>> wrong{{"b", {1}},
                                                           {"i", {std::int64_t{1} << 40}},
                                                           {"u", {-1}},
                                                           {"s", {1}},
                                                           {"s", {"\xff"}},
                                                           {"", {1}},
                                                           {"i", {}},
                                                           {"(dd)", {Array{1.0}}},
                                                           {"ay", {"x"}},
                                                           {"h", {1}},
                                                           {"(huuuu)", {Array{0, 1, 1, 4, 0}}},
                                                           {"s", {std::string("a\0b", 3)}}};
    for (const auto& [signature, values] : wrong) {
        Message message;
        message.signature = signature;
        EXPECT_TRUE(writeBody(values, message)) << signature;
    }
}

struct Broken {
    const char* signature;
    Bytes body;
};

TEST(BodyReader, RefusesWhatIsNotWellFormed) {
    const auto bytes = [](std::initializer_list<int> numbers) {
        Bytes all;
        for (const int number : numbers)
            all.push_back(static_cast<std::byte>(number));
        return all;
    };
    const std::vector<Broken> all{
        {"b", bytes({2, 0, 0, 0})},
        {"i", bytes({1, 0, 0})},
        {"i", bytes({1, 0, 0, 0, 0})},
        {"s", bytes({9, 0, 0, 0, 'x', 0})},
        {"s", bytes({1, 0, 0, 0, 'x', 1})},
        {"s", bytes({1, 0, 0, 0, 0xff, 0})},
        {"ai", bytes({8, 0, 0, 0, 1, 0, 0, 0})},
        {"ai", bytes({5, 0, 0, 0, 1, 0, 0, 0, 2})},
        {"yi", bytes({1, 1, 0, 0, 1, 0, 0, 0})},
        {"v", bytes({0, 0})},
        {"v", bytes({2, 'i', 'i', 0})},
        {"v", bytes({1, 'z', 0})},
        {"h", bytes({0, 0, 0, 0})},
        {"a{si}", bytes({0, 0, 0, 0, 0, 0, 0, 0})},
        {"(", bytes({})},
        {"a", bytes({0, 0, 0, 0})},
    };
    for (const Broken& each : all) {
        Message message;
        message.signature = each.signature;
        message.body = each.body;
        EXPECT_FALSE(readBody(message, true)) << each.signature;
    }
}

TEST(BodyReader, VariantsInsideVariantsEndAtTheBound) {
    Message message;
    message.signature = "v";
    for (int i = 0; i < 200; ++i)
        message.body.insert(message.body.end(), {std::byte{1}, std::byte{'v'}, std::byte{0}});
    EXPECT_FALSE(readBody(message, false));
}

TEST(BodyReader, ArrayBeyondItsBoundIsRefused) {
    Message message;
    message.signature = "ab";
    Array values;
    values.emplace_back(Array(ipc_bounds::kMostElements, Value(true)));
    ASSERT_FALSE(writeBody(values, message));
    EXPECT_TRUE(readBody(message, false));
    message.body.clear();
    values.front() = Array(ipc_bounds::kMostElements + 1, Value(true));
    ASSERT_FALSE(writeBody(values, message));
    EXPECT_FALSE(readBody(message, false));
}

class SurfaceBodyTest : public testing::Test {
  protected:
    SurfaceBodyTest() {
        message.signature = "(huuuu)";
        EXPECT_FALSE(writeBody({Value(std::shared_ptr<ObjectHandle>(surface))}, message));
        for (const SentDescriptor& sent : message.sentDescriptors)
            message.descriptors.emplace_back(::fcntl(sent.descriptor, F_DUPFD_CLOEXEC, 0));
    }
    VideoSurfaceRef surface = *VideoSurface::create(VideoSurface::Geometry::packed(4, 2));
    Message message;
};

TEST_F(SurfaceBodyTest, SurfaceTravelsAsItsDescriptorAndGeometry) {
    EXPECT_EQ(hex(message.body),
              "00000000040000000200000010000000"
              "78524742");
    const auto values = readBody(message, true);
    ASSERT_TRUE(values);
    const auto read =
        std::dynamic_pointer_cast<VideoSurface>(*values->at(0).as<std::shared_ptr<ObjectHandle>>());
    ASSERT_NE(read, nullptr);
    EXPECT_EQ(read->geometry(), surface->geometry());
}

TEST_F(SurfaceBodyTest, DescriptorThatIsSentKeepsItsSurface) {
    const std::weak_ptr<VideoSurface> held = surface;
    const int descriptor = surface->descriptor();
    surface = nullptr;
    ASSERT_EQ(message.sentDescriptors.size(), 1U);
    EXPECT_EQ(message.sentDescriptors.front().descriptor, descriptor) << "the surface's own";
    EXPECT_FALSE(held.expired());
    message.sentDescriptors.clear();
    EXPECT_TRUE(held.expired());
}

TEST_F(SurfaceBodyTest, SurfaceWhereNoneIsAllowedIsRefused) {
    EXPECT_FALSE(readBody(message, false));
}

TEST_F(SurfaceBodyTest, SurfaceThatIsTooSmallForWhatItClaimsIsRefused) {
    message.body[8] = std::byte{200};
    EXPECT_FALSE(readBody(message, true));
}

TEST_F(SurfaceBodyTest, DescriptorIsTakenOnce) {
    EXPECT_TRUE(readBody(message, true));
    EXPECT_FALSE(readBody(message, true));
}

TEST(WholeMessage, IsExactlyTheseBytes) {
    Message message;
    message.serial = 3;
    message.path = "/com/quillon/kelvod";
    message.interface = "a.b";
    message.member = "pause";
    message.signature = "b";
    ASSERT_FALSE(writeBody({true}, message));
    const Bytes bytes = serialize(message);
    EXPECT_EQ(hex(bytes),
              "6c010001"
              "04000000"
              "03000000"
              "47000000"
              "01016f00"
              "13000000"
              "2f636f6d2f7175696c6c6f6e2f6b656c766f6400"
              "00000000"
              "02017300"
              "03000000"
              "612e6200"
              "00000000"
              "03017300"
              "05000000"
              "7061757365000000"
              "08016700"
              "01620000"
              "01000000");
    std::uint32_t descriptorCount = 9;
    const auto parsed = parse(bytes, descriptorCount);
    ASSERT_TRUE(parsed) << parsed.error().description();
    EXPECT_EQ(descriptorCount, 0U);
    EXPECT_EQ(parsed->serial, 3U);
    EXPECT_EQ(parsed->path, message.path);
    EXPECT_EQ(parsed->interface, "a.b");
    EXPECT_EQ(parsed->member, "pause");
    EXPECT_EQ(parsed->signature, "b");
    EXPECT_EQ(parsed->body, message.body);
    for (std::size_t cut = 0; cut < bytes.size(); ++cut)
        EXPECT_FALSE(parse(std::span(bytes).first(cut), descriptorCount)) << cut;
    EXPECT_EQ(*messageSize(bytes), bytes.size());
}

TEST(SignatureCheck, KnowsCompleteTypes) {
    for (const char* valid : {"", "b", "a{sv}", "a(sxa{sv})", "aa{sv}", "(huuuu)", "av"})
        EXPECT_TRUE(isValidSignature(valid)) << valid;
    for (const char* invalid : {"a", "(", "()", "a{", "a{vs}", "a{sv", "a{}", "z", "(b", "b)", "{sv}"})
        EXPECT_FALSE(isValidSignature(invalid)) << invalid;
    EXPECT_FALSE(isValidSignature(std::string(100, 'a') + "b"));
    EXPECT_FALSE(isValidSignature(std::string(256, 'b')));
    EXPECT_FALSE(isSingleType("bb"));
    EXPECT_FALSE(isSingleType(""));
}

class AuthenticationTest : public testing::Test {
  protected:
    using State = ServerAuthentication::State;
    State say(const std::string& text) {
        for (const char character : text)
            incoming.push_back(static_cast<std::byte>(character));
        answers.clear();
        return server.take(incoming, answers);
    }
    ServerAuthentication server{1000};
    Bytes incoming;
    std::string answers;
};

TEST_F(AuthenticationTest, AsksWhichMechanismsThereAreThenNamesItself) {
    EXPECT_EQ(say(std::string(1, '\0') + "AUTH\r\n"), State::talking);
    EXPECT_EQ(answers, "REJECTED EXTERNAL\r\n");
    EXPECT_EQ(say("AUTH EXTERNAL 31303030\r\n"), State::talking);
    EXPECT_THAT(answers, testing::StartsWith("OK "));
    EXPECT_EQ(say("NEGOTIATE_UNIX_FD\r\nBEGIN\r\nl"), State::done);
    EXPECT_EQ(answers, "AGREE_UNIX_FD\r\n");
    EXPECT_EQ(incoming, Bytes{std::byte{'l'}}) << "the first message is left alone";
}

TEST_F(AuthenticationTest, EmptyIdentityIsTheKernels) {
    EXPECT_EQ(say(std::string(1, '\0') + "AUTH EXTERNAL\r\nDATA\r\nBEGIN\r\n"), State::done);
}

TEST_F(AuthenticationTest, AnotherIdentityIsRejected) {
    say(std::string(1, '\0') + "AUTH EXTERNAL 30\r\n");
    EXPECT_EQ(answers, "REJECTED EXTERNAL\r\n");
    EXPECT_EQ(say("BEGIN\r\n"), State::failed);
}

TEST_F(AuthenticationTest, FirstByteMustBeZero) {
    EXPECT_EQ(say("AUTH\r\n"), State::failed);
}

TEST_F(AuthenticationTest, LineThatNeverEndsFails) {
    EXPECT_EQ(say(std::string(1, '\0') + std::string(5000, 'x')), State::failed);
}

TEST_F(AuthenticationTest, ClientAndServerUnderstandEachOther) {
    EXPECT_EQ(say(clientGreeting(1000)), State::done);
    Bytes reply;
    for (const char character : answers + "l")
        reply.push_back(static_cast<std::byte>(character));
    EXPECT_EQ(skipAnswers(reply), State::done);
    EXPECT_EQ(reply.size(), 1U);
}

}  // namespace
}  // namespace kelvo::dbus
