#include "media/KVCaptureManager.h"

#include <utility>

namespace kelvo {
namespace {

constexpr AudioFormatRecord kAudioBasicDescription{
    .sampleRate = 44100.0,
    .formatIdentifier = kLinearPCMFormat,
    .formatFlags = kAudioFlagBigEndian | kAudioFlagSignedInteger | kAudioFlagPacked,
    .bytesPerPacket = 2,
    .framesPerPacket = 1,
    .bytesPerFrame = 2,
    .channelsPerFrame = 1,
    .bitsPerChannel = 16,
    .reserved = 0,
};

}  // namespace

std::shared_ptr<KVCaptureManager> KVCaptureManager::sharedManager(const Platform& platform) {
    audioDispatchQueue();  // first, so that it outlives the manager, which may still be called by a tap
    static Guarded<std::shared_ptr<KVCaptureManager>> manager;
    return manager.with([&](auto& shared) {
        if (!shared) shared = create(platform);
        return shared;
    });
}

std::shared_ptr<KVCaptureManager> KVCaptureManager::create(const Platform& platform) {
    std::shared_ptr<KVCaptureManager> manager(new KVCaptureManager(platform));
    manager->setUpAudioSession();
    return manager;
}

KVCaptureManager::KVCaptureManager(const Platform& platform)
    : audio_(platform.audio),
      clock_(platform.clock),
      audioSession_(platform.audio->audioSession()),
      sampleQueue_(std::make_shared<SerialQueue>("com.quillon.kelvokit.capture.session")),
      audioBasicDescription_(kAudioBasicDescription) {}

void KVCaptureManager::setUpAudioSession() {
    audioSession_->setInterruptionHandler([weakSelf = weak_from_this()](std::uint64_t type) {
        if (const auto self = weakSelf.lock()) self->handleAudioSessionInterruption(type);
    });
    // A device that refuses the category records all the same.
    static_cast<void>(audioSession_->setCategory(AudioSessionCategory::playAndRecord,
                                                 kAudioMixWithOthers | kAudioAllowHandsFreeWireless));
}

SerialQueue& KVCaptureManager::audioDispatchQueue() {
    static SerialQueue queue("com.quillon.KelvoKit.CaptureQueue");
    return queue;
}

/// A did-start handler, or one that gets application audio, runs on the queue already and may stop capture.
void KVCaptureManager::onDispatchQueue(const Task& task) {
    if (audioDispatchQueue().isCurrent()) {
        task();
    } else {
        audioDispatchQueue().sync(task);
    }
}

void KVCaptureManager::stopAllCapture() {
    // On the queue, so that it stops the session of a start that was asked for before.
    onDispatchQueue([this] { stopCaptureSession(); });
    stopMicrophoneCapture();
    stopAppAudioCapture();
    cameraOutputHandler_.set(nullptr);
    microphoneOutputHandler_.set(nullptr);
    appAudioOutputHandler_.set(nullptr);
    captureStartTime_.set(MediaTime::invalid());
    lastAudioDate_.set(std::nullopt);
    lastMicAudioDate_.set(std::nullopt);
}

}  // namespace kelvo
