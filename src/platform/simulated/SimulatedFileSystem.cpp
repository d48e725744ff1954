#include "platform/simulated/SimulatedFileSystem.h"

#include <cerrno>
#include <utility>

namespace kelvo {
namespace {

constexpr std::uint64_t kDirectorySize = 4096;

/// `path` from the root on, with single slashes and none at its end.
std::string normalized(std::string_view path) {
    std::string result = "/";
    for (const char character : path) {
        if (character == '/' && !result.empty() && result.back() == '/') continue;
        result += character;
    }
    while (!result.empty() && result.back() == '/')
        result.pop_back();
    return result;
}

bool isInside(const std::string& path, const std::string& directory) {
    return path.size() > directory.size() && path.starts_with(directory) && path[directory.size()] == '/';
}

std::string parentOf(const std::string& path) {
    return path.substr(0, path.rfind('/'));
}

/// The items inside `directory`, at any depth.
template <typename Items>
auto rangeInside(Items& items, const std::string& directory) {
    return std::pair(items.lower_bound(directory + "/"),
                     items.lower_bound(directory + "0"));  // '0' follows '/'
}

}  // namespace

SimulatedFileSystem::SimulatedFileSystem(std::shared_ptr<Clock> clock,
                                         std::shared_ptr<SimulatedFaults> faults)
    : clock_(std::move(clock)), faults_(std::move(faults)) {
    volume_.with([](Volume& volume) { volume.items[""] = {kDirectorySize, {}, {}, true}; });
}

void SimulatedFileSystem::addFile(std::string_view path, std::uint64_t size, std::chrono::nanoseconds age) {
    const std::string place = normalized(path);
    const Date changed = clock_->now() + -age;
    volume_.with([&](Volume& volume) {
        static_cast<void>(addDirectories(volume.items, parentOf(place)));
        volume.items[place] = {size, changed, changed, false};
    });
}

void SimulatedFileSystem::setFreeSpace(std::uint64_t bytes) {
    volume_.with([&](Volume& volume) { volume.freeSpace = bytes; });
}

bool SimulatedFileSystem::itemExists(std::string_view path) {
    return volume_.with([&](Volume& volume) { return volume.items.contains(normalized(path)); });
}

OptionalError SimulatedFileSystem::createDirectory(std::string_view path) {
    if (OptionalError fault = faults_->take("FileSystem.createDirectory")) return fault;
    return volume_.with([&](Volume& volume) { return addDirectories(volume.items, normalized(path)); });
}

OptionalError SimulatedFileSystem::addDirectories(Items& items, const std::string& path) const {
    if (const auto existing = items.find(path); existing != items.end()) {
        return existing->second.isDirectory ? OptionalError() : KVError::posix(ENOTDIR, path);
    }
    if (OptionalError error = addDirectories(items, parentOf(path))) return error;
    items[path] = {kDirectorySize, clock_->now(), clock_->now(), true};
    return std::nullopt;
}

Result<std::vector<std::string>> SimulatedFileSystem::namesInDirectory(std::string_view path) {
    using Names = Result<std::vector<std::string>>;
    if (const OptionalError fault = faults_->take("FileSystem.namesInDirectory")) return *fault;
    const std::string directory = normalized(path);
    return volume_.with([&](Volume& volume) -> Names {
        const auto entry = volume.items.find(directory);
        if (entry == volume.items.end()) return KVError::posix(ENOENT, directory);
        if (!entry->second.isDirectory) return KVError::posix(ENOTDIR, directory);
        std::vector<std::string> names;
        const auto [first, last] = rangeInside(volume.items, directory);
        for (auto item = first; item != last; ++item) {
            const std::string name = item->first.substr(directory.size() + 1);
            if (name.find('/') == std::string::npos) names.push_back(name);
        }
        return names;
    });
}

Result<FileAttributes> SimulatedFileSystem::attributesOfItem(std::string_view path) {
    if (const OptionalError fault = faults_->take("FileSystem.attributesOfItem")) return *fault;
    return volume_.with([&](Volume& volume) -> Result<FileAttributes> {
        const auto entry = volume.items.find(normalized(path));
        if (entry == volume.items.end()) return KVError::posix(ENOENT, path);
        return entry->second;
    });
}

OptionalError SimulatedFileSystem::removeItem(std::string_view path) {
    if (OptionalError fault = faults_->take("FileSystem.removeItem")) return fault;
    const std::string place = normalized(path);
    return volume_.with([&](Volume& volume) -> OptionalError {
        if (volume.items.erase(place) == 0) return KVError::posix(ENOENT, path);
        const auto [first, last] = rangeInside(volume.items, place);
        volume.items.erase(first, last);
        return std::nullopt;
    });
}

OptionalError SimulatedFileSystem::moveItem(std::string_view source, std::string_view destination) {
    if (OptionalError fault = faults_->take("FileSystem.moveItem")) return fault;
    const std::string from = normalized(source);
    const std::string to = normalized(destination);
    return volume_.with([&](Volume& volume) -> OptionalError {
        if (!volume.items.contains(from)) return KVError::posix(ENOENT, source);
        if (volume.items.contains(to)) return KVError::posix(EEXIST, destination);
        if (!volume.items.contains(parentOf(to))) return KVError::posix(ENOENT, destination);
        if (isInside(to, from)) return KVError::posix(EINVAL, destination);
        Items moved;
        for (auto& [path, attributes] : volume.items) {
            if (path == from || isInside(path, from)) moved[to + path.substr(from.size())] = attributes;
        }
        std::erase_if(volume.items,
                      [&](const auto& item) { return item.first == from || isInside(item.first, from); });
        volume.items.merge(moved);
        return std::nullopt;
    });
}

Result<std::uint64_t> SimulatedFileSystem::freeSpace(std::string_view) {
    if (const OptionalError fault = faults_->take("FileSystem.freeSpace")) return *fault;
    return volume_.with([](Volume& volume) { return volume.freeSpace; });
}

}  // namespace kelvo
