#pragma once

#include "base/Guarded.h"
#include "base/SerialQueue.h"
#include "ipc/KVDaemonProtocol.h"
#include "support/KVLocalization.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

namespace kelvo {

/// Handles what clients ask, and is told who comes and goes. Requests arrive one at a time on the connection
/// manager's queue, which a handler must not `sync` to; the two events on threads of the transport.
class KVConnectionManagerDelegate : public KVDaemonProtocol {
  public:
    /// Once for each client, before it can send anything.
    virtual void connectionManagerDidAcceptNewConnection(
        const IPCConnectionRef& connection, const std::optional<std::string>& bundleIdentifier) = 0;
    /// A client's connection was interrupted or is over; a lost client is reported for each. The identifier
    /// is the one of its acceptance: none when its program belonged to no bundle.
    virtual void applicationDisconnectedWithBundleID(const std::optional<std::string>& bundleIdentifier,
                                                     std::int32_t processIdentifier) = 0;
};

/// The daemon's door for client processes: the delegate of the public listener, and the object that every
/// client's requests arrive at. Passes them on to its delegate one after another, whoever sent them.
/// Thread-safe.
class KVConnectionManager : public IPCListenerDelegate,
                            public KVDaemonProtocol,
                            public std::enable_shared_from_this<KVConnectionManager> {
  public:
    KVConnectionManager(std::shared_ptr<IPCTransport> transport, std::shared_ptr<KVLocalization> localization)
        : transport_(std::move(transport)), localization_(std::move(localization)) {}

    std::shared_ptr<KVConnectionManagerDelegate> delegate() const { return delegate_.copy().lock(); }
    /// Held weakly: the delegate owns this object.
    void setDelegate(std::weak_ptr<KVConnectionManagerDelegate> delegate) {
        delegate_.set(std::move(delegate));
    }

    /// The queue on which the delegate handles requests; one for the process.
    static SerialQueue& connectionManagerQueue();

    /// The connection of the request that is served now; outside a request the one remembered, if it still
    /// lives.
    IPCConnectionRef getCurrentConnection() const;
    /// Remembers, weakly, who sent the latest request, here and in the shared multiple proxy.
    void setCurrentConnection(const IPCConnectionRef& connection);

    /// Sets every connection up, tells the delegate, and says yes. The system's broadcast picker alone is
    /// served without the delegate hearing of its coming or going.
    bool listenerShouldAcceptNewConnection(IPCListener& listener,
                                           const IPCConnectionRef& connection) override;

    void startRecordingWindowLayerContextIDs(const std::vector<std::uint32_t>& windowLayerContextIDs,
                                             const Size& windowSize, bool microphoneEnabled,
                                             bool cameraEnabled, bool broadcast, bool systemRecording,
                                             bool captureEnabled,
                                             const std::shared_ptr<IPCEndpoint>& listenerEndpoint,
                                             StartHandler handler) override;
    /// Refused, with a bare error, to a client that holds neither of the two rights.
    void setupBroadcastWithHostBundleID(const std::string& hostBundleID,
                                        const std::string& broadcastExtensionBundleID,
                                        const Bytes& broadcastConfigurationData, const Dictionary& userInfo,
                                        ErrorHandler handler) override;
    void getCurrentBroadcastImages(ImagesHandler handler) override;
    void getSystemBroadcastExtensionInfo(ExtensionsHandler handler) override;
    void stopRecordingWithHandler(MovieHandler handler) override;
    void stopRecordingWithStartClipDuration(double startClipDuration, double endClipDuration,
                                            MovieHandler handler) override;
    void saveVideoToCameraRoll(const URL& movieURL, ErrorHandler handler) override;
    void pauseRecording() override;
    void resumeRecordingWithWindowLayerContextID(std::uint32_t windowLayerContextID) override;
    void setMicrophoneEnabled(bool enabled) override;
    void updateProcessIDForAudioCaptureWithPID(std::int32_t processIdentifier) override;
    void discardRecordingWithHandler(DoneHandler handler) override;
    void synchronousGetCurrentState(StateHandler handler) override;
    void synchronousIsBroadcastingWithPreferredExtension(const std::string& preferredExtension,
                                                         BooleanHandler handler) override;
    void setHasUserConsentForCamera(bool consent) override;
    void setHasUserConsentForMicrophone(bool consent) override;
    void setBroadcastURL(const URL& broadcastURL) override;
    void setMicrophoneEnabledPersistent(bool enabled) override;
    void reportCameraUsage(std::int32_t cameraUsage) override;

  private:
    void installHandlers(IPCConnection& connection, const std::optional<std::string>& bundleIdentifier) const;
    template <typename Forward>
    void serve(const char* request, Forward forward);
    template <typename Forward>
    void runOnQueue(const char* request, Forward forward);

    const std::shared_ptr<IPCTransport> transport_;
    const std::shared_ptr<KVLocalization> localization_;
    Guarded<std::weak_ptr<KVConnectionManagerDelegate>> delegate_;
    Guarded<std::weak_ptr<IPCConnection>> currentConnection_;
};

}  // namespace kelvo
