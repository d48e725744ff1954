#include "platform/linux/x11/XConnection.h"
#include "tools/kelvoctl/Commands.h"
#include "tools/kelvoctl/Finish.h"
#include "tools/kelvoctl/MovieOutput.h"

#include <array>
#include <cstdio>
#include <unistd.h>

namespace kelvo::ctl {
namespace {

constexpr std::chrono::milliseconds kTimerPeriod{500};
constexpr Size kUnknownScreen{1920, 1080};

/// The size of the screen that $DISPLAY names, in which the whole of it is recorded.
Size screenSize() {
    const auto server = x11::XConnection::open("");
    if (!server) return kUnknownScreen;
    return {static_cast<double>(server->screen().width_in_pixels),
            static_cast<double>(server->screen().height_in_pixels)};
}

bool isRecording(const std::optional<Dictionary>& state) {
    const Value* const value = state ? state->find("isRecording") : nullptr;
    return value != nullptr && value->asBool().value_or(false);
}

/// One recording, from the request to the end of its movie. Main thread.
class Recording {
  public:
    explicit Recording(Program& program) : program_(program) {}

    void begin() {
        if (const OptionalError error = outputProblem())
            return program_.fail(error->localizedDescription(), kWrongUsage);
        program_.setInterruptHandler([this] { stop(); });
        program_.setCallbackHandler(
            [this](const std::string& name, const Dictionary& arguments) { told(name, arguments); });
        program_.daemon().synchronousGetCurrentState(program_.onMain([this](const auto& state) {
            if (isRecording(state)) {
                return program_.fail(
                    "the screen is being recorded already; kelvoctl stop ends that recording", kNothingToDo);
            }
            start();
        }));
    }

  private:
    enum class Phase { before, starting, running, over };

    OptionalError outputProblem() const {
        const std::string& output = program_.line().output;
        return output.empty() ? std::nullopt : checkOutput(output);
    }

    void start() {
        if (phase_ == Phase::over) return program_.finish(kDone);
        phase_ = Phase::starting;
        const Size size = program_.line().size.value_or(screenSize());
        program_.daemon().startRecordingWindowLayerContextIDs(
            {}, size, program_.line().wantsMicrophone, false, false, true, false, nullptr,
            program_.onMain([this](const OptionalError& error, bool microphone, bool) {
                if (error) return program_.fail(*error);
                started(microphone);
            }));
    }

    void started(bool microphone) {
        phase_ = Phase::running;
        startedAt_ = program_.clock().monotonicNow();
        if (program_.line().isJson)
            program_.answer("", Dictionary{{"recording", true}, {"microphone", microphone}});
        program_.remark("recording; Ctrl-C stops and saves");
        if (endBeforeAnswer_) return ended(*endBeforeAnswer_);
        if (isStopWanted_) return stop();
        if (::isatty(STDERR_FILENO) == 1 && !program_.line().isJson) {
            showTimer();
            timer_ = program_.mainQueue().scheduleRepeating(kTimerPeriod, [this] { showTimer(); });
        }
        if (program_.line().seconds) {
            const std::chrono::duration<double> length(*program_.line().seconds);
            end_ = program_.mainQueue().scheduleRepeating(
                std::chrono::duration_cast<std::chrono::nanoseconds>(length), [this] { stop(); });
        }
    }

    double seconds() const { return inSeconds(program_.clock().monotonicNow() - startedAt_); }

    void showTimer() const {
        const auto whole = static_cast<std::int64_t>(seconds());
        std::fprintf(stderr, "\r\033[31m●\033[0m %lld:%02lld ", static_cast<long long>(whole / 60),
                     static_cast<long long>(whole % 60));
    }

    void hideTimer() {
        if (timer_) std::fputs("\r\033[K", stderr);
        timer_.reset();
        end_.reset();
    }

    void stop() {
        if (phase_ == Phase::before) {  // nothing was asked for yet
            phase_ = Phase::over;
            return;
        }
        if (phase_ == Phase::starting) {  // the daemon is asked once it has begun
            isStopWanted_ = true;
            return;
        }
        if (phase_ != Phase::running) return;
        phase_ = Phase::over;
        hideTimer();
        stopAndKeep(program_, seconds());
    }

    /// The daemon ends recordings of its own accord, too, and saves them itself then.
    void told(const std::string& name, const Dictionary& arguments) {
        if (name == "recordingDidStopWithError" || name == "recordingLockInterrupted") {
            const Value* const error = arguments.find("error");
            // It may have ended before the answer to its start is here.
            if (phase_ == Phase::starting) endBeforeAnswer_ = *error;
            if (phase_ == Phase::running) ended(*error);
            return;
        }
        if (phase_ != Phase::running) return;
        if (name != "updateScreenRecordingState") return;
        program_.daemon().synchronousGetCurrentState(program_.onMain([this](const auto& state) {
            if (phase_ == Phase::running && !isRecording(state)) stoppedElsewhere();
        }));
    }

    void ended(const Value& reason) {
        const KVError* const error = reason.asError();
        if (error == nullptr) return stoppedElsewhere();
        hideTimer();
        program_.fail(*error);
        program_.remark(
            "`kelvoctl library` tells what was saved, and `kelvoctl library recover` saves the rest");
    }

    void stoppedElsewhere() {
        hideTimer();
        program_.answer("the recording was stopped from elsewhere", Dictionary{{"stopped", "elsewhere"}});
        program_.finish(program_.line().output.empty() ? kDone : kRefused);
    }

    Program& program_;
    Phase phase_ = Phase::before;
    bool isStopWanted_ = false;
    std::optional<Value> endBeforeAnswer_;
    std::chrono::nanoseconds startedAt_{0};
    std::shared_ptr<RepeatingTimer> timer_;
    std::shared_ptr<RepeatingTimer> end_;
};

}  // namespace

std::shared_ptr<void> beginRecord(Program& program) {
    const auto recording = std::make_shared<Recording>(program);
    recording->begin();
    return recording;
}

std::shared_ptr<void> beginStop(Program& program) {
    if (const std::string& output = program.line().output; !output.empty()) {
        if (const OptionalError error = checkOutput(output)) {
            program.fail(error->localizedDescription(), kWrongUsage);
            return nullptr;
        }
    }
    program.daemon().synchronousGetCurrentState(program.onMain([&program](const auto& state) {
        if (!isRecording(state)) return program.fail("nothing is being recorded", kNothingToDo);
        stopAndKeep(program, std::nullopt);
    }));
    return nullptr;
}

}  // namespace kelvo::ctl
