#pragma once

#include "base/Guarded.h"
#include "platform/DeviceProperties.h"
#include "platform/Preferences.h"
#include "platform/Random.h"
#include "platform/TextFolding.h"

#include <atomic>
#include <map>
#include <utility>

namespace kelvo {

/// Preferences as a test sets them. Thread-safe.
class SimulatedPreferences : public Preferences {
  public:
    void set(std::string_view key, Value value, std::string_view domain = kPreferencesDomain) {
        values_.with([&](auto& values) {
            values[{std::string(domain), std::string(key)}] = std::move(value);
        });
    }
    void remove(std::string_view key, std::string_view domain = kPreferencesDomain) {
        values_.with([&](auto& values) { values.erase({std::string(domain), std::string(key)}); });
    }

    Value value(std::string_view key, std::string_view domain) override {
        ++readCount_;
        return values_.with([&](const auto& values) {
            const auto entry = values.find({std::string(domain), std::string(key)});
            return entry == values.end() ? Value() : entry->second;
        });
    }

    /// How many reads there were, of any key.
    int readCount() const { return readCount_; }

  private:
    Guarded<std::map<std::pair<std::string, std::string>, Value>> values_;
    std::atomic<int> readCount_{0};
};

/// The device that a test wants: at first a phone of unknown chip, portrait, not an internal build.
/// Thread-safe.
class SimulatedDeviceProperties : public DeviceProperties {
  public:
    DeviceIdiom idiom() override { return idiom_; }
    bool isInternalBuild() override { return isInternalBuild_; }
    std::int64_t chipIdentifier() override { return chipIdentifier_; }
    std::optional<float> mainScreenOrientation() override { return orientation_.copy(); }
    std::optional<bool> regionalBehaviorShutterClick() override { return shutterClick_.copy(); }

    void setIdiom(DeviceIdiom idiom) { idiom_ = idiom; }
    void setInternalBuild(bool isInternal) { isInternalBuild_ = isInternal; }
    void setChipIdentifier(std::int64_t identifier) { chipIdentifier_ = identifier; }
    void setMainScreenOrientation(std::optional<float> orientation) { orientation_.set(orientation); }
    void setRegionalBehaviorShutterClick(std::optional<bool> isWanted) { shutterClick_.set(isWanted); }

  private:
    std::atomic<DeviceIdiom> idiom_{DeviceIdiom::phone};
    std::atomic<bool> isInternalBuild_{false};
    std::atomic<std::int64_t> chipIdentifier_{0};
    Guarded<std::optional<float>> orientation_{std::optional<float>(0.0F)};
    Guarded<std::optional<bool>> shutterClick_;
};

/// Bytes that look random and are the same in every run. Thread-safe.
class SimulatedRandom : public Random {
  public:
    void fill(std::span<std::byte> bytes) override;

  private:
    Guarded<std::uint64_t> state_{0x9E3779B97F4A7C15ULL};
};

/// Folds ASCII letters and the accented letters of Latin-1. Thread-safe.
class SimulatedTextFolding : public TextFolding {
  public:
    std::string folded(std::string_view text) override;
};

}  // namespace kelvo
