#include "support/x11/XClient.h"

#include "platform/simulated/NumberedPicture.h"

#include <array>
#include <cstdlib>
#include <vector>
#include <xcb/randr.h>
#include <xcb/xtest.h>

namespace kelvo::test {
namespace {

template <typename Reply>
struct Owned {
    explicit Owned(Reply* reply) : content(reply) {}
    ~Owned() { std::free(content); }
    Owned(const Owned&) = delete;
    Owned& operator=(const Owned&) = delete;
    Reply* operator->() const { return content; }
    explicit operator bool() const { return content != nullptr; }
    Reply* const content;
};

constexpr std::uint8_t kAlphaDepth = 32;

xcb_visualid_t alphaVisual(const xcb_screen_t& screen) {
    for (auto depths = xcb_screen_allowed_depths_iterator(&screen); depths.rem > 0; xcb_depth_next(&depths)) {
        if (depths.data->depth == kAlphaDepth && xcb_depth_visuals_length(depths.data) > 0)
            return xcb_depth_visuals(depths.data)->visual_id;
    }
    return 0;
}

}  // namespace

XClient::XClient(const std::string& display)
    : connection_(xcb_connect(display.c_str(), nullptr)),
      screen_(xcb_setup_roots_iterator(xcb_get_setup(connection_)).data) {}

XClient::~XClient() {
    xcb_disconnect(connection_);
}

void XClient::sync() {
    std::free(xcb_get_input_focus_reply(connection_, xcb_get_input_focus(connection_), nullptr));
}

xcb_window_t XClient::createWindow(const Place& place, std::uint32_t colour, bool isManaged, bool hasAlpha) {
    const xcb_window_t window = xcb_generate_id(connection_);
    const xcb_visualid_t visual = hasAlpha ? alphaVisual(*screen_) : screen_->root_visual;
    const xcb_colormap_t colours = xcb_generate_id(connection_);
    xcb_create_colormap(connection_, XCB_COLORMAP_ALLOC_NONE, colours, screen_->root, visual);
    const std::array<std::uint32_t, 4> values{colour, 0, isManaged ? 0U : 1U, colours};
    xcb_create_window(connection_, hasAlpha ? kAlphaDepth : screen_->root_depth, window, screen_->root,
                      static_cast<std::int16_t>(place.x), static_cast<std::int16_t>(place.y),
                      static_cast<std::uint16_t>(place.width), static_cast<std::uint16_t>(place.height), 0,
                      XCB_WINDOW_CLASS_INPUT_OUTPUT, visual,
                      XCB_CW_BACK_PIXEL | XCB_CW_BORDER_PIXEL | XCB_CW_OVERRIDE_REDIRECT | XCB_CW_COLORMAP,
                      values.data());
    map(window);
    return window;
}

void XClient::place(xcb_window_t window, const Place& place) {
    const std::array<std::uint32_t, 4> values{
        static_cast<std::uint32_t>(place.x), static_cast<std::uint32_t>(place.y),
        static_cast<std::uint32_t>(place.width), static_cast<std::uint32_t>(place.height)};
    xcb_configure_window(
        connection_, window,
        XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y | XCB_CONFIG_WINDOW_WIDTH | XCB_CONFIG_WINDOW_HEIGHT,
        values.data());
    sync();
}

void XClient::raise(xcb_window_t window) {
    const std::uint32_t above = XCB_STACK_MODE_ABOVE;
    xcb_configure_window(connection_, window, XCB_CONFIG_WINDOW_STACK_MODE, &above);
    sync();
}

void XClient::map(xcb_window_t window) {
    xcb_map_window(connection_, window);
    sync();
}

void XClient::unmap(xcb_window_t window) {
    xcb_unmap_window(connection_, window);
    sync();
}

void XClient::destroy(xcb_window_t window) {
    xcb_destroy_window(connection_, window);
    sync();
}

void XClient::reparent(xcb_window_t window, xcb_window_t parent, int x, int y) {
    xcb_reparent_window(connection_, window, parent, static_cast<std::int16_t>(x),
                        static_cast<std::int16_t>(y));
    sync();
}

XClient::Extent XClient::extentOf(xcb_window_t window) {
    const Owned geometry(xcb_get_geometry_reply(connection_, xcb_get_geometry(connection_, window), nullptr));
    if (!geometry) return {1, 1, screen_->root_depth};
    return {geometry->width, geometry->height, geometry->depth};
}

/// A graphics context belongs to the depth of its drawable, so each drawing makes its own.
xcb_gcontext_t XClient::makeContext(xcb_drawable_t drawable) {
    const xcb_gcontext_t context = xcb_generate_id(connection_);
    const std::uint32_t noExposures = 0;
    xcb_create_gc(connection_, context, drawable, XCB_GC_GRAPHICS_EXPOSURES, &noExposures);
    return context;
}

void XClient::showNumber(xcb_window_t window, std::uint32_t number) {
    constexpr int kColumns = NumberedPicture::kColumns;
    constexpr int kRows = NumberedPicture::kRows;
    const Extent extent = extentOf(window);
    const auto all = NumberedPicture::blocks(number);
    std::array<std::vector<xcb_rectangle_t>, 2> rectangles;
    for (int i = 0; i < kColumns * kRows; ++i) {
        const int left = i % kColumns * extent.width / kColumns;
        const int right = (i % kColumns + 1) * extent.width / kColumns;
        const int top = i / kColumns * extent.height / kRows;
        const int bottom = (i / kColumns + 1) * extent.height / kRows;
        rectangles[all[static_cast<std::size_t>(i)] ? 1 : 0].push_back(
            {static_cast<std::int16_t>(left), static_cast<std::int16_t>(top),
             static_cast<std::uint16_t>(right - left), static_cast<std::uint16_t>(bottom - top)});
    }
    // Through a pixmap, so that nobody ever sees half a number.
    const xcb_pixmap_t picture = xcb_generate_id(connection_);
    xcb_create_pixmap(connection_, extent.depth, picture, window, extent.width, extent.height);
    const xcb_gcontext_t context = makeContext(picture);
    for (const std::size_t shade : {0U, 1U}) {
        const std::uint32_t colour = shade == 0 ? 0x000000 : 0xFFFFFF;
        xcb_change_gc(connection_, context, XCB_GC_FOREGROUND, &colour);
        xcb_poly_fill_rectangle(connection_, picture, context,
                                static_cast<std::uint32_t>(rectangles[shade].size()),
                                rectangles[shade].data());
    }
    xcb_copy_area(connection_, picture, window, context, 0, 0, 0, 0, extent.width, extent.height);
    xcb_free_gc(connection_, context);
    xcb_free_pixmap(connection_, picture);
    sync();
}

void XClient::fill(xcb_window_t window, const Place& place, std::uint32_t colour) {
    const xcb_gcontext_t context = makeContext(window);
    xcb_change_gc(connection_, context, XCB_GC_FOREGROUND, &colour);
    const xcb_rectangle_t rectangle{static_cast<std::int16_t>(place.x), static_cast<std::int16_t>(place.y),
                                    static_cast<std::uint16_t>(place.width),
                                    static_cast<std::uint16_t>(place.height)};
    xcb_poly_fill_rectangle(connection_, window, context, 1, &rectangle);
    xcb_free_gc(connection_, context);
    sync();
}

void XClient::movePointer(int x, int y) {
    xcb_test_fake_input(connection_, XCB_MOTION_NOTIFY, 0, XCB_CURRENT_TIME, screen_->root,
                        static_cast<std::int16_t>(x), static_cast<std::int16_t>(y), 0);
    sync();
}

bool XClient::resizeScreen(int width, int height) {
    using Resources = xcb_randr_get_screen_resources_reply_t;
    const Owned<Resources> resources(xcb_randr_get_screen_resources_reply(
        connection_, xcb_randr_get_screen_resources(connection_, screen_->root), nullptr));
    if (!resources || resources->num_outputs == 0 || resources->num_crtcs == 0) return false;
    const xcb_randr_output_t output = *xcb_randr_get_screen_resources_outputs(resources.content);
    const xcb_randr_crtc_t crtc = *xcb_randr_get_screen_resources_crtcs(resources.content);
    const std::string name = std::to_string(width) + "x" + std::to_string(height) + "-test";
    xcb_randr_mode_info_t mode{};
    mode.width = mode.htotal = static_cast<std::uint16_t>(width);
    mode.height = mode.vtotal = static_cast<std::uint16_t>(height);
    mode.dot_clock = static_cast<std::uint32_t>(width * height * 60);
    mode.name_len = static_cast<std::uint16_t>(name.size());
    const Owned created(xcb_randr_create_mode_reply(
        connection_,
        xcb_randr_create_mode(connection_, screen_->root, mode, static_cast<std::uint32_t>(name.size()),
                              name.c_str()),
        nullptr));
    if (!created) return false;
    xcb_randr_add_output_mode(connection_, output, created->mode);
    const auto configure = [&](xcb_randr_mode_t wanted, std::uint32_t outputs) {
        std::free(xcb_randr_set_crtc_config_reply(
            connection_,
            xcb_randr_set_crtc_config(connection_, crtc, XCB_CURRENT_TIME, resources->config_timestamp, 0, 0,
                                      wanted, XCB_RANDR_ROTATION_ROTATE_0, outputs, &output),
            nullptr));
    };
    configure(XCB_NONE, 0);
    xcb_randr_set_screen_size(connection_, screen_->root, static_cast<std::uint16_t>(width),
                              static_cast<std::uint16_t>(height), static_cast<std::uint32_t>(width / 4),
                              static_cast<std::uint32_t>(height / 4));
    configure(created->mode, 1);
    sync();
    return extentOf(screen_->root).width == width;
}

}  // namespace kelvo::test
