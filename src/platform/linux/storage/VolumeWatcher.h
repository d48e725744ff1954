#pragma once

#include "base/Clock.h"
#include "platform/FileSystem.h"
#include "platform/StoragePurgeService.h"
#include "platform/linux/storage/SpaceWatch.h"

#include <condition_variable>
#include <map>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

namespace kelvo {

/// Looks at the free space of one volume from time to time, on a thread of its own that starts with the first
/// registration, and asks for space back by the bounds of `SpaceWatch`. Thread-safe.
class VolumeWatcher : public StoragePurgeService {
  public:
    static constexpr std::chrono::seconds kInterval{10};

    /// Looks every `interval` at the volume that holds the device path `path`.
    VolumeWatcher(std::shared_ptr<FileSystem> fileSystem, std::shared_ptr<Clock> clock, std::string path,
                  std::chrono::nanoseconds interval = kInterval);
    ~VolumeWatcher() override;

    void registerCallbacks(std::string_view name, StoragePurgeCallbacks callbacks) override;

  private:
    void watch();

    const std::shared_ptr<FileSystem> fileSystem_;
    const std::shared_ptr<Clock> clock_;
    const std::string path_;
    const std::chrono::nanoseconds interval_;
    std::mutex mutex_;
    std::condition_variable stops_;
    std::map<std::string, std::shared_ptr<SpaceWatch>> watches_;
    std::thread thread_;
    bool isStopping_ = false;
};

}  // namespace kelvo
