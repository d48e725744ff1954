#include "platform/linux/analytics/AnalyticsLog.h"

#include "base/GlobalQueue.h"
#include "base/Guarded.h"
#include "base/KVLog.h"
#include "platform/linux/analytics/AnalyticsLine.h"
#include "platform/linux/analytics/LineFile.h"

#include <cerrno>
#include <mutex>
#include <utility>
#include <vector>

namespace kelvo {

/// The lines that wait, and the file that they go to.
class AnalyticsLog::Writer {
  public:
    Writer(std::string hostPath, std::uint64_t mostBytes) : file_(std::move(hostPath), mostBytes) {}

    bool add(std::string line) {
        return waiting_.with([&](auto& waiting) {
            if (waiting.size() >= kMostWaiting) return false;
            waiting.push_back(std::move(line));
            return true;
        });
    }

    void writeWaiting() {
        const std::lock_guard lock(fileMutex_);
        for (const std::string& line : waiting_.exchange({})) {
            if (const OptionalError error = file_.append(line))
                KVLogError("dropped an analytics event: %s", error->localizedDescription().c_str());
        }
    }

  private:
    Guarded<std::vector<std::string>> waiting_;
    std::mutex fileMutex_;  // so that lines keep their order
    LineFile file_;
};

AnalyticsLog::AnalyticsLog(std::string hostPath, std::shared_ptr<Clock> clock, std::uint64_t mostBytes)
    : clock_(std::move(clock)), writer_(std::make_shared<Writer>(std::move(hostPath), mostBytes)) {}

AnalyticsLog::~AnalyticsLog() {
    writer_->writeWaiting();
}

OptionalError AnalyticsLog::send(const AnalyticsMessage& message) {
    if (!writer_->add(analyticsLine(message, clock_->now())))
        return KVError::posix(EAGAIN, "analytics events wait for the disk");
    GlobalQueue::get(QueuePriority::background).async([writer = writer_] { writer->writeWaiting(); });
    return std::nullopt;
}

}  // namespace kelvo
