#include "WriteJournal.h"
#include "platform/linux/media/LavMediaService.h"
#include "support/TemporaryDirectory.h"
#include "support/media/HostFileSystem.h"
#include "support/media/MovieProbe.h"
#include "support/media/TestMovie.h"

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

/// The header counts from its second write on.
constexpr std::size_t kHeaderWrites = 2;
/// So many bytes at an aligned place are written or not.
constexpr std::size_t kWhole = 16;

TEST(InterruptedWritesTest, MoviePlaysAfterEachOfItsWritesAndInTheMidstOfThem) {
    const TemporaryDirectory folder;
    const std::string path = folder.path() + "/movie.mp4";
    const WriteJournal journal(path);
    LavMediaService service(std::make_shared<HostFileSystem>());
    TestMovie movie(service, path, {.size = {160, 120}, .frameRate = 20});
    ASSERT_EQ(movie.make(1.6), MediaFileWriter::Status::completed);

    const auto writes = journal.writes();
    ASSERT_GT(writes.size(), kHeaderWrites + 4);
    std::size_t shown = 0;
    for (std::size_t count = kHeaderWrites; count <= writes.size(); ++count) {
        const std::size_t size = count < writes.size() ? writes[count].bytes.size() : 0;
        for (const std::size_t cut : {std::size_t{0}, size / 2}) {
            if (cut > 0 && size <= kWhole) continue;
            SCOPED_TRACE(std::to_string(count) + " writes and " + std::to_string(cut) + " bytes");
            const std::string state = folder.write("state.mp4", journal.fileAfter(count, cut));
            // A movie that has only begun holds nothing to decode, which the decoder complains about.
            EXPECT_EQ(shown > 0 ? decodingComplaints(state) : "", "");
            const std::size_t frames = frameTimes(state, "v:0").size();
            EXPECT_GE(frames, shown);
            shown = std::max(shown, frames);
        }
    }
    EXPECT_EQ(shown, frameTimes(path, "v:0").size());
    EXPECT_EQ(shown, 32U);
}

}  // namespace
}  // namespace kelvo::test
