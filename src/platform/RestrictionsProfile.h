#pragma once

#include <memory>
#include <string_view>

namespace kelvo {

/// The restriction that allows screen recording.
inline constexpr std::string_view kScreenRecordingAllowedRestriction = "allowScreenRecording";

/// An administrator's answer to one restriction, with the numbers that profiles use.
enum class RestrictionSetting { unspecified = 0, yes = 1, no = 2 };

class RestrictionsProfile;

/// Told that effective restrictions changed, on the profile service's queue.
class RestrictionsObserver {
  public:
    virtual ~RestrictionsObserver() = default;
    virtual void profileConnectionDidReceiveEffectiveSettingsChangedNotification(
        RestrictionsProfile& profile) = 0;
};

/// The restrictions in force on this device. Implemented by a Linux adapter without restrictions and by the
/// simulated device. Any thread.
class RestrictionsProfile {
  public:
    virtual ~RestrictionsProfile() = default;
    virtual void addObserver(std::weak_ptr<RestrictionsObserver> observer) = 0;
    virtual void removeObserver(const RestrictionsObserver* observer) = 0;
    virtual RestrictionSetting effectiveSetting(std::string_view restriction) = 0;
};

}  // namespace kelvo
