#pragma once

#include "base/Clock.h"
#include "base/MainQueue.h"
#include "platform/Accessibility.h"
#include "platform/AnalyticsSink.h"
#include "platform/ApplicationState.h"
#include "platform/AudioService.h"
#include "platform/BulletinService.h"
#include "platform/Bundles.h"
#include "platform/CallObserver.h"
#include "platform/DeviceProperties.h"
#include "platform/DisplayLayout.h"
#include "platform/FileSystem.h"
#include "platform/IPC.h"
#include "platform/InCarDisplay.h"
#include "platform/MediaService.h"
#include "platform/NotificationCenter.h"
#include "platform/PhotoLibrary.h"
#include "platform/Preferences.h"
#include "platform/Random.h"
#include "platform/RenderServer.h"
#include "platform/RestrictionsProfile.h"
#include "platform/ScreenCapture.h"
#include "platform/StoragePurgeService.h"
#include "platform/SystemAlert.h"
#include "platform/SystemSounds.h"
#include "platform/TextFolding.h"

#include <cstdint>
#include <memory>

namespace kelvo {

/// Everything that the operating system supplies, gathered once in `main` or by a test and handed to
/// constructors. Nothing above this layer reads the world in any other way. Services are destroyed in reverse
/// order, so one may rely on those above it.
struct Platform {
    /// The process identifier of the daemon itself.
    std::int32_t processIdentifier = 0;
    std::shared_ptr<Clock> clock;
    std::shared_ptr<Random> random;
    std::shared_ptr<MainQueue> mainQueue;
    std::shared_ptr<FileSystem> fileSystem;
    std::shared_ptr<TextFolding> textFolding;
    std::shared_ptr<BundleService> bundles;
    std::shared_ptr<Languages> languages;
    std::shared_ptr<Preferences> preferences;
    std::shared_ptr<DeviceProperties> device;
    std::shared_ptr<NotificationCenter> notifications;
    std::shared_ptr<StoragePurgeService> storagePurge;
    std::shared_ptr<AudioService> audio;
    std::shared_ptr<CallObserver> calls;
    std::shared_ptr<RestrictionsProfile> restrictions;
    std::shared_ptr<DisplayLayoutService> displayLayout;
    std::shared_ptr<ScreenCaptureService> screenCapture;
    std::shared_ptr<DisplayMirroring> displayMirroring;
    std::shared_ptr<RenderServer> renderServer;
    std::shared_ptr<AnalyticsSink> analytics;
    std::shared_ptr<BulletinService> bulletins;
    std::shared_ptr<SystemAlertService> alerts;
    std::shared_ptr<IPCTransport> ipc;
    std::shared_ptr<MediaService> media;
    std::shared_ptr<PhotoLibrary> photoLibrary;
    std::shared_ptr<SystemSounds> sounds;
    std::shared_ptr<ApplicationStateSource> applications;
    std::shared_ptr<Accessibility> accessibility;
    std::shared_ptr<InCarDisplay> inCarDisplay;
};

}  // namespace kelvo
