#pragma once

#include <cstdint>
#include <string>
#include <string_view>

namespace kelvokit {

/// The domain of every error that has one of the codes below.
inline constexpr std::string_view kRecordingErrorDomain = "com.quillon.KelvoKit.KVRecordingErrorDomain";

/// What can go wrong. The numbers never change.
enum class ErrorCode : std::int64_t {
    unknown = -5800,
    userDeclined = -5801,         ///< the user said no when asked for consent
    disabled = -5802,             ///< recording is disabled on this device
    failedToStart = -5803,        ///< also: the application is not in front, or the windows are not its own
    failed = -5804,               ///< the recording failed while it ran
    insufficientStorage = -5805,  ///< not enough free storage
    interrupted = -5806,          ///< a call, or somebody more important
    contentResize = -5807,        ///< the content changed its size, or applications share the screen
    invalidBroadcastSession = -5808,  ///< no broadcast was set up, or its extension does not answer
    systemDormancy = -5809,           ///< the device is locked
    entitlements = -5810,             ///< the application lacks a right
    activePhoneCall = -5811,          ///< a phone call is active
    failedToSave = -5812,             ///< the movie could not be saved
    autobay = -5813,                  ///< the in-car display is in use
    connectionInvalid = -5814,        ///< the daemon is not there
    connectionInterrupted = -5815,    ///< the daemon went while it was asked
    noContextIDMatch = -5816,         ///< none of the windows is visible
    mediaServicesFailed = -5817,      ///< the screen could not be captured
    mixingFailure = -5818,            ///< the sound tracks could not be mixed
    broadcastSetupRefused = -5819,    ///< the application may not set up a broadcast
};

/// Why something failed. Plain data.
struct Error {
    std::string domain;
    std::int64_t code = 0;
    /// A text for the user, in the user's language; may be empty.
    std::string description;
    /// A text for developers and logs, in English; may be empty.
    std::string detail;

    bool is(ErrorCode which) const {
        return domain == kRecordingErrorDomain && code == static_cast<std::int64_t>(which);
    }
};

}  // namespace kelvokit
