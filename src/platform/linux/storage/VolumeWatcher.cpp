#include "platform/linux/storage/VolumeWatcher.h"

#include "base/ThreadName.h"

#include <utility>

namespace kelvo {

VolumeWatcher::VolumeWatcher(std::shared_ptr<FileSystem> fileSystem, std::shared_ptr<Clock> clock,
                             std::string path, std::chrono::nanoseconds interval)
    : fileSystem_(std::move(fileSystem)),
      clock_(std::move(clock)),
      path_(std::move(path)),
      interval_(interval) {}

VolumeWatcher::~VolumeWatcher() {
    {
        std::lock_guard lock(mutex_);
        isStopping_ = true;
        stops_.notify_all();
    }
    if (thread_.joinable()) thread_.join();
}

void VolumeWatcher::registerCallbacks(std::string_view name, StoragePurgeCallbacks callbacks) {
    std::lock_guard lock(mutex_);
    watches_[std::string(name)] = std::make_shared<SpaceWatch>(std::move(callbacks), clock_->monotonicNow());
    if (!thread_.joinable()) thread_ = std::thread([this] { watch(); });
}

void VolumeWatcher::watch() {
    nameCurrentThread("kelvo.storage");
    std::unique_lock lock(mutex_);
    while (!stops_.wait_for(lock, interval_, [this] { return isStopping_; })) {
        const auto watches = watches_;
        lock.unlock();
        // A volume that cannot be read says nothing about its space.
        if (const auto freeBytes = fileSystem_->freeSpace(path_)) {
            for (const auto& [name, watch] : watches)
                watch->look(*freeBytes, clock_->monotonicNow());
        }
        lock.lock();
    }
}

}  // namespace kelvo
