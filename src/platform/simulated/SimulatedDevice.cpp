#include "platform/simulated/SimulatedDevice.h"

#include "base/GlobalQueue.h"

namespace kelvo {

SimulatedDevice::SimulatedDevice()
    : faults(std::make_shared<SimulatedFaults>()),
      clock(std::make_shared<SimulatedClock>()),
      mainQueue(std::make_shared<MainQueue>(*clock)),
      random(std::make_shared<SimulatedRandom>()),
      fileSystem(std::make_shared<SimulatedFileSystem>(clock, faults)),
      textFolding(std::make_shared<SimulatedTextFolding>()),
      bundles(std::make_shared<SimulatedBundles>()),
      languages(std::make_shared<SimulatedLanguages>()),
      preferences(std::make_shared<SimulatedPreferences>()),
      device(std::make_shared<SimulatedDeviceProperties>()),
      notifications(std::make_shared<SimulatedNotifications>()),
      storagePurge(std::make_shared<SimulatedStoragePurge>()),
      audio(std::make_shared<SimulatedAudio>(clock, faults)),
      calls(std::make_shared<SimulatedCallObserver>(mainQueue)),
      restrictions(std::make_shared<SimulatedRestrictions>()),
      displayLayout(std::make_shared<SimulatedDisplayLayout>()),
      screen(std::make_shared<SimulatedScreen>(clock)),
      renderServer(std::make_shared<SimulatedRenderServer>()),
      analytics(std::make_shared<SimulatedAnalytics>(faults)),
      bulletins(std::make_shared<SimulatedBulletins>()),
      alerts(std::make_shared<SimulatedAlerts>(faults)),
      ipc(std::make_shared<SimulatedIPC>()),
      media(std::make_shared<SimulatedMedia>(fileSystem, faults)),
      photoLibrary(std::make_shared<SimulatedPhotoLibrary>(fileSystem, faults)),
      sounds(std::make_shared<SimulatedSystemSounds>()),
      applications(std::make_shared<SimulatedApplications>()),
      accessibility(std::make_shared<SimulatedAccessibility>()),
      inCarDisplay(std::make_shared<SimulatedInCarDisplay>(faults)) {}

Platform SimulatedDevice::platform() const {
    Platform platform;
    platform.processIdentifier = kProcessIdentifier;
    platform.clock = clock;
    platform.random = random;
    platform.mainQueue = mainQueue;
    platform.fileSystem = fileSystem;
    platform.textFolding = textFolding;
    platform.bundles = bundles;
    platform.languages = languages;
    platform.preferences = preferences;
    platform.device = device;
    platform.notifications = notifications;
    platform.storagePurge = storagePurge;
    platform.audio = audio;
    platform.calls = calls;
    platform.restrictions = restrictions;
    platform.displayLayout = displayLayout;
    platform.screenCapture = screen;
    platform.displayMirroring = screen;
    platform.renderServer = renderServer;
    platform.analytics = analytics;
    platform.bulletins = bulletins;
    platform.alerts = alerts;
    platform.ipc = ipc;
    platform.media = media;
    platform.photoLibrary = photoLibrary;
    platform.sounds = sounds;
    platform.applications = applications;
    platform.accessibility = accessibility;
    platform.inCarDisplay = inCarDisplay;
    return platform;
}

void SimulatedDevice::settle() {
    do {
        GlobalQueue::drain();
    } while (mainQueue->runUntilIdle() > 0 || ipc->settle() || applications->settle());
}

void SimulatedDevice::advance(std::chrono::nanoseconds interval) {
    clock->advance(interval);
    screen->catchUp();
    settle();
}

void SimulatedDevice::setScreenRecordingAllowed(bool isAllowed) {
    restrictions->change(kScreenRecordingAllowedRestriction,
                         isAllowed ? RestrictionSetting::yes : RestrictionSetting::no);
}

void SimulatedDevice::setLayout(const std::vector<int>& levels) {
    DisplayLayout layout;
    for (const int level : levels)
        layout.elements.push_back({level});
    displayLayout->change(layout);
}

}  // namespace kelvo
