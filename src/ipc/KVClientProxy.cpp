#include "ipc/KVClientProxy.h"

#include "base/KVLog.h"
#include "ipc/KVClientProtocolTable.h"

namespace kelvo {
namespace {

/// Sends a callback over `connection`; a failed delivery logs `failureText` and its code.
template <typename Send>
void deliverTo(const IPCConnectionRef& connection, const char* failureText, Send send) {
    if (!connection) return;
    RemoteClient client = remoteClient(*connection, failureText);
    send(client);
}

/// Logs `text`, then delivers.
template <typename Send>
void sendTo(const IPCConnectionRef& connection, const char* text, const char* failureText, Send send) {
    KVLog("%s", text);
    deliverTo(connection, failureText, send);
}

}  // namespace

KVClientProxy::~KVClientProxy() {
    const IPCConnectionRef connection = connection_.exchange(nullptr);
    if (!connection) return;
    connection->setInvalidationHandler(nullptr);
    connection->setInterruptionHandler(nullptr);
    connection->invalidate();
}

std::int32_t KVClientProxy::processIdentifier() const {
    const IPCConnectionRef client = connection();
    return client ? client->processIdentifier() : 0;
}

void KVClientProxy::updateScreenRecordingState() {
    KVLog("KVClientProxy:updateScreenRecordingState");
}

void KVClientProxy::recordingDidStopWithError(const OptionalError& error,
                                              const std::optional<URL>& movieURL) {
    sendTo(connection(), "KVClientProxy:recordingDidStopWithError:movieURL:",
           "KVClientProxy:recordingDidStopWithError: error getting remote proxy",
           [&, client = connection()](auto& remote) {
               remote.recordingDidStopWithError(error, urlForPeer(*client, movieURL));
           });
}

void KVClientProxy::updateBroadcastServiceInfo(const Dictionary& serviceInfo) {
    sendTo(connection(), "KVClientProxy:updateBroadcastServiceInfo:",
           "KVClientProxy:updateBroadcastServiceInfo: error getting remote proxy",
           [&](auto& client) { client.updateBroadcastServiceInfo(serviceInfo); });
}

void KVClientProxy::updateBroadcastURL(const URL& broadcastURL) {
    sendTo(connection(), "KVClientProxy:updateBroadcastURL:",
           "KVClientProxy:updateBroadcastURL: error getting remote proxy",
           [&](auto& client) { client.updateBroadcastURL(broadcastURL); });
}

void KVClientProxy::captureHandlerWithSample(const std::shared_ptr<KVIOSurfaceObject>& surface,
                                             const RecordBytes<TimingRecord>& timingData) {
    KVLogSample("KVClientProxy:captureHandlerWithSample:");
    const IPCConnectionRef client = connection();
    constexpr std::size_t kMethod = messageIndex<&KVClientProtocol::captureHandlerWithSample>();
    if (client && surface && client->handOver({kMethod, surface->ioSurface(), timingData})) return;
    deliverTo(client, "KVClientProxy:captureHandlerWithSample: error getting remote proxy",
              [&](auto& remote) { remote.captureHandlerWithSample(surface, timingData); });
}

void KVClientProxy::captureHandlerWithAudioSample(std::span<const std::byte> audioData,
                                                  const RecordBytes<AudioFormatRecord>& absdData,
                                                  std::int64_t itemCount, SampleBuffer::Type bufferType,
                                                  const RecordBytes<TimingRecord>& timingData) {
    KVLogSample("KVClientProxy:captureHandlerWithAudioSample:");
    deliverTo(connection(), "KVClientProxy:captureHandlerWithAudioSample: error getting remote proxy",
              [&](auto& client) {
                  client.captureHandlerWithAudioSample(audioData, absdData, itemCount, bufferType,
                                                       timingData);
              });
}

/// The failure's text names another message, and misspells it; readers of logs know it so.
void KVClientProxy::recordingLockInterrupted(const KVError& error) {
    sendTo(connection(), "KVClientProxy:recordingLockInterrupted:",
           "KVClientProxy:recodingDidStopAndSavedToCameraRoll: video saved to camera roll",
           [&](auto& client) { client.recordingLockInterrupted(error); });
}

void KVClientProxy::recordingShouldResume() {
    sendTo(connection(), "KVClientProxy:recordingShouldResume:",
           "KVClientProxy:recordingShouldResume: error getting remote proxy",
           [](auto& client) { client.recordingShouldResume(); });
}

void KVClientProxy::recordingDidPause() {
    sendTo(connection(),
           "KVClientProxy:recordingDidPause:", "KVClientProxy:recordingDidPause: error getting remote proxy",
           [](auto& client) { client.recordingDidPause(); });
}

void KVClientProxy::recordingTimerDidUpdate(const std::string& timerText) {
    sendTo(connection(), "KVClientProxy:recordingTimerDidUpdate:",
           "KVClientProxy:recordingTimerDidUpdate: error getting remote proxy",
           [&](auto& client) { client.recordingTimerDidUpdate(timerText); });
}

}  // namespace kelvo
