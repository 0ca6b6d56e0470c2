// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/window_tree_fixture.h"

#include <gtest/gtest.h>

#include <functional>
#include <memory>

namespace {

using platform::CGWindowID;
using platform::x11::WindowIds;

/// Under a window manager, which does as window managers do.
class WindowTreeUnderOpenbox : public WindowTreeFixture {
protected:
    void SetUp() override {
        if (const auto missing = MissingProgram({"Xvfb", "openbox"})) {
            GTEST_SKIP() << *missing;
            return;
        }
        WindowTreeFixture::SetUp();
        openbox = XProgram::Openbox(*server);
        // It calls itself ready before it is: what is mapped until then stays unseen.
        const xcb_window_t probe = Client().Create({0, 0, 50, 50});
        XLink link(server->Display());
        ASSERT_TRUE(ComesTrue([&] {
            xcb_map_window(Client().Get(), probe);
            Client().RoundTrip();
            return !link.Property(probe, "WM_STATE").empty();
        }));
        xcb_destroy_window(Client().Get(), probe);
        Client().RoundTrip();
        ASSERT_TRUE(Comes([&] { return IdsOfClient().empty(); }));
    }

    /// Has the condition come true as far as the tree knows.
    bool Comes(const std::function<bool()>& condition) {
        return ComesTrue([&] { return Bench().CatchUp() && condition(); });
    }

    /// The window manager has windows of its own.
    Ids IdsOfClient() {
        const std::uint32_t mask = xcb_get_setup(Client().Get())->resource_id_mask;
        const std::uint32_t base = xcb_get_setup(Client().Get())->resource_id_base;
        Ids ids;
        for (const CGWindowID id : Bench().Ids()) {
            if ((WindowIds::NameOf(id) & ~mask) == base)
                ids.push_back(id);
        }
        return ids;
    }

    std::unique_ptr<XProgram> openbox;
};

TEST_F(WindowTreeUnderOpenbox, ListsFramedWindowsByTheirClientsAndKeepsTheirIdsWhenItEnds) {
    const xcb_window_t back = Client().CreateMapped({100, 100, 200, 100});
    ASSERT_TRUE(Comes([&] { return IdsOfClient() == Ids{back}; }));
    const xcb_window_t front = Client().CreateMapped({100, 100, 200, 100});
    ASSERT_TRUE(Comes([&] { return IdsOfClient() == Ids({front, back}); }));
    EXPECT_TRUE(Comes([&] { return Bench().tree.FindById(front)->window != front; })) << "it has a frame";
    EXPECT_GT(Bench().Listed(front).frame.size.height, 100) << "the frame is seen with it";
    EXPECT_EQ(Bench().Listed(front).level, 0);
    EXPECT_EQ(Bench().Listed(front).owner, Client().Pid());
    EXPECT_EQ(ReadAnew(), Bench().Ids());

    openbox.reset();
    EXPECT_TRUE(Comes([&] {
        return IdsOfClient() == Ids({front, back}) && Bench().tree.FindById(front)->window == front;
    }));
    EXPECT_EQ(Bench().watcher.wrong, 0);
}

TEST_F(WindowTreeUnderOpenbox, ListsAMinimisedWindowAsOffScreen) {
    const xcb_window_t window = Client().CreateMapped({100, 100, 200, 100});
    ASSERT_TRUE(
        Comes([&] { return Bench().Listed(window).id == window && Bench().Listed(window).onScreen; }));
    xcb_client_message_event_t message{};
    message.response_type = XCB_CLIENT_MESSAGE;
    message.format = 32;
    message.window = window;
    message.type = Client().Atom("WM_CHANGE_STATE");
    message.data.data32[0] = 3;
    xcb_send_event(Client().Get(), 0, Client().Root(),
                   XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT | XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY,
                   reinterpret_cast<const char*>(&message));
    Client().RoundTrip();
    EXPECT_TRUE(
        Comes([&] { return Bench().Listed(window).id == window && !Bench().Listed(window).onScreen; }));
    EXPECT_EQ(ReadAnew(), Bench().Ids());
    xcb_unmap_window(Client().Get(), window);
    xcb_destroy_window(Client().Get(), window);
    Client().RoundTrip();
    EXPECT_TRUE(Comes([&] { return IdsOfClient().empty(); }));
}

} // namespace
