#include "platform/linux/media_loader/LoadedMediaService.h"

#include "base/GlobalQueue.h"
#include "base/Guarded.h"
#include "base/KVLog.h"
#include "platform/MediaErrors.h"
#include "platform/linux/media/MediaModule.h"
#include "platform/linux/media/SampleQueue.h"

#include <atomic>
#include <dlfcn.h>
#include <filesystem>

namespace kelvo {
namespace {

KVError moduleMissing() {
    return mediaError(kMediaErrorServiceMissing, "the media module is not installed");
}

/// An export when there is nothing to export with.
class FailingExport : public ExportSession, public std::enable_shared_from_this<FailingExport> {
  public:
    void setOutputURL(const URL& url) override { url_.set(url); }
    void setOutputFileType(MediaFileType) override {}
    void setTimeRange(const MediaTimeRange&) override {}
    void setAudioMix(const AudioMix&) override {}
    void exportAsynchronously(std::function<void()> completion) override {
        hasFailed_ = true;
        GlobalQueue::get(QueuePriority::normal).async([self = shared_from_this(), completion] {
            completion();
        });
    }
    void cancelExport() override {}
    Status status() const override { return hasFailed_ ? Status::failed : Status::unknown; }
    OptionalError error() const override {
        return hasFailed_ ? OptionalError(moduleMissing()) : std::nullopt;
    }
    std::optional<URL> outputURL() const override { return url_.copy(); }
    double progress() const override { return 0; }

  private:
    Guarded<std::optional<URL>> url_;
    std::atomic<bool> hasFailed_{false};
};

/// The module's function, from the first folder that has the module; none when it cannot be loaded.
MediaModuleFunction* findFunction(const std::vector<std::string>& folders) {
    for (const std::string& folder : folders) {
        const std::string path = folder + "/" + kMediaModuleName;
        std::error_code ignored;
        if (!std::filesystem::exists(path, ignored)) continue;
        void* module = ::dlopen(path.c_str(), RTLD_NOW | RTLD_LOCAL | RTLD_NODELETE);
        void* symbol = module == nullptr ? nullptr : ::dlsym(module, kMediaModuleFunction);
        if (symbol != nullptr) return reinterpret_cast<MediaModuleFunction*>(symbol);
        const char* reason = ::dlerror();  // NOLINT(concurrency-mt-unsafe): kept for each thread
        KVLogError("cannot load %s: %s", path.c_str(), reason == nullptr ? "?" : reason);
    }
    return nullptr;
}

}  // namespace

LoadedMediaService::LoadedMediaService(std::shared_ptr<FileSystem> fileSystem,
                                       std::vector<std::string> folders)
    : fileSystem_(std::move(fileSystem)), folders_(std::move(folders)) {}

std::vector<std::string> LoadedMediaService::usualFolders() {
    std::error_code ignored;
    const auto program = std::filesystem::read_symlink("/proc/self/exe", ignored);
    const auto folder = program.parent_path();
    return {folder.string(), (folder.parent_path() / "lib/kelvod").string()};
}

const std::shared_ptr<MediaService>& LoadedMediaService::loaded() {
    std::call_once(once_, [this] { load(); });
    return service_;
}

void LoadedMediaService::load() {
    if (MediaModuleFunction* make = findFunction(folders_)) make(KELVO_VERSION, fileSystem_, service_);
    if (!service_) KVLogError("movies cannot be written: no fitting %s", kMediaModuleName);
}

Result<std::shared_ptr<MediaFileWriter>> LoadedMediaService::createFileWriter(const URL& url,
                                                                              MediaFileType type) {
    if (!loaded()) return moduleMissing();
    return loaded()->createFileWriter(url, type);
}

std::shared_ptr<WriterInput> LoadedMediaService::createWriterInput(MediaType type,
                                                                   const Dictionary& outputSettings) {
    return loaded() ? loaded()->createWriterInput(type, outputSettings) : nullptr;
}

std::shared_ptr<BufferQueue> LoadedMediaService::createBufferQueue() {
    return std::make_shared<SampleQueue>();
}

std::shared_ptr<Asset> LoadedMediaService::openAsset(const URL& url) {
    return loaded() ? loaded()->openAsset(url) : nullptr;
}

std::shared_ptr<ExportSession> LoadedMediaService::createExportSession(std::shared_ptr<Asset> asset,
                                                                       ExportPreset preset) {
    if (!loaded()) return std::make_shared<FailingExport>();
    return loaded()->createExportSession(std::move(asset), preset);
}

}  // namespace kelvo
