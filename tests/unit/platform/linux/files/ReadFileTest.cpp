#include "platform/linux/files/ReadFile.h"
#include "support/TemporaryDirectory.h"

#include <cerrno>
#include <sys/stat.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

class ReadFileTest : public testing::Test {
  protected:
    const test::TemporaryDirectory folder;
};

TEST_F(ReadFileTest, ContentIsReadWhole) {
    const std::string content("a\0b\n", 4);
    const auto read = readFile(folder.write("x", content), 4);
    ASSERT_TRUE(read);
    EXPECT_EQ(*read, content);
}

TEST_F(ReadFileTest, FileLargerThanTheBoundIsRefused) {
    const auto read = readFile(folder.write("x", "12345"), 4);
    ASSERT_FALSE(read);
    EXPECT_EQ(read.error().code(), EFBIG);
}

TEST_F(ReadFileTest, MissingFileIsAnError) {
    const auto read = readFile(folder.path() + "/none", 4);
    ASSERT_FALSE(read);
    EXPECT_EQ(read.error().code(), ENOENT);
}

TEST_F(ReadFileTest, DirectoryIsRefused) {
    const auto read = readFile(folder.path(), 4);
    ASSERT_FALSE(read);
    EXPECT_EQ(read.error().code(), EISDIR);
}

TEST_F(ReadFileTest, PipeIsRefusedInsteadOfWaitedFor) {
    const std::string pipe = folder.path() + "/pipe";
    ASSERT_EQ(::mkfifo(pipe.c_str(), 0600), 0);
    const auto read = readFile(pipe, 4);
    ASSERT_FALSE(read);
    EXPECT_EQ(read.error().code(), EINVAL);
}

}  // namespace
}  // namespace kelvo
