#include "contract/BundleServiceContract.h"
#include "contract/FileSystemContract.h"
#include "contract/NotificationCenterContract.h"
#include "contract/PhotoLibraryContract.h"
#include "contract/PreferencesContract.h"
#include "contract/TextFoldingContract.h"
#include "platform/linux/bundles/LinuxBundleService.h"
#include "platform/linux/bundles/LocaleLanguages.h"
#include "platform/linux/files/LinuxFileSystem.h"
#include "platform/linux/library/LinuxPhotoLibrary.h"
#include "platform/linux/notifications/LinuxNotificationCenter.h"
#include "platform/linux/settings/JsonPreferences.h"
#include "platform/linux/system/KernelRandom.h"
#include "platform/linux/text/UnicodeTextFolding.h"
#include "support/TemporaryDirectory.h"

#include <filesystem>
#include <fstream>
#include <limits>
#include <semaphore>
#include <unistd.h>

namespace kelvo::test {
namespace {

namespace fs = std::filesystem;

/// A device root in a temporary directory, without installed resources.
class LinuxWorld {
  public:
    FileSystem& fileSystem() { return fileSystem_; }
    void addFile(const std::string& path, std::uint64_t size) {
        const std::string host = deviceRoot_->hostPath(path);
        std::ofstream(host).flush();
        fs::resize_file(host, size);
    }

    BundleService& bundles() { return bundles_; }
    void addBundle(const std::string& path, const BundleRecipe& recipe) {
        const std::string folder = deviceRoot_->hostPath(path);
        fs::create_directories(folder);
        std::ofstream info(folder + "/Info.json");
        info << R"({"identifier": ")" << recipe.identifier << '"';
        if (recipe.name) info << R"(, "name": ")" << *recipe.name << '"';
        if (recipe.displayName) info << R"(, "displayName": ")" << *recipe.displayName << '"';
        info << "}";
        for (const auto& [localization, texts] : recipe.texts)
            writeTable(fs::path(folder) / (localization + ".lproj"), texts);
    }
    void addFile(const std::string& path) {
        fs::create_directories(fs::path(deviceRoot_->hostPath(path)).parent_path());
        addFile(path, 1);
    }
    std::string programPath(const std::string& path) { return deviceRoot_->hostPath(path); }
    std::int32_t livingProcess() { return ::getpid(); }
    std::int32_t missingProcess() { return std::numeric_limits<std::int32_t>::max(); }

    PhotoLibrary& library() { return library_; }
    void addMovie(const std::string& path) { addFile(path); }
    void removeMovie(const std::string& path) { fs::remove(deviceRoot_->hostPath(path)); }

  private:
    static void writeTable(const fs::path& folder, const std::map<std::string, std::string>& texts) {
        fs::create_directories(folder);
        std::ofstream table(folder / "Localizable.strings");
        for (const auto& [key, text] : texts)
            table << '"' << key << "\" = \"" << escaped(text) << "\";\n";
    }
    static std::string escaped(const std::string& text) {
        std::string result;
        for (const char character : text) {
            if (character == '"' || character == '\\') result += '\\';
            result += character;
        }
        return result;
    }

    TemporaryDirectory root_;
    std::shared_ptr<const DeviceRoot> deviceRoot_ =
        std::make_shared<DeviceRoot>(root_.path(), root_.path() + "/resources");
    LinuxFileSystem fileSystem_{deviceRoot_};
    LinuxPhotoLibrary library_{deviceRoot_, screenRecordingsFolder(*deviceRoot_),
                               std::make_shared<KernelRandom>()};
    LinuxBundleService bundles_{deviceRoot_, std::make_shared<LocaleLanguages>("", "en_US.UTF-8")};
};

/// Preferences as files that are written anew at each change.
class LinuxPreferencesWorld {
  public:
    Preferences& preferences() { return preferences_; }
    void set(std::string_view key, const Value& value, std::string_view domain) {
        domains_[std::string(domain)].set(key, value);
        write(std::string(domain));
    }
    void remove(std::string_view key, std::string_view domain) {
        domains_[std::string(domain)].remove(key);
        write(std::string(domain));
    }

  private:
    void write(const std::string& domain) {
        std::string json;
        for (const auto& [key, value] : domains_[domain])
            json += (json.empty() ? "{" : ", ") + ('"' + key + "\": ") + jsonOf(value);
        root_.write("private/var/mobile/Library/Preferences/" + domain + ".json",
                    json.empty() ? "{}" : json + "}");
    }
    static std::string jsonOf(const Value& value) {
        if (const bool* boolean = value.as<bool>()) return *boolean ? "true" : "false";
        return value.description();  // numbers and plain texts read the same in JSON
    }

    TemporaryDirectory root_;
    std::map<std::string, Dictionary> domains_;
    JsonPreferences preferences_{std::make_shared<DeviceRoot>(root_.path(), root_.path())};
};

/// Notifications as state files. A file of its own, written behind each posted one, tells when the center has
/// come that far.
class LinuxNotificationsWorld {
  public:
    LinuxNotificationsWorld() {
        writeState(kBehind, 1);
        center_.registerForNotification(kBehind, QueuePriority::high,
                                        [this](NotificationToken) { reached_.release(); });
        reached_.acquire();  // the state that was there first has fired: the center watches
    }
    ~LinuxNotificationsWorld() { GlobalQueue::drain(); }

    NotificationCenter& center() { return center_; }
    void post(std::string_view name, std::uint64_t state) {
        writeState(name, state);
        writeState(kBehind, 1);
        reached_.acquire();
    }

  private:
    static constexpr std::string_view kBehind = "z.behind";  // the center takes names in alphabetical order

    void writeState(std::string_view name, std::uint64_t state) {
        root_.write("run/kelvod/notifications/" + std::string(name), std::to_string(state));
    }

    TemporaryDirectory root_;
    std::counting_semaphore<> reached_{0};
    LinuxNotificationCenter center_{std::make_shared<DeviceRoot>(root_.path(), root_.path())};
};

INSTANTIATE_TYPED_TEST_SUITE_P(Linux, FileSystemContract, LinuxWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Linux, BundleServiceContract, LinuxWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Linux, PreferencesContract, LinuxPreferencesWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Linux, NotificationCenterContract, LinuxNotificationsWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Linux, PhotoLibraryContract, LinuxWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Linux, TextFoldingContract, UnicodeTextFolding);

}  // namespace
}  // namespace kelvo::test
