#include "base/GlobalQueue.h"
#include "contract/AudioServiceContract.h"
#include "platform/linux/pulse/PulseAudioService.h"
#include "platform/linux/system/SystemClock.h"
#include "platform/simulated/SimulatedDevice.h"

#include <cstdlib>
#include <thread>

namespace kelvo::test {
namespace {

using namespace std::chrono_literals;

class SimulatedAudioWorld {
  public:
    AudioService& audio() { return *device_.audio; }
    void listen() {
        for (int i = 0; i < 5; ++i) {
            device_.advance(100ms);
            device_.audio->play(100ms);
        }
    }
    void settle() { device_.settle(); }

  private:
    SimulatedDevice device_;
};

/// PulseAudio's adapter without a server: silence passes through it in real time.
class PulseAudioWorld {
  public:
    PulseAudioWorld() { ::setenv("PULSE_SERVER", "unix:/nonexistent/socket", 1); }

    AudioService& audio() { return audio_; }
    void listen() { std::this_thread::sleep_for(500ms); }
    void settle() { GlobalQueue::drain(); }

  private:
    pulse::PulseAudioService audio_{std::make_shared<SystemClock>()};
};

INSTANTIATE_TYPED_TEST_SUITE_P(Simulated, AudioServiceContract, SimulatedAudioWorld);
INSTANTIATE_TYPED_TEST_SUITE_P(Pulse, AudioServiceContract, PulseAudioWorld);

}  // namespace
}  // namespace kelvo::test
