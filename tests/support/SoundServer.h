#pragma once

#include "ChildProcess.h"
#include "TemporaryDirectory.h"

#include <memory>
#include <optional>
#include <string>
#include <vector>

namespace kelvo::test {

/// A server of the PulseAudio protocol of the test's own, without hardware: a sink "speaker", and a source
/// "mic", the default one, on which is heard what is played into the sink "micfeed". While this object lives,
/// the process's sound is there (`PULSE_SERVER`), whether the server runs or not.
class SoundServer {
  public:
    /// Whose server speaks the protocol.
    enum class Kind { pulseAudio, pipeWire };

    explicit SoundServer(Kind kind = Kind::pulseAudio);
    ~SoundServer();
    SoundServer(const SoundServer&) = delete;
    SoundServer& operator=(const SoundServer&) = delete;

    /// Whether this machine has PipeWire, its PulseAudio server and its session manager.
    static bool hasPipeWire();

    /// Says whether it answers.
    bool start();
    /// At once, as in a crash.
    void kill();
    pid_t processIdentifier() const { return processes_.front()->processIdentifier(); }

    /// A command such as "set-default-source mic"; says whether it succeeded.
    bool control(const std::string& command) const;
    /// What a command such as "list short sink-inputs" prints.
    std::string answer(const std::string& command) const;

    /// Plays a sine of `frequency` Hz at half of full scale into `sink` for as long as the result lives. The
    /// stream says that it belongs to `process`; without one, to the playing process itself.
    std::unique_ptr<ChildProcess> play(int frequency, const std::string& sink,
                                       std::optional<int> process = std::nullopt) const;

  private:
    void startPulseAudio();
    void startPipeWire();
    void run(const std::vector<std::string>& command);
    void awaitFile(const std::string& name) const;
    bool hasDevices() const;
    bool makeDevices() const;

    const Kind kind_;
    const TemporaryDirectory folder_;
    const std::string socket_;
    std::vector<std::unique_ptr<ChildProcess>> processes_;
};

}  // namespace kelvo::test
