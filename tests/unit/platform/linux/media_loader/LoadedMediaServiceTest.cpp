#include "platform/MediaErrors.h"
#include "platform/linux/media_loader/LoadedMediaService.h"
#include "support/LogRecorder.h"
#include "support/TemporaryDirectory.h"
#include "support/media/HostFileSystem.h"
#include "support/media/MovieProbe.h"
#include "support/media/TestMovie.h"

#include <fstream>
#include <future>

#include <gtest/gtest.h>

namespace kelvo::test {
namespace {

class LoadedMediaServiceTest : public ::testing::Test {
  protected:
    static bool isModuleMapped() {
        std::ifstream maps("/proc/self/maps");
        for (std::string line; std::getline(maps, line);) {
            if (line.find("kelvod-media.so") != std::string::npos) return true;
        }
        return false;
    }

    TemporaryDirectory folder;
    LogRecorder log;
};

TEST_F(LoadedMediaServiceTest, NothingIsLoadedBeforeTheFirstMovie) {
    // Each test runs in a process of its own under ctest; elsewhere the module may be there already.
    const bool wasMapped = isModuleMapped();
    LoadedMediaService service(std::make_shared<HostFileSystem>(), LoadedMediaService::usualFolders());
    EXPECT_EQ(service.createBufferQueue()->enqueue(nullptr), 0);
    EXPECT_EQ(isModuleMapped(), wasMapped);
    EXPECT_EQ(service.openAsset(URL::file("/none.mp4")), nullptr);
    EXPECT_TRUE(isModuleMapped());
}

TEST_F(LoadedMediaServiceTest, MoviesAreWrittenByTheModule) {
    LoadedMediaService service(std::make_shared<HostFileSystem>(), LoadedMediaService::usualFolders());
    const std::string path = folder.path() + "/movie.mp4";
    EXPECT_EQ(TestMovie(service, path, {}).make(0.5), MediaFileWriter::Status::completed);
    EXPECT_EQ(decodingComplaints(path), "");
}

TEST_F(LoadedMediaServiceTest, ModuleLogsToTheProgramsLog) {
    LoadedMediaService service(std::make_shared<HostFileSystem>(), LoadedMediaService::usualFolders());
    TestMovie::Options options;
    options.videoSettings = videoSettings(options.size, Dictionary{{"Sharpness", 1}});
    TestMovie(service, folder.path() + "/movie.mp4", options).make(0.1);
    EXPECT_TRUE(log.contains("ignoring unknown video compression property Sharpness"));
}

TEST_F(LoadedMediaServiceTest, WithoutTheModuleNothingCanBeWrittenOrOpened) {
    LoadedMediaService service(std::make_shared<HostFileSystem>(), {folder.path()});
    const auto writer = service.createFileWriter(URL::file("/tmp/movie.mp4"), MediaFileType::mpeg4);
    ASSERT_FALSE(writer);
    EXPECT_EQ(writer.error().code(), kMediaErrorServiceMissing);
    EXPECT_EQ(service.createWriterInput(MediaType::video, {}), nullptr);
    EXPECT_EQ(service.openAsset(URL::file("/tmp/movie.mp4")), nullptr);
    EXPECT_EQ(log.count("movies cannot be written: no fitting kelvod-media.so"), 1U);
}

TEST_F(LoadedMediaServiceTest, WithoutTheModuleExportsFail) {
    LoadedMediaService service(std::make_shared<HostFileSystem>(), {folder.path()});
    const auto session = service.createExportSession(nullptr, ExportPreset::passThrough);
    EXPECT_EQ(session->status(), ExportSession::Status::unknown);
    std::promise<void> done;
    session->exportAsynchronously([&] { done.set_value(); });
    done.get_future().wait();
    EXPECT_EQ(session->status(), ExportSession::Status::failed);
    EXPECT_EQ(session->error()->code(), kMediaErrorServiceMissing);
}

TEST_F(LoadedMediaServiceTest, FileThatIsNoModuleIsLoggedAndPassedOver) {
    folder.write("kelvod-media.so", "no module");
    std::vector<std::string> folders{folder.path()};
    for (const std::string& usual : LoadedMediaService::usualFolders())
        folders.push_back(usual);
    LoadedMediaService service(std::make_shared<HostFileSystem>(), folders);
    EXPECT_NE(service.createWriterInput(MediaType::audio, {}), nullptr);
    EXPECT_TRUE(log.lines().front().text.starts_with("cannot load " + folder.path()));
}

}  // namespace
}  // namespace kelvo::test
