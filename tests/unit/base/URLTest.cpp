#include "base/URL.h"

#include <string>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

TEST(URLTest, FileURLOfAPlainPathIsThePathBehindTheScheme) {
    EXPECT_EQ(URL::file("/a/b.mp4").absoluteString(), "file:///a/b.mp4");
    EXPECT_TRUE(URL::file("/a").isFileURL());
}

TEST(URLTest, BytesThatAURLMayNotHoldArePercentEncoded) {
    EXPECT_EQ(URL::file("/a b%c?d#e").absoluteString(), "file:///a%20b%25c%3Fd%23e");
    EXPECT_EQ(URL::file("/é\"<>[]").absoluteString(), "file:///%C3%A9%22%3C%3E%5B%5D");
}

TEST(URLTest, BytesThatMayStandInAPathStayAsTheyAre) {
    const std::string path = "/-._~!$&'()*+,;=:@aZ09";
    EXPECT_EQ(URL::file(path).absoluteString(), "file://" + path);
}

TEST(URLTest, EveryByteButNULRoundTrips) {
    std::string path = "/";
    for (int byte = 1; byte < 256; ++byte)
        path += static_cast<char>(byte);
    EXPECT_EQ(URL::file(path).path(), path);
}

TEST(URLTest, DoubledSlashesAreKept) {
    EXPECT_EQ(URL::file("/store//a.mp4").absoluteString(), "file:///store//a.mp4");
    EXPECT_EQ(URL::file("/store//a.mp4").path(), "/store//a.mp4");
    EXPECT_EQ(URL::file("//a").path(), "//a");
}

TEST(URLTest, EncodedNULStaysEncoded) {
    EXPECT_EQ(URL("file:///a%00b").path(), "/a%00b");
}

TEST(URLTest, PathDecodesBothCasesOfDigits) {
    EXPECT_EQ(URL("file:///%c3%A9").path(), "/é");
}

TEST(URLTest, PercentSignWithoutTwoDigitsStays) {
    EXPECT_EQ(URL("file:///a%").path(), "/a%");
    EXPECT_EQ(URL("file:///a%4").path(), "/a%4");
    EXPECT_EQ(URL("file:///a%zz").path(), "/a%zz");
    EXPECT_EQ(URL("file:///a%4z").path(), "/a%4z");
    EXPECT_EQ(URL("file:///a%-1%+1").path(), "/a%-1%+1");
}

TEST(URLTest, EncodedByteAtTheEndIsDecoded) {
    EXPECT_EQ(URL("file:///%41").path(), "/A");
}

TEST(URLTest, OtherURLsHaveNoPath) {
    EXPECT_EQ(URL("https://example.org/a").path(), "");
    EXPECT_FALSE(URL("https://example.org/a").isFileURL());
    EXPECT_EQ(URL().path(), "");
}

TEST(URLTest, EqualityIsOfTheText) {
    EXPECT_EQ(URL::file("/a"), URL("file:///a"));
    EXPECT_NE(URL::file("/a"), URL::file("//a"));
}

}  // namespace
}  // namespace kelvo
