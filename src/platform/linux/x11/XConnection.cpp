#include "platform/linux/x11/XConnection.h"

#include "platform/linux/x11/XHandshake.h"

#include <array>
#include <cerrno>
#include <poll.h>
#include <xcb/xcbext.h>

namespace kelvo::x11 {
namespace {

const xcb_screen_t* screenAt(xcb_connection_t* connection, int number) {
    auto screens = xcb_setup_roots_iterator(xcb_get_setup(connection));
    for (; screens.rem > 0 && number > 0; --number)
        xcb_screen_next(&screens);
    return screens.rem > 0 ? screens.data : nullptr;
}

}  // namespace

std::unique_ptr<XConnection> XConnection::open(const std::string& display) {
    return open(display, -1, kReplyLimit);
}

std::unique_ptr<XConnection> XConnection::open(const std::string& display, int interruptFd) {
    return open(display, interruptFd, std::nullopt);
}

std::unique_ptr<XConnection> XConnection::open(const std::string& display, int interruptFd,
                                               TimeLimit replyLimit) {
    int screenNumber = 0;
    xcb_connection_t* const connection = connectTo(display, screenNumber, interruptFd, replyLimit);
    if (connection == nullptr) return nullptr;
    const xcb_screen_t* const screen = screenAt(connection, screenNumber);
    if (screen == nullptr) {
        xcb_disconnect(connection);
        return nullptr;
    }
    // The constructor is private, so that every connection is a working one.
    return std::unique_ptr<XConnection>(new XConnection(connection, screen, interruptFd, replyLimit));
}

XConnection::XConnection(xcb_connection_t* connection, const xcb_screen_t* screen, int interruptFd,
                         TimeLimit replyLimit)
    : connection_(connection), screen_(screen), interruptFd_(interruptFd), replyLimit_(replyLimit) {}

XConnection::~XConnection() {
    xcb_disconnect(connection_);
}

bool XConnection::drawsBGRx() const {
    const xcb_setup_t* const setup = xcb_get_setup(connection_);
    if (setup->image_byte_order != XCB_IMAGE_ORDER_LSB_FIRST) return false;
    if (screen_->root_depth != 24 && screen_->root_depth != 32) return false;
    for (auto formats = xcb_setup_pixmap_formats_iterator(setup); formats.rem > 0;
         xcb_format_next(&formats)) {
        if (formats.data->depth == screen_->root_depth) return formats.data->bits_per_pixel == 32;
    }
    return false;
}

bool XConnection::hasExtension(xcb_extension_t& extension) {
    // Asked ahead and awaited our way: libxcb's own wait for the answer could not be ended.
    xcb_prefetch_extension_data(connection_, &extension);
    if (!await<xcb_get_input_focus_reply_t>(xcb_get_input_focus(connection_))) return false;
    const xcb_query_extension_reply_t* const reply = xcb_get_extension_data(connection_, &extension);
    return reply != nullptr && reply->present != 0;
}

xcb_atom_t XConnection::atom(std::string_view name) {
    const auto reply = await<xcb_intern_atom_reply_t>(
        xcb_intern_atom(connection_, 0, static_cast<std::uint16_t>(name.size()), name.data()));
    return reply ? reply->atom : static_cast<xcb_atom_t>(XCB_ATOM_NONE);
}

void* XConnection::awaitReply(unsigned sequence) {
    xcb_flush(connection_);
    for (;;) {
        void* reply = nullptr;
        xcb_generic_error_t* error = nullptr;
        if (xcb_poll_for_reply(connection_, sequence, &reply, &error) != 0) {
            std::free(error);
            return reply;
        }
        if (isBroken()) return nullptr;
        if (hasGivenUp_ || !waitForInput()) {
            hasGivenUp_ = true;
            xcb_discard_reply(connection_, sequence);
            return nullptr;
        }
    }
}

bool XConnection::waitForInput() const {
    std::array<pollfd, 2> waits{
        {{xcb_get_file_descriptor(connection_), POLLIN, 0}, {interruptFd_, POLLIN, 0}}};
    const int limit = replyLimit_ ? static_cast<int>(replyLimit_->count()) : -1;
    const int ready = ::poll(waits.data(), waits.size(), limit);
    if (ready < 0) return errno == EINTR;
    return ready > 0 && waits[1].revents == 0;
}

}  // namespace kelvo::x11
