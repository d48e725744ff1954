#include "contract/BundleServiceContract.h"
#include "contract/FileSystemContract.h"
#include "contract/NotificationCenterContract.h"
#include "contract/PhotoLibraryContract.h"
#include "contract/PreferencesContract.h"
#include "contract/TextFoldingContract.h"
#include "platform/simulated/SimulatedDevice.h"

namespace kelvo::test {
namespace {

/// The simulated device as the world of every contract.
class SimulatedWorld {
  public:
    FileSystem& fileSystem() { return *device_.fileSystem; }
    void addFile(const std::string& path, std::uint64_t size) { device_.fileSystem->addFile(path, size); }

    BundleService& bundles() { return *device_.bundles; }
    void addBundle(const std::string& path, const BundleRecipe& recipe) {
        SimulatedBundleContent content;
        content.bundleIdentifier = recipe.identifier;
        content.name = recipe.name;
        content.displayName = recipe.displayName;
        for (const auto& [localization, texts] : recipe.texts)
            content.tables[localization]["Localizable"] = texts;
        device_.bundles->addBundle(path, std::move(content));
    }
    void addFile(const std::string&) {}  // simulated bundles have no files
    std::string programPath(const std::string& path) { return path; }
    std::int32_t livingProcess() {
        device_.bundles->addProcess(7, "/usr/bin/tool");
        return 7;
    }
    std::int32_t missingProcess() { return 8; }

    Preferences& preferences() { return *device_.preferences; }
    void set(std::string_view key, const Value& value, std::string_view domain) {
        device_.preferences->set(key, value, domain);
    }
    void remove(std::string_view key, std::string_view domain) { device_.preferences->remove(key, domain); }

    NotificationCenter& center() { return *device_.notifications; }
    void post(std::string_view name, std::uint64_t state) { device_.notifications->post(name, state); }

    PhotoLibrary& library() { return *device_.photoLibrary; }
    void addMovie(const std::string& path) { device_.fileSystem->addFile(path, 1); }
    void removeMovie(const std::string& path) { device_.fileSystem->removeItem(path); }

  private:
    SimulatedDevice device_;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, FileSystemContract, SimulatedWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, BundleServiceContract, SimulatedWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, PreferencesContract, SimulatedWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, NotificationCenterContract, SimulatedWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, PhotoLibraryContract, SimulatedWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, TextFoldingContract, SimulatedTextFolding);

}  // namespace
}  // namespace kelvo::test
