#include "platform/linux/bundles/BundleInfo.h"
#include "platform/linux/bundles/StringsTable.h"

#include <algorithm>
#include <atomic>
#include <cstdlib>
#include <malloc.h>
#include <new>

#include <gtest/gtest.h>

namespace {

std::atomic<std::size_t> liveBytes{0};
std::atomic<std::size_t> mostLiveBytes{0};

}  // namespace

// Counts what is allocated while it is allocated. Not inlined, or an optimising compiler sees `malloc` on one
// side and `delete` on the other and calls them mismatched.
[[gnu::noinline]] void* operator new(std::size_t size) {
    void* block = std::malloc(size);
    if (block == nullptr) std::abort();
    const std::size_t live = liveBytes += ::malloc_usable_size(block);
    std::size_t most = mostLiveBytes;
    while (most < live && !mostLiveBytes.compare_exchange_weak(most, live)) {
    }
    return block;
}

[[gnu::noinline]] void operator delete(void* block) noexcept {
    if (block != nullptr) liveBytes -= ::malloc_usable_size(block);
    std::free(block);
}

[[gnu::noinline]] void operator delete(void* block, std::size_t) noexcept {
    operator delete(block);
}

namespace kelvo {
namespace {

/// The most that `work` held at any moment beyond what was there before.
template <typename Work>
std::size_t peakOf(Work work) {
    const std::size_t before = liveBytes;
    mostLiveBytes = before;
    work();
    return mostLiveBytes - before;
}

/// A reader may hold this much whatever it is given.
constexpr std::size_t kFixedPart = 64U << 10;

std::string repeated(std::string_view piece, std::size_t size) {
    std::string text;
    text.reserve(size + piece.size());
    while (text.size() < size)
        text += piece;
    return text;
}

class StringsTableMemoryTest : public testing::TestWithParam<std::string> {};

TEST_P(StringsTableMemoryTest, TableHoldsAtMostFourTimesItsFile) {
    const std::string text = repeated(GetParam(), 1U << 20);
    const std::size_t peak = peakOf([&] { static_cast<void>(StringsTable::parse(text)); });
    EXPECT_LE(peak, 4 * text.size() + kFixedPart);
}

INSTANTIATE_TEST_SUITE_P(Inputs, StringsTableMemoryTest,
                         testing::Values("\"a\"=\"\";", ";", "\"", "\\", "/*", "\"\\u0041\"=\"\";",
                                         "\"ab\"=\"c\";\n"));

class BundleInfoMemoryTest : public testing::TestWithParam<std::string> {};

TEST_P(BundleInfoMemoryTest, InfoHoldsAtMostFourTimesItsFile) {
    const std::string json = "{\"entitlements\":{\"k\":" + repeated(GetParam(), BundleInfo::kMostBytes - 100);
    const std::size_t peak = peakOf([&] { static_cast<void>(BundleInfo::parse(json)); });
    EXPECT_LE(peak, 4 * json.size() + kFixedPart);
}

INSTANTIATE_TEST_SUITE_P(Inputs, BundleInfoMemoryTest,
                         testing::Values("[", "[1,", "{\"a\":", "1,\"k\":", "\"", "1",
                                         "\"abc\",\"x\":", "[\"a\"],\"b\":"));

}  // namespace
}  // namespace kelvo
