#include "base/MediaRecords.h"
#include "base/UniqueFd.h"
#include "platform/linux/media/BoxReader.h"
#include "platform/linux/media/BoxWriter.h"
#include "platform/linux/media/FileWriting.h"
#include "support/TemporaryDirectory.h"

#include <cerrno>
#include <fcntl.h>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

Bytes bytesOf(std::initializer_list<int> numbers) {
    Bytes bytes;
    for (const int number : numbers)
        bytes.push_back(static_cast<std::byte>(number));
    return bytes;
}

TEST(BoxWriterTest, NumbersAreBigEndian) {
    BoxWriter writer;
    writer.u8(0x12);
    writer.u16(0x1234);
    writer.u24(0x123456);
    writer.u32(0x12345678);
    writer.u64(0x0102030405060708);
    EXPECT_EQ(writer.bytes(),
              bytesOf({0x12, 0x12, 0x34, 0x12, 0x34, 0x56, 0x12, 0x34, 0x56, 0x78, 1, 2, 3, 4, 5, 6, 7, 8}));
    EXPECT_EQ(writer.position(), 18U);
}

TEST(BoxWriterTest, BoxHasTheSizeOfAllThatWasWrittenIntoIt) {
    BoxWriter writer;
    writer.box("outr", [&] { writer.fullBox("innr", 1, 0x020304, [&] { writer.zeros(2); }); });
    EXPECT_EQ(writer.bytes(),
              bytesOf({0, 0, 0, 22, 'o', 'u', 't', 'r', 0, 0, 0, 14, 'i', 'n', 'n', 'r', 1, 2, 3, 4, 0, 0}));
}

class BoxWriterFileTest : public testing::Test {
  protected:
    Bytes content(std::size_t size) const {
        Bytes read(size + 1);
        read.resize(static_cast<std::size_t>(readAt(file.get(), 0, read)));
        return read;
    }

    TemporaryDirectory folder;
    const std::string path = folder.path() + "/boxes";
    UniqueFd file{::open(path.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600)};
};

TEST_F(BoxWriterFileTest, FileHoldsWhatMemoryWould) {
    const auto write = [](BoxWriter& writer) {
        writer.box("long", [&] {
            const std::uint64_t count = writer.position();
            writer.u32(0);
            for (std::uint32_t i = 0; i < 100000; ++i)
                writer.u32(i * i);
            writer.patch32(count, 100000);  // far behind in the file by now
        });
    };
    BoxWriter inMemory;
    write(inMemory);
    BoxWriter inFile(file.get(), 0);
    write(inFile);
    EXPECT_LT(inFile.bytes().size(), 100000U) << "the buffer grows with what is written";
    EXPECT_FALSE(inFile.flush());
    EXPECT_EQ(content(inMemory.bytes().size()), inMemory.bytes());
    EXPECT_EQ(inFile.position(), inMemory.position());
}

TEST_F(BoxWriterFileTest, PatchMayLieAstrideWhatIsWrittenOut) {
    constexpr std::size_t kJustBelowTheBuffersSize = 64 * 1024 - 2;
    BoxWriter writer(file.get(), 0);
    writer.zeros(kJustBelowTheBuffersSize);
    writer.u16(0);  // goes out with the rest
    writer.u16(0);  // stays
    writer.patch32(kJustBelowTheBuffersSize, 0x01020304);
    EXPECT_FALSE(writer.flush());
    const Bytes written = content(kJustBelowTheBuffersSize + 4);
    ASSERT_EQ(written.size(), kJustBelowTheBuffersSize + 4);
    EXPECT_EQ(Bytes(written.end() - 4, written.end()), bytesOf({1, 2, 3, 4}));
}

TEST_F(BoxWriterFileTest, FirstFailureIsKept) {
    const UniqueFd readOnly(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
    BoxWriter writer(readOnly.get(), 0);
    writer.u32(1);
    const OptionalError error = writer.flush();
    ASSERT_TRUE(error);
    EXPECT_EQ(error->code(), EBADF);
    writer.patch32(0, 2);
    EXPECT_TRUE(writer.flush());
}

TEST(BoxReaderTest, ReadsWhatTheWriterWrote) {
    BoxWriter writer;
    writer.box("one ", [&] { writer.u32(7); });
    writer.box("two ", [&] { writer.u64(8); });
    BoxReader reader(writer.bytes());
    const auto one = reader.box();
    ASSERT_TRUE(one);
    EXPECT_EQ(one->type, fourCharacterCode("one "));
    EXPECT_EQ(BoxReader(one->content).u32(), 7U);
    const auto two = reader.box();
    ASSERT_TRUE(two);
    EXPECT_EQ(two->type, fourCharacterCode("two "));
    EXPECT_EQ(BoxReader(two->content).u64(), 8U);
    EXPECT_FALSE(reader.box());
    EXPECT_TRUE(reader.isGood());
}

TEST(BoxReaderTest, PastTheEndEverythingIsZeroAndBad) {
    const Bytes bytes = bytesOf({1, 2, 3, 4, 5});
    BoxReader reader(bytes);
    EXPECT_EQ(reader.u32(), 0x01020304U);
    EXPECT_TRUE(reader.isGood());
    EXPECT_EQ(reader.u32(), 0U);
    EXPECT_FALSE(reader.isGood());
    EXPECT_EQ(reader.u64(), 0U);
}

TEST(BoxReaderTest, SizesThatNoBoxHasEndTheBoxes) {
    for (const auto& size : {bytesOf({0, 0, 0, 0}), bytesOf({0, 0, 0, 7}), bytesOf({0, 0, 0, 13}),
                             bytesOf({255, 255, 255, 255})}) {
        Bytes bytes = size;
        bytes.resize(12);
        EXPECT_FALSE(BoxReader(bytes).box());
    }
}

TEST(BoxReaderTest, BoxWithoutContentIsABox) {
    const Bytes bytes = bytesOf({0, 0, 0, 8, 'f', 'r', 'e', 'e'});
    BoxReader reader(bytes);
    const auto box = reader.box();
    ASSERT_TRUE(box);
    EXPECT_TRUE(box->content.empty());
}

}  // namespace
}  // namespace kelvo::test
