#include "platform/linux/x11/X11Screen.h"

#include "platform/linux/x11/X11ScreenCapture.h"
#include "platform/linux/x11/XConnection.h"

#include <vector>
#include <xcb/randr.h>

namespace kelvo::x11 {
namespace {

constexpr float kPortrait = 0;
constexpr float kLandscape = 90;

using Outputs = xcb_randr_get_screen_resources_current_reply_t;
using Output = xcb_randr_get_output_info_reply_t;

/// The main output when it shows something, else the first one that does.
XOwned<Output> activeOutput(XConnection& connection, const Outputs& outputs) {
    xcb_connection_t* const c = connection.raw();
    const auto primary = connection.await<xcb_randr_get_output_primary_reply_t>(
        xcb_randr_get_output_primary(c, connection.root()));
    std::vector<xcb_randr_output_t> candidates;
    if (primary && primary->output != XCB_NONE) candidates.push_back(primary->output);
    const xcb_randr_output_t* const all = xcb_randr_get_screen_resources_current_outputs(&outputs);
    candidates.insert(candidates.end(), all, all + outputs.num_outputs);
    for (const xcb_randr_output_t candidate : candidates) {
        auto output =
            connection.await<Output>(xcb_randr_get_output_info(c, candidate, outputs.config_timestamp));
        if (output && output->crtc != XCB_NONE && output->num_modes > 0) return output;
    }
    return nullptr;
}

/// The size of an output's first mode: the preferred one, as its panel is built.
std::optional<Size> nativeSize(const Outputs& outputs, const Output& output) {
    const xcb_randr_mode_t preferred = *xcb_randr_get_output_info_modes(&output);
    const xcb_randr_mode_info_t* const modes = xcb_randr_get_screen_resources_current_modes(&outputs);
    for (int i = 0; i < outputs.num_modes; ++i) {
        if (modes[i].id == preferred)
            return Size{static_cast<double>(modes[i].width), static_cast<double>(modes[i].height)};
    }
    return std::nullopt;
}

}  // namespace

std::shared_ptr<ScreenCaptureSource> X11Screen::createSource(const Size& size,
                                                             const MediaTime& minimumFrameInterval) {
    return std::make_shared<X11ScreenCapture>(display_, size, minimumFrameInterval, mirroring_);
}

std::optional<float> nativeScreenOrientation(const std::string& display) {
    const auto connection = XConnection::open(display);
    if (!connection || !connection->hasExtension(xcb_randr_id)) return std::nullopt;
    xcb_connection_t* const c = connection->raw();
    connection->await<xcb_randr_query_version_reply_t>(xcb_randr_query_version(c, 1, 5));
    const auto outputs =
        connection->await<Outputs>(xcb_randr_get_screen_resources_current(c, connection->root()));
    if (!outputs) return std::nullopt;
    const auto output = activeOutput(*connection, *outputs);
    const auto size = output ? nativeSize(*outputs, *output) : std::nullopt;
    if (!size) return std::nullopt;
    return size->width > size->height ? kLandscape : kPortrait;
}

}  // namespace kelvo::x11
