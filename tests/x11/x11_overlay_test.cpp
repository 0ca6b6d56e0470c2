// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/x11_fixture.h"

#include <xcb/composite.h>

#include <algorithm>
#include <cstdlib>

/// The window on which a compositor draws the whole screen.

namespace {

class X11Overlay : public X11Test {
protected:
    /// As a compositor does that is started now. 0 when the server has none.
    static platform::CGWindowID Open(const XLink& link) {
        xcb_connection_t* const connection = link.Get();
        std::free(xcb_composite_query_version_reply(connection, xcb_composite_query_version(connection, 0, 3),
                                                    nullptr));
        xcb_composite_get_overlay_window_reply_t* const reply = xcb_composite_get_overlay_window_reply(
            connection, xcb_composite_get_overlay_window(connection, link.Root()), nullptr);
        const platform::CGWindowID overlay = reply != nullptr ? reply->overlay_win : 0;
        std::free(reply);
        return overlay;
    }

    bool IsListed(platform::CGWindowID window) { return Server().GetWindows()->Find(window) != nullptr; }

    int CountLargerThan(float width) {
        const auto windows = Server().GetWindows();
        return static_cast<int>(std::count_if(
            windows->Windows().begin(), windows->Windows().end(),
            [width](const platform::WindowInfo& info) { return info.frame.size.width > width; }));
    }
};

} // namespace

TEST_F(X11Overlay, OfACompositorThatComesLaterIsNobodysWindow) {
    if (!Begin())
        return;
    Add("shown", "10 10 100 100 00ff00");
    const XLink compositor(Desk().Rig().Display());
    const platform::CGWindowID overlay = Open(compositor);
    ASSERT_NE(overlay, 0U);
    Add("after", "30 30 100 100 0000ff");
    EXPECT_FALSE(IsListed(overlay));
    EXPECT_EQ(CountLargerThan(200), 0) << "it is listed under another number";
    EXPECT_EQ(TakeOne(overlay), nullptr);
}

TEST_F(X11Overlay, OfACompositorThatWasThereBeforeIsNobodysWindow) {
    if (!Begin())
        return;
    const XLink compositor(Desk().Rig().Display());
    const platform::CGWindowID overlay = Open(compositor);
    ASSERT_NE(overlay, 0U);
    Add("shown", "10 10 100 100 00ff00"); // the first look
    EXPECT_FALSE(IsListed(overlay));
    EXPECT_EQ(CountLargerThan(200), 0) << "it is listed under another number";
    EXPECT_EQ(TakeOne(overlay), nullptr);
}
