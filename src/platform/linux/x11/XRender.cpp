#include "platform/linux/x11/XRender.h"

#include <cmath>
#include <string_view>

namespace kelvo::x11 {
namespace {

constexpr std::uint8_t kOpaqueDepth = 24;
constexpr std::uint8_t kAlphaDepth = 32;
constexpr std::string_view kFilter = "bilinear";

xcb_render_fixed_t fixedPoint(double value) {
    return static_cast<xcb_render_fixed_t>(std::lround(value * 65536));
}

/// Colours in the low three bytes, red highest; alpha, if any, above them.
bool isBGR(const xcb_render_pictforminfo_t& format) {
    const auto& direct = format.direct;
    return format.type == XCB_RENDER_PICT_TYPE_DIRECT && direct.red_shift == 16 && direct.green_shift == 8 &&
           direct.blue_shift == 0 && direct.red_mask == 0xFF;
}

}  // namespace

bool XRender::begin(XConnection& connection) {
    connection_ = &connection;
    xcb_connection_t* const c = connection.raw();
    if (!connection.hasExtension(xcb_render_id)) return false;
    const auto versionAsked = xcb_render_query_version(c, 0, 11);
    const auto formatsAsked = xcb_render_query_pict_formats(c);
    const auto version = connection.await<xcb_render_query_version_reply_t>(versionAsked);
    const auto formats = connection.await<xcb_render_query_pict_formats_reply_t>(formatsAsked);
    if (!version || !formats) return false;
    auto each = xcb_render_query_pict_formats_formats_iterator(formats.get());
    for (; each.rem > 0; xcb_render_pictforminfo_next(&each)) {
        if (!isBGR(*each.data)) continue;
        const bool hasAlpha = each.data->direct.alpha_mask != 0;
        if (each.data->depth == kOpaqueDepth && !hasAlpha) opaque_ = each.data->id;
        if (each.data->depth == kAlphaDepth && hasAlpha) withAlpha_ = each.data->id;
    }
    return opaque_ != 0 && withAlpha_ != 0;
}

xcb_render_pictformat_t XRender::formatOfDepth(std::uint8_t depth) const {
    if (depth == kOpaqueDepth) return opaque_;
    return depth == kAlphaDepth ? withAlpha_ : 0;
}

xcb_render_picture_t XRender::makePicture(xcb_drawable_t drawable, std::uint8_t depth, double scale) {
    xcb_connection_t* const c = connection_->raw();
    const xcb_render_picture_t picture = xcb_generate_id(c);
    const std::uint32_t includeInferiors = XCB_SUBWINDOW_MODE_INCLUDE_INFERIORS;
    xcb_render_create_picture(c, picture, drawable, formatOfDepth(depth), XCB_RENDER_CP_SUBWINDOW_MODE,
                              &includeInferiors);
    if (scale == 1) return picture;
    xcb_render_transform_t shrink{};
    shrink.matrix11 = shrink.matrix22 = fixedPoint(1 / scale);
    shrink.matrix33 = fixedPoint(1);
    xcb_render_set_picture_transform(c, picture, shrink);
    xcb_render_set_picture_filter(c, picture, kFilter.size(), kFilter.data(), 0, nullptr);
    return picture;
}

XCanvas::XCanvas(XConnection& connection, XRender& render, std::uint16_t width, std::uint16_t height)
    : connection_(connection), width_(width), height_(height), pixmap_(xcb_generate_id(connection.raw())) {
    const std::uint8_t depth = connection.screen().root_depth;
    xcb_create_pixmap(connection.raw(), depth, pixmap_, connection.root(), width, height);
    picture_ = render.makePicture(pixmap_, depth, 1);
}

XCanvas::~XCanvas() {
    xcb_render_free_picture(connection_.raw(), picture_);
    xcb_free_pixmap(connection_.raw(), pixmap_);
}

void XCanvas::fillBlack() {
    const xcb_rectangle_t everything{0, 0, width_, height_};
    xcb_render_fill_rectangles(connection_.raw(), XCB_RENDER_PICT_OP_SRC, picture_, {0, 0, 0, 0xFFFF}, 1,
                               &everything);
}

void XCanvas::draw(xcb_render_picture_t picture, bool hasAlpha, double scale, const SourceArea& area, int x,
                   int y) {
    const auto scaled = [scale](int length) { return static_cast<int>(std::lround(length * scale)); };
    xcb_render_composite(connection_.raw(), hasAlpha ? XCB_RENDER_PICT_OP_OVER : XCB_RENDER_PICT_OP_SRC,
                         picture, XCB_RENDER_PICTURE_NONE, picture_,
                         static_cast<std::int16_t>(scaled(area.x)), static_cast<std::int16_t>(scaled(area.y)),
                         0, 0, static_cast<std::int16_t>(x), static_cast<std::int16_t>(y),
                         static_cast<std::uint16_t>(scaled(area.width)),
                         static_cast<std::uint16_t>(scaled(area.height)));
}

}  // namespace kelvo::x11
