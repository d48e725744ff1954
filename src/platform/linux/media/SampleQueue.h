#pragma once

#include "base/Guarded.h"
#include "platform/BufferQueue.h"

#include <deque>
#include <utility>

namespace kelvo {

/// The buffer queue of the Linux adapter. Enqueueing never fails. Thread-safe.
class SampleQueue : public BufferQueue {
  public:
    int enqueue(SampleBufferRef sample) override {
        samples_.with([&](auto& samples) { samples.push_back(std::move(sample)); });
        return 0;
    }
    SampleBufferRef dequeue() override {
        return samples_.with([](auto& samples) -> SampleBufferRef {
            if (samples.empty()) return nullptr;
            SampleBufferRef oldest = std::move(samples.front());
            samples.pop_front();
            return oldest;
        });
    }
    bool isEmpty() const override {
        return samples_.with([](const auto& samples) { return samples.empty(); });
    }
    void reset() override { samples_.set({}); }

  private:
    Guarded<std::deque<SampleBufferRef>> samples_;
};

}  // namespace kelvo
