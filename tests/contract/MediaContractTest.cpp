#include "contract/MediaContract.h"
#include "platform/linux/media/LavMediaService.h"
#include "platform/simulated/SimulatedDevice.h"
#include "support/TemporaryDirectory.h"
#include "support/media/HostFileSystem.h"

namespace kelvo::test {
namespace {

class LavWorld {
  public:
    MediaService& media() { return media_; }
    std::string path(const std::string& name) { return folder_.path() + "/" + name; }
    bool fileExists(const std::string& path) { return files_->itemExists(path); }

  private:
    TemporaryDirectory folder_;
    const std::shared_ptr<HostFileSystem> files_ = std::make_shared<HostFileSystem>();
    LavMediaService media_{files_};
};

class SimulatedWorld {
  public:
    MediaService& media() { return *device_.media; }
    std::string path(const std::string& name) { return "/movies/" + name; }
    bool fileExists(const std::string& path) { return device_.fileSystem->itemExists(path); }

  private:
    SimulatedDevice device_;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Linux, MediaContract, LavWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, MediaContract, SimulatedWorld);

}  // namespace
}  // namespace kelvo::test
