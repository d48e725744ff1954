#pragma once

#include "base/Value.h"

#include <optional>
#include <utility>

namespace kelvo {

/// The broadcast settings that a client sends when it sets up a broadcast. Caller's thread.
class KVBroadcastConfiguration : public ObjectHandle {
  public:
    /// The length of one movie clip, in seconds.
    double clipDuration() const { return clipDuration_; }
    void setClipDuration(double seconds) { clipDuration_ = seconds; }

    /// What to change about the compression of the picture; see MediaSettings.h for the keys.
    const std::optional<Dictionary>& videoCompressionProperties() const {
        return videoCompressionProperties_;
    }
    void setVideoCompressionProperties(std::optional<Dictionary> properties) {
        videoCompressionProperties_ = std::move(properties);
    }

  private:
    double clipDuration_ = 0;
    std::optional<Dictionary> videoCompressionProperties_;
};

}  // namespace kelvo
