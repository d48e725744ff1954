#pragma once

#include "base/Geometry.h"
#include "ipc/KVDaemonProtocol.h"
#include "session/RecordingSession.h"

#include <cstdint>
#include <memory>
#include <vector>

namespace kelvo {

/// What one client asked for when it asked for a recording. Not changed once it is made; any thread.
struct StartRequest {
    /// The caller's session; none when the caller belongs to no bundle.
    SessionRef session;
    std::vector<std::uint32_t> contextIDs;
    Size windowSize;  ///< in points
    bool microphoneEnabled = false;
    bool cameraEnabled = false;
    bool broadcast = false;
    bool systemRecording = false;
    bool captureEnabled = false;
    std::shared_ptr<IPCEndpoint> listenerEndpoint;
    KVDaemonProtocol::StartHandler handler;  ///< may be none

    void refuse(const KVError& error) const {
        if (handler) handler(error, false, false);
    }
    /// The same, and the client looks at its state again.
    void refuseAndUpdate(const KVError& error) const {
        refuse(error);
        updateClient();
    }
    void updateClient() const {
        const ClientProxyRef client = session ? session->clientProxy() : nullptr;
        if (client) client->updateScreenRecordingState();
    }
    /// The process of the session's client; 0 when nobody is connected.
    std::int32_t clientProcess() const {
        const ClientProxyRef client = session ? session->clientProxy() : nullptr;
        return client ? client->processIdentifier() : 0;
    }
};

using StartRequestRef = std::shared_ptr<const StartRequest>;

}  // namespace kelvo
