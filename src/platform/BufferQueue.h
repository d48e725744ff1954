#pragma once

#include "base/SampleBuffer.h"

namespace kelvo {

/// An unbounded queue of samples, first in, first out, in order of arrival whatever their times. Implemented
/// by the Linux media adapter and the simulated device; used by movie writers. Thread-safe.
class BufferQueue {
  public:
    virtual ~BufferQueue() = default;

    /// Adds `sample` at the end. 0 on success; anything else means that the sample was not taken.
    virtual int enqueue(SampleBufferRef sample) = 0;

    /// Takes the oldest sample out; none when the queue is empty.
    virtual SampleBufferRef dequeue() = 0;

    virtual bool isEmpty() const = 0;

    /// Drops everything.
    virtual void reset() = 0;
};

}  // namespace kelvo
