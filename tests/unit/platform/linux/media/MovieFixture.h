#pragma once

#include "platform/linux/media/LavMediaService.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"
#include "support/media/HostFileSystem.h"
#include "support/media/MovieProbe.h"
#include "support/media/TestMovie.h"

#include <gtest/gtest.h>

namespace kelvo::test {

/// A folder to write movies in, and the service that writes them.
class MovieFixture : public ::testing::Test {
  protected:
    using Status = MediaFileWriter::Status;

    std::string inFolder(const std::string& name) const { return folder.path() + "/" + name; }

    TemporaryDirectory folder;
    const std::string path = inFolder("movie.mp4");
    LogRecorder log;
    LavMediaService service{std::make_shared<HostFileSystem>()};
};

}  // namespace kelvo::test
