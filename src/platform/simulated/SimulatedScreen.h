#pragma once

#include "base/Clock.h"
#include "base/Guarded.h"
#include "platform/RenderServer.h"
#include "platform/ScreenCapture.h"

#include <chrono>
#include <cstdint>
#include <map>
#include <memory>
#include <set>
#include <vector>

namespace kelvo {

class SimulatedScreenSource;

/// A screen that shows numbered pictures (see `NumberedPicture`). Whoever shows one, or lets time pass with
/// `catchUp`, plays the threads of all sources: their frames are delivered before the call returns.
/// Thread-safe.
class SimulatedScreen : public ScreenCaptureService, public DisplayMirroring {
  public:
    explicit SimulatedScreen(std::shared_ptr<Clock> clock) : clock_(std::move(clock)) {}

    std::shared_ptr<ScreenCaptureSource> createSource(const Size& size,
                                                      const MediaTime& minimumFrameInterval) override;
    void setMode(MirroringMode mode) override;
    void setCloneContexts(std::set<std::uint32_t> contextIDs) override;

    MirroringMode mode() const { return picture().mode; }
    std::set<std::uint32_t> cloneContexts() const { return contexts_.copy(); }

    /// Draws the picture of `number`, at the clock's time.
    void show(std::uint32_t number);
    /// Delivers what became due as the clock moved.
    void catchUp();

    /// From the next picture on the screen has this size (1080 by 1920 at first), and its pixels lie so.
    void resize(const Size& size);
    void setTransform(const ScreenTransform& transform);

    /// Ends every running source, or lets it report what the system did to it.
    void fail(ScreenCaptureStatus status);
    void preempt();
    void resetMediaServices();

  private:
    friend class SimulatedScreenSource;

    /// What there is to see. `change` counts the changes, of which the last was at `changedAt`.
    struct Picture {
        MirroringMode mode = MirroringMode::off;
        std::uint32_t number = 0;
        Size size{1080, 1920};
        ScreenTransform transform;
        std::uint64_t change = 1;
        std::chrono::nanoseconds changedAt{0};
    };
    using Sources = std::vector<std::weak_ptr<SimulatedScreenSource>>;

    Picture picture() const { return picture_.copy(); }
    template <typename Change>
    void changePicture(Change change);
    template <typename Action>
    void forEachSource(Action action);

    const std::shared_ptr<Clock> clock_;
    Guarded<Picture> picture_;
    Guarded<std::set<std::uint32_t>> contexts_;
    Guarded<Sources> sources_;
};

/// A render server that knows what it was told. Thread-safe.
class SimulatedRenderServer : public RenderServer {
  public:
    void setProcessOfContext(std::uint32_t contextID, std::int32_t processIdentifier) {
        processes_.with([&](auto& processes) { processes[contextID] = processIdentifier; });
    }

    std::optional<std::int32_t> processIdentifierOfContext(std::uint32_t contextID) override {
        return processes_.with([&](const auto& processes) {
            const auto entry = processes.find(contextID);
            return entry == processes.end() ? std::nullopt : std::optional(entry->second);
        });
    }

  private:
    Guarded<std::map<std::uint32_t, std::int32_t>> processes_;
};

}  // namespace kelvo
