#include "base/SpareTime.h"

#include <utility>

namespace kelvo {
namespace {

thread_local SpareTime* spareTimeOfThread = nullptr;

}  // namespace

SpareTime::SpareTime() : outer_(std::exchange(spareTimeOfThread, this)) {}

SpareTime::~SpareTime() {
    spareTimeOfThread = outer_;
    if (queue_) queue_->runInTurn(task_);
}

bool SpareTime::isThere() {
    return spareTimeOfThread != nullptr && !spareTimeOfThread->queue_;
}

void SpareTime::spend(std::shared_ptr<TurnHolder> queue, Task task) {
    spareTimeOfThread->queue_ = std::move(queue);
    spareTimeOfThread->task_ = std::move(task);
}

}  // namespace kelvo
