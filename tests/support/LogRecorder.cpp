#include "LogRecorder.h"

#include <algorithm>

namespace kelvo::test {

class LogRecorder::Sink : public LogSink {
  public:
    void write(LogLevel level, std::string_view line) override {
        lines.with([&](auto& all) { all.push_back({level, std::string(line)}); });
    }

    Guarded<std::vector<Line>> lines;
};

LogRecorder::LogRecorder() : sink_(std::make_shared<Sink>()), previous_(setLogSink(sink_)) {}
LogRecorder::~LogRecorder() {
    setLogSink(previous_);
}

std::vector<LogRecorder::Line> LogRecorder::lines() const {
    return sink_->lines.copy();
}

std::vector<std::string> LogRecorder::texts() const {
    std::vector<std::string> texts;
    for (const Line& line : lines())
        texts.push_back(line.text);
    return texts;
}

std::size_t LogRecorder::count(const std::string& text) const {
    return static_cast<std::size_t>(std::ranges::count(lines(), text, &Line::text));
}

std::size_t LogRecorder::count(LogLevel level, const std::string& text) const {
    return static_cast<std::size_t>(std::ranges::count(lines(), Line{level, text}));
}

void LogRecorder::clear() {
    sink_->lines.set({});
}

}  // namespace kelvo::test
