#include "platform/linux/x11/X11RenderServer.h"
#include "support/Eventually.h"
#include "support/x11/WindowManager.h"
#include "support/x11/XClient.h"
#include "support/x11/XvfbServer.h"

#include <cstdlib>
#include <unistd.h>

#include <gtest/gtest.h>

namespace kelvo::x11 {
namespace {

using test::eventually;

class X11RenderServerTest : public testing::Test {
  protected:
    xcb_window_t parentOf(xcb_window_t window) {
        auto* const tree =
            xcb_query_tree_reply(client_.raw(), xcb_query_tree(client_.raw(), window), nullptr);
        const xcb_window_t parent = tree != nullptr ? tree->parent : XCB_NONE;
        std::free(tree);
        return parent;
    }

    test::XvfbServer server_{200, 160, test::XvfbServer::ownDisplay()};
    test::XClient client_{server_.display()};
    X11RenderServer renderServer_{server_.display()};
};

TEST_F(X11RenderServerTest, WindowBelongsToTheProcessThatMadeIt) {
    EXPECT_EQ(renderServer_.processIdentifierOfContext(client_.createWindow({0, 0, 10, 10}, 0)), ::getpid());
}

TEST_F(X11RenderServerTest, WhatIsNoWindowBelongsToNobody) {
    const auto window = client_.createWindow({0, 0, 10, 10}, 0);
    client_.destroy(window);
    EXPECT_EQ(renderServer_.processIdentifierOfContext(window), std::nullopt);
    EXPECT_EQ(renderServer_.processIdentifierOfContext(0), std::nullopt);
    EXPECT_EQ(renderServer_.processIdentifierOfContext(0xFFFFFFFF), std::nullopt);
}

TEST_F(X11RenderServerTest, RootWindowBelongsToNoClient) {
    EXPECT_NE(renderServer_.processIdentifierOfContext(client_.root()), ::getpid());
}

TEST_F(X11RenderServerTest, WindowManagersFrameBelongsToTheWindowWithin) {
    const test::WindowManager manager(server_.display());
    ASSERT_TRUE(manager.isReady());
    const auto window = client_.createWindow({10, 10, 50, 50}, 0, true);
    ASSERT_TRUE(eventually([&] { return parentOf(window) != client_.root(); }));
    EXPECT_EQ(renderServer_.processIdentifierOfContext(window), ::getpid());
    xcb_window_t frame = parentOf(window);
    EXPECT_TRUE(eventually([&] { return renderServer_.processIdentifierOfContext(frame) == ::getpid(); }));
}

TEST_F(X11RenderServerTest, DisplayThatCannotBeReachedTellsNothing) {
    X11RenderServer nowhere(":4711");
    EXPECT_EQ(nowhere.processIdentifierOfContext(1), std::nullopt);
}

TEST_F(X11RenderServerTest, DisplayThatWasReplacedIsAskedAnew) {
    const auto before = client_.createWindow({0, 0, 10, 10}, 0);
    ASSERT_TRUE(renderServer_.processIdentifierOfContext(before));
    server_.kill();
    const test::XvfbServer successor(200, 160, server_.display());
    test::XClient client(successor.display());
    const auto after = client.createWindow({0, 0, 10, 10}, 0);
    EXPECT_TRUE(eventually([&] { return renderServer_.processIdentifierOfContext(after) == ::getpid(); }));
}

}  // namespace
}  // namespace kelvo::x11
