#pragma once

#include "platform/Platform.h"
#include "platform/simulated/SimulatedAnalytics.h"
#include "platform/simulated/SimulatedApplications.h"
#include "platform/simulated/SimulatedAudio.h"
#include "platform/simulated/SimulatedBundles.h"
#include "platform/simulated/SimulatedClock.h"
#include "platform/simulated/SimulatedEnvironment.h"
#include "platform/simulated/SimulatedFaults.h"
#include "platform/simulated/SimulatedFileSystem.h"
#include "platform/simulated/SimulatedIPC.h"
#include "platform/simulated/SimulatedMedia.h"
#include "platform/simulated/SimulatedNotifications.h"
#include "platform/simulated/SimulatedPhotoLibrary.h"
#include "platform/simulated/SimulatedScreen.h"
#include "platform/simulated/SimulatedSettings.h"
#include "platform/simulated/SimulatedShell.h"
#include "platform/simulated/SimulatedStoragePurge.h"

#include <chrono>
#include <memory>
#include <string>
#include <string_view>

namespace kelvo {

/// A whole device without hardware, driven by a test or, through `perform`, by a script.
///
/// Nothing here happens by itself: the clock stands until it is moved, the main queue runs only inside
/// `settle`, and random bytes are the same in every run. Work for the global queues runs on their threads;
/// `settle` waits for it. So after each call of the device and a `settle`, everything that follows from it
/// has happened.
///
///     SimulatedDevice device;
///     auto manager = KVRecordingManager::create(device.platform(), ...);
///     device.lock();
///     device.settle();          // the blanked-screen handler has run
///
/// The twins of single services are public members for what this class has no verb for. Thread-safe but for
/// `settle` and `advance`, which belong to the thread that plays the main thread.
class SimulatedDevice {
  public:
    SimulatedDevice();

    /// What `platform().processIdentifier` is.
    static constexpr std::int32_t kProcessIdentifier = 77;

    /// The services to hand to the logic.
    Platform platform() const;

    /// Runs main-queue tasks, due timers, global-queue work and messages until none is left.
    void settle();
    /// Moves the clock, lets the screen deliver what that made due, and settles.
    void advance(std::chrono::nanoseconds interval);

    /// The screen goes blank or comes back.
    void lock() { notifications->post(kBlankedScreenNotification, 1); }
    void unlock() { notifications->post(kBlankedScreenNotification, 0); }

    /// A call comes in, is placed, or ends.
    void ring() { calls->changeCall({.isOutgoing = false, .hasEnded = false}); }
    void dial() { calls->changeCall({.isOutgoing = true, .hasEnded = false}); }
    void hangUp() { calls->changeCall({.isOutgoing = false, .hasEnded = true}); }

    /// Screen recording is allowed or forbidden from now on.
    void setScreenRecordingAllowed(bool isAllowed);
    /// The display shows one element for each level.
    void setLayout(const std::vector<int>& levels);
    void setFreeSpace(std::uint64_t bytes) { fileSystem->setFreeSpace(bytes); }
    /// The microphone is taken away, or comes back.
    void takeMicrophone() { audio->interrupt(); }
    void giveMicrophoneBack() { audio->endInterruption(); }
    void answerAlert(SystemAlertResponse response) { alerts->answer(response); }

    /// The next call of "Service.operation" (the names that the twins use, as in "FileSystem.removeItem")
    /// reports the errno value `code`.
    void failNext(const std::string& operation, int code) {
        faults->failNext(operation, KVError::posix(code, operation));
    }

    /// One line of a script: "lock", "unlock", "ring", "dial", "hang-up", "forbid-recording",
    /// "allow-recording", "layout LEVEL...", "free-space BYTES", "advance SECONDS", "answer
    /// default|alternate|other|cancelled", "fail OPERATION ERRNO", "purge URGENCY", "take-microphone",
    /// "give-microphone-back", "sound SECONDS" (advances the clock; what is heard meanwhile is captured) or
    /// "settle". Fails, having done nothing, on anything else.
    OptionalError perform(std::string_view line);

    const std::shared_ptr<SimulatedFaults> faults;
    const std::shared_ptr<SimulatedClock> clock;
    const std::shared_ptr<MainQueue> mainQueue;
    const std::shared_ptr<SimulatedRandom> random;
    const std::shared_ptr<SimulatedFileSystem> fileSystem;
    const std::shared_ptr<SimulatedTextFolding> textFolding;
    const std::shared_ptr<SimulatedBundles> bundles;
    const std::shared_ptr<SimulatedLanguages> languages;
    const std::shared_ptr<SimulatedPreferences> preferences;
    const std::shared_ptr<SimulatedDeviceProperties> device;
    const std::shared_ptr<SimulatedNotifications> notifications;
    const std::shared_ptr<SimulatedStoragePurge> storagePurge;
    const std::shared_ptr<SimulatedAudio> audio;
    const std::shared_ptr<SimulatedCallObserver> calls;
    const std::shared_ptr<SimulatedRestrictions> restrictions;
    const std::shared_ptr<SimulatedDisplayLayout> displayLayout;
    const std::shared_ptr<SimulatedScreen> screen;
    const std::shared_ptr<SimulatedRenderServer> renderServer;
    const std::shared_ptr<SimulatedAnalytics> analytics;
    const std::shared_ptr<SimulatedBulletins> bulletins;
    const std::shared_ptr<SimulatedAlerts> alerts;
    const std::shared_ptr<SimulatedIPC> ipc;
    const std::shared_ptr<SimulatedMedia> media;
    const std::shared_ptr<SimulatedPhotoLibrary> photoLibrary;
    const std::shared_ptr<SimulatedSystemSounds> sounds;
    const std::shared_ptr<SimulatedApplications> applications;
    const std::shared_ptr<SimulatedAccessibility> accessibility;
    const std::shared_ptr<SimulatedInCarDisplay> inCarDisplay;
};

}  // namespace kelvo
