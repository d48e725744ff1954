#include "MovieFixture.h"

namespace kelvo::test {
namespace {

class LavFileWriterTest : public MovieFixture {};

TEST_F(LavFileWriterTest, FinishedMovieIsOrdinaryAndDecodesWithoutComplaint) {
    TestMovie movie(service, path, {});
    EXPECT_EQ(movie.make(2), Status::completed);
    EXPECT_EQ(boxTypes(path), "ftyp mdat moov");
    EXPECT_EQ(decodingComplaints(path), "");
    EXPECT_EQ(probeStream(path, "v:0", "codec_name,profile,width,height"), "h264,High,320,240");
    EXPECT_EQ(frameTimes(path, "v:0").size(), 60U);
}

}  // namespace
}  // namespace kelvo::test
