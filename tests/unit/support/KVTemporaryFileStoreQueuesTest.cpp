#include "platform/simulated/SimulatedDevice.h"
#include "support/KVTemporaryFileStore.h"

#include <array>
#include <future>
#include <pthread.h>

#include <gtest/gtest.h>

namespace kelvo {
namespace {

std::string threadName() {
    std::array<char, 16> name{};
    ::pthread_getname_np(::pthread_self(), name.data(), name.size());
    return name.data();
}

/// Folds nothing, and keeps the name of the thread that asked.
class NamingFolding : public TextFolding {
  public:
    std::string folded(std::string_view text) override {
        thread.set(threadName());
        return std::string(text);
    }
    Guarded<std::string> thread;
};

TEST(KVTemporaryFileStoreQueuesTest, EachBackgroundOperationRunsOnTheQueueOfItsPriority) {
    SimulatedDevice device;
    const auto folding = std::make_shared<NamingFolding>();
    KVTemporaryFileStore store(device.fileSystem, folding, device.clock);
    std::promise<std::string> removal;
    std::promise<std::string> move;
    const URL file = URL::file("/a");
    store._srRemoveFile(file, [&](const OptionalError&) { removal.set_value(threadName()); });
    store._srMoveFileFromURL(file, file, [&](const OptionalError&) { move.set_value(threadName()); });
    store._srDeleteFilesWithPrefix("a");
    device.settle();
    EXPECT_EQ(removal.get_future().get(), "kelvo.high");
    EXPECT_EQ(move.get_future().get(), "kelvo.normal");
    EXPECT_EQ(folding->thread.copy(), "kelvo.normal");
}

}  // namespace
}  // namespace kelvo
