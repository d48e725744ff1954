#pragma once

#include "support/TemporaryDirectory.h"

#include <chrono>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

namespace kelvo::test {

inline std::string contentOf(const std::string& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// When every movie below was recorded: one second of one day, so that names clash.
constexpr std::int64_t kRecordedAt = 1700000000;

inline std::string writeMovie(const TemporaryDirectory& store, const std::string& name,
                              const std::string& content) {
    std::string path = store.write(name, content);
    std::filesystem::last_write_time(path, std::filesystem::file_time_type::clock::from_sys(
                                               std::chrono::sys_seconds(std::chrono::seconds(kRecordedAt))));
    return path;
}

}  // namespace kelvo::test
