#pragma once

#include "platform/ScreenCapture.h"
#include "platform/linux/x11/MirroringState.h"

#include <cstdint>
#include <memory>
#include <optional>
#include <set>
#include <string>

namespace kelvo::x11 {

/// The screen of one X display: its sources and its mirroring. A context identifier is a window's. The
/// display is first contacted when a source starts. Thread-safe.
class X11Screen : public ScreenCaptureService, public DisplayMirroring {
  public:
    /// `display` is an X display name such as ":0"; empty takes $DISPLAY.
    explicit X11Screen(std::string display) : display_(std::move(display)) {}

    std::shared_ptr<ScreenCaptureSource> createSource(const Size& size,
                                                      const MediaTime& minimumFrameInterval) override;

    void setMode(MirroringMode mode) override { mirroring_->setMode(mode); }
    void setCloneContexts(std::set<std::uint32_t> contextIDs) override {
        mirroring_->setContexts(std::move(contextIDs));
    }

  private:
    const std::string display_;
    const std::shared_ptr<MirroringState> mirroring_ = std::make_shared<MirroringState>();
};

/// How the screen of `display` was built to be held, as `DeviceProperties::mainScreenOrientation` tells it: 0
/// when its panel is at least as high as it is wide, 90 when it is wider, however it is turned now. None when
/// the display cannot be asked; one that stands still is asked for two seconds (`XConnection::kReplyLimit`).
std::optional<float> nativeScreenOrientation(const std::string& display);

}  // namespace kelvo::x11
