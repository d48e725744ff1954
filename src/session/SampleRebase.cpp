#include "session/SampleRebase.h"

#include "base/KVLog.h"

#include <cstdint>
#include <limits>

namespace kelvo {

std::optional<std::vector<TimingRecord>> rebasedTiming(std::span<const TimingRecord> timing,
                                                       const MediaTime& presentationTime) {
    if (timing.size() > std::numeric_limits<std::uint64_t>::max() / sizeof(TimingRecord)) {
        KVLogError("KVRecordingSession: _copySampleBufferFromSourceBuffer: Overflow detected");
        return std::nullopt;
    }
    std::vector<TimingRecord> rebased(timing.begin(), timing.end());
    for (TimingRecord& record : rebased) {
        record.presentationTime = presentationTime;
        record.decodeTime = MediaTime::invalid();
    }
    return rebased;
}

}  // namespace kelvo
