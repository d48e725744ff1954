#pragma once

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

#include <gtest/gtest.h>

namespace kelvo::test {

/// Whether files are to be written instead of compared: the environment has KELVO_REGENERATE.
inline bool isRegenerating() {
    return std::getenv("KELVO_REGENERATE") != nullptr;  // NOLINT(concurrency-mt-unsafe)
}

inline std::string contentOf(const std::filesystem::path& path) {
    std::ifstream file(path, std::ios::binary);
    return {std::istreambuf_iterator<char>(file), {}};
}

/// Fails unless the file holds exactly `text`; a run with KELVO_REGENERATE writes it instead.
inline void expectGolden(const std::filesystem::path& path, const std::string& text) {
    if (isRegenerating()) {
        std::filesystem::create_directories(path.parent_path());
        std::ofstream(path, std::ios::binary) << text;
        return;
    }
    EXPECT_EQ(contentOf(path), text) << path << " is not current. If the change is meant, write it anew with "
                                     << "KELVO_REGENERATE=1 build/dev/wire_tests";
}

}  // namespace kelvo::test
