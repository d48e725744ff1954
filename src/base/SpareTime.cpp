#include "base/SpareTime.h"

#include <utility>

namespace kelvo {
namespace {

thread_local SpareTime* spareTimeOfThread = nullptr;

}  // namespace

SpareTime::SpareTime() : outer_(std::exchange(spareTimeOfThread, this)) {}

SpareTime::~SpareTime() {
    spareTimeOfThread = outer_;
    for (Task& task : tasks_)
        std::exchange(task, nullptr)();
}

bool SpareTime::isThere() {
    return spareTimeOfThread != nullptr;
}

void SpareTime::spend(Task task) {
    spareTimeOfThread->tasks_.push_back(std::move(task));
}

}  // namespace kelvo
