#pragma once

#include "ChildProcess.h"
#include "TemporaryDirectory.h"

#include <memory>
#include <optional>
#include <string>

namespace kelvo::test {

/// A PulseAudio server of the test's own, without hardware: a sink "speaker", and a source "mic", the default
/// one, on which is heard what is played into the sink "micfeed". While this object lives, the process's
/// sound is there (`PULSE_SERVER`), whether the server runs or not.
class SoundServer {
  public:
    SoundServer();
    ~SoundServer();
    SoundServer(const SoundServer&) = delete;
    SoundServer& operator=(const SoundServer&) = delete;

    /// Says whether it answers.
    bool start();
    /// At once, as in a crash.
    void kill();
    pid_t processIdentifier() const { return server_->processIdentifier(); }

    /// A command such as "set-default-source mic"; says whether it succeeded.
    bool control(const std::string& command) const;
    /// What a command such as "list short sink-inputs" prints.
    std::string answer(const std::string& command) const;

    /// Plays a sine of `frequency` Hz at half of full scale into `sink` for as long as the result lives. The
    /// stream says that it belongs to `process`; without one, to the playing process itself.
    std::unique_ptr<ChildProcess> play(int frequency, const std::string& sink,
                                       std::optional<int> process = std::nullopt) const;

  private:
    const TemporaryDirectory folder_;
    const std::string address_;
    std::unique_ptr<ChildProcess> server_;
};

}  // namespace kelvo::test
