#include "base/KVLog.h"
#include "session/KVRecordingSession.h"

namespace kelvo {

OptionalError KVRecordingSession::enableBroadcastWithExtension(const Value&, BroadcastProcessMode processMode,
                                                               const Dictionary& userInfo,
                                                               const std::shared_ptr<IPCEndpoint>&) {
    KVLog("KVRecordingSession: enableBroadcastWithExtension");
    broadcastUserInfo_.set(userInfo);
    broadcastFragmentIndex_ = 1;
    broadcastProcessMode_ = processMode;
    return services_.errors->kvUserErrorForCode(kRecordingErrorInvalidBroadcastSession);
}

void KVRecordingSession::disableBroadcast() {
    KVLog("KVRecordingSession: disableBroadcast");
    broadcastExtension_.set(nullptr);
    broadcastUserInfo_.set(std::nullopt);
    broadcastConfiguration_.set(nullptr);
    broadcastProcessMode_ = BroadcastProcessMode::movieClips;
}

}  // namespace kelvo
