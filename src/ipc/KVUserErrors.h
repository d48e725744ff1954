#pragma once

#include "base/KVError.h"
#include "support/KVLocalization.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <string_view>

namespace kelvo {

/// The domain of every error that the daemon reports.
inline constexpr std::string_view KVRecordingErrorDomain = "com.quillon.KelvoKit.KVRecordingErrorDomain";

/// The codes of that domain. Clients compare them: they never change.
enum KVRecordingErrorCode : std::int64_t {
    kRecordingErrorUnknown = -5800,
    kRecordingErrorUserDeclined = -5801,         ///< the user declined the consent alert
    kRecordingErrorDisabled = -5802,             ///< recording is disabled
    kRecordingErrorFailedToStart = -5803,        ///< the recording could not be started
    kRecordingErrorFailed = -5804,               ///< the recording failed while running
    kRecordingErrorInsufficientStorage = -5805,  ///< not enough free storage
    kRecordingErrorInterrupted = -5806,          ///< a call, a pre-emption, a client in an unexpected state
    kRecordingErrorContentResize = -5807,  ///< the content changed size, or applications share the screen
    kRecordingErrorInvalidBroadcastSession = -5808,  ///< no valid broadcast session or extension
    kRecordingErrorSystemDormancy = -5809,           ///< the system went dormant, or withdrew the status bar
    kRecordingErrorEntitlements = -5810,             ///< the client lacks a right
    kRecordingErrorActivePhoneCall = -5811,          ///< a phone call is active
    kRecordingErrorFailedToSave = -5812,             ///< the movie could not be saved or processed
    kRecordingErrorAutobay = -5813,                  ///< the in-car display is in use
    kRecordingErrorConnectionInvalid = -5814,        ///< the client's connection became invalid
    kRecordingErrorConnectionInterrupted = -5815,    ///< the client's connection was interrupted
    kRecordingErrorNoContextIDMatch = -5816,         ///< none of the client's windows is visible
    kRecordingErrorMediaServicesFailed = -5817,      ///< screen capture failed or was reset
    kRecordingErrorMixingFailure = -5818,            ///< the audio tracks could not be mixed
    kRecordingErrorBroadcastSetupRefused = -5819,    ///< the client may not set up a broadcast; has no text
};

/// The key of the localized text for `code`; the unknown error's for every code without a text of its own.
std::string_view messageKeyForErrorCode(std::int64_t code);

/// Builds the daemon's errors with the text that the user reads. Thread-safe.
class KVUserErrors {
  public:
    explicit KVUserErrors(std::shared_ptr<KVLocalization> localization)
        : localization_(std::move(localization)) {}

    /// An error with exactly `code` and a copy of `userInfo`, whose localized description is set (replaced
    /// when there was one) to the text for the code. Without such a text the dictionary stays as it is.
    KVError kvUserErrorForCode(std::int64_t code,
                               const std::optional<Dictionary>& userInfo = std::nullopt) const;

  private:
    std::shared_ptr<KVLocalization> localization_;
};

}  // namespace kelvo
