#include "ipc/KVMultipleClientProxy.h"

#include "base/KVLog.h"
#include "ipc/KVClientProtocolTable.h"

#include <algorithm>

namespace kelvo {

const std::shared_ptr<KVMultipleClientProxy>& KVMultipleClientProxy::clientProxy() {
    static const auto shared = std::make_shared<KVMultipleClientProxy>();
    return shared;
}

void KVMultipleClientProxy::handleNewConnection(const IPCConnectionRef& connection) {
    const std::lock_guard lock(lock_);
    if (std::ranges::find(connectionSet_, connection) == connectionSet_.end())
        connectionSet_.push_back(connection);
}

std::vector<IPCConnectionRef> KVMultipleClientProxy::connectionSet() const {
    const std::lock_guard lock(lock_);
    return connectionSet_;
}

void KVMultipleClientProxy::resetConnectionWithProcessIdentifier(std::int32_t processIdentifier) {
    const std::lock_guard lock(lock_);
    for (const IPCConnectionRef& connection : connectionSet_) {
        if (connection->processIdentifier() != processIdentifier) continue;
        connection->setInvalidationHandler(nullptr);
        connection->setInterruptionHandler(nullptr);
        connection->invalidate();
    }
}

/// `send` gets each client and its connection.
template <typename Send>
void KVMultipleClientProxy::sendToEveryone(const char* failureText, Send send) {
    const std::lock_guard lock(lock_);
    for (const IPCConnectionRef& connection : connectionSet_) {
        RemoteClient client = remoteClient(*connection, failureText);
        send(client, *connection);
    }
}

void KVMultipleClientProxy::updateScreenRecordingState() {
    KVLog("KVMultipleClientProxy:updateScreenRecordingState:");
    const std::lock_guard lock(lock_);
    if (connectionSet_.size() < 2) return;
    for (const IPCConnectionRef& connection : connectionSet_) {
        if (connection->processIdentifier() == currentConnectionProcessIdentifier_) continue;
        remoteClient(*connection,
                     "KVMultipleClientProxy:updateScreenRecordingState: error getting remote proxy")
            .updateScreenRecordingState();
    }
}

void KVMultipleClientProxy::recordingDidStopWithError(const OptionalError& error,
                                                      const std::optional<URL>& movieURL) {
    KVLog("KVMultipleClientProxy:recordingDidStopWithError:movieURL:");
    sendToEveryone("KVMultipleClientProxy:recordingDidStopWithError: error getting remote proxy",
                   [&](auto& client, const IPCConnection& connection) {
                       client.recordingDidStopWithError(error, urlForPeer(connection, movieURL));
                   });
}

void KVMultipleClientProxy::updateBroadcastURL(const URL& broadcastURL) {
    KVLog("KVMultipleClientProxy:updateBroadcastURL:");
    sendToEveryone("KVMultipleClientProxy:updateBroadcastURL: error getting remote proxy",
                   [&](auto& client, const auto&) { client.updateBroadcastURL(broadcastURL); });
}

/// The failure's text names another message, and misspells it; readers of logs know it so.
void KVMultipleClientProxy::recordingLockInterrupted(const KVError& error) {
    KVLog("KVMultipleClientProxy:recordingLockInterrupted:");
    sendToEveryone("KVMultipleClientProxy:recodingDidStopAndSavedToCameraRoll: video saved to camera roll",
                   [&](auto& client, const auto&) { client.recordingLockInterrupted(error); });
}

void KVMultipleClientProxy::recordingTimerDidUpdate(const std::string& timerText) {
    KVLog("KVMultipleClientProxy:recordingTimerDidUpdate:");
    sendToEveryone("KVMultipleClientProxy:recordingTimerDidUpdate: error getting remote proxy",
                   [&](auto& client, const auto&) { client.recordingTimerDidUpdate(timerText); });
}

void KVMultipleClientProxy::recordingShouldResume() {
    KVLogError("KVMultipleClientProxy: recordingShouldResume is not offered");
}

void KVMultipleClientProxy::recordingDidPause() {
    KVLogError("KVMultipleClientProxy: recordingDidPause is not offered");
}

}  // namespace kelvo
