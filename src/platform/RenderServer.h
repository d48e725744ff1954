#pragma once

#include <cstdint>
#include <optional>

namespace kelvo {

/// Knows whose window layers are on the screen. Implemented by the X11 adapter (a context is a window) and
/// the simulated device. Any thread.
class RenderServer {
  public:
    virtual ~RenderServer() = default;

    /// The process that draws the context; none when there is no such context or nobody can tell.
    virtual std::optional<std::int32_t> processIdentifierOfContext(std::uint32_t contextID) = 0;
};

}  // namespace kelvo
