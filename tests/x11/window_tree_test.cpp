// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_tree.h"

#include "platform/core_graphics.h"
#include "tests/x11/window_tree_fixture.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <array>
#include <cstring>
#include <set>
#include <string>
#include <vector>

namespace {

using platform::CGRect;
using platform::CGWindowID;
using platform::WindowInfo;
using platform::x11::WindowIds;
using Look = ForeignClient::Look;
using Ids = WindowTreeFixture::Ids;

class WindowTree : public WindowTreeFixture {};

/// Whether it grows by what `change` does.
template <class Change>
bool Grows(TreeBench& bench, Change change) {
    const std::uint64_t before = bench.Generation();
    change();
    return bench.Generation() > before;
}

TEST_F(WindowTree, ListsMappedWindowsFromTheFrontToTheBack) {
    const xcb_window_t back = Client().CreateMapped({10, 20, 100, 80});
    const xcb_window_t front = Client().CreateMapped({30, 40, 50, 60, 3});
    Client().Create({0, 0, 10, 10});
    EXPECT_EQ(Bench().Ids(), (Ids{front, back}));
    EXPECT_EQ(Bench().Listed(back).frame, (CGRect{{10, 20}, {100, 80}}));
    EXPECT_EQ(Bench().Listed(front).frame, (CGRect{{30, 40}, {56, 66}})) << "with its border";
    EXPECT_EQ(ReadAnew(), (Ids{front, back}));
}

TEST_F(WindowTree, FollowsRaisingLoweringAndCirculating) {
    const xcb_window_t a = Client().CreateMapped({0, 0, 100, 100});
    const xcb_window_t b = Client().CreateMapped({10, 10, 100, 100});
    const xcb_window_t c = Client().CreateMapped({20, 20, 100, 100});
    ASSERT_EQ(Bench().Ids(), (Ids{c, b, a}));
    Client().Stack(a, XCB_STACK_MODE_ABOVE);
    EXPECT_EQ(Bench().Ids(), (Ids{a, c, b}));
    Client().Stack(c, XCB_STACK_MODE_BELOW);
    EXPECT_EQ(Bench().Ids(), (Ids{a, b, c}));
    Client().Stack(c, XCB_STACK_MODE_ABOVE, b);
    EXPECT_EQ(Bench().Ids(), (Ids{a, c, b}));
    xcb_circulate_window(Client().Get(), XCB_CIRCULATE_RAISE_LOWEST, Client().Root());
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{b, a, c}));
    xcb_circulate_window(Client().Get(), XCB_CIRCULATE_LOWER_HIGHEST, Client().Root());
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{a, c, b}));
    EXPECT_EQ(ReadAnew(), (Ids{a, c, b}));
}

TEST_F(WindowTree, ListsOverrideRedirectWindowsWithTheMenusLevelAndNoInputOnlyOnes) {
    const xcb_window_t menu = Client().CreateMapped({0, 0, 50, 50, 0, true});
    Client().CreateMapped({0, 0, 50, 50, 0, true, true});
    EXPECT_EQ(Bench().Ids(), (Ids{menu}));
    EXPECT_EQ(Bench().Listed(menu).level, 101);
    xcb_unmap_window(Client().Get(), menu);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), Ids());
    xcb_map_window(Client().Get(), menu);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{menu})) << "it is still the same window";
}

TEST_F(WindowTree, TellsTheOwnerByTheServerElseByTheProperty) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    EXPECT_EQ(Bench().Listed(window).owner, Client().Pid());
    EXPECT_TRUE(Grows(Bench(), [&] { Client().Words(window, "_NET_WM_PID", "CARDINAL", {4321}); }));
    EXPECT_EQ(Bench().Listed(window).owner, 4321);
    Client().Text(window, "WM_CLIENT_MACHINE", "STRING", "some.other.machine");
    EXPECT_EQ(Bench().Listed(window).owner, Client().Pid()) << "a pid of another machine is nobody's here";
    Client().Words(window, "_NET_WM_PID", "CARDINAL", {static_cast<std::uint32_t>(getpid())});
    EXPECT_EQ(Bench().Listed(window).owner, Client().Pid());
    xcb_delete_property(Client().Get(), window, XCB_ATOM_WM_CLIENT_MACHINE);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Listed(window).owner, getpid());
}

TEST_F(WindowTree, FollowsTitlesWithoutAChangeOfTheStack) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    EXPECT_EQ(Bench().Listed(window).title, "");
    EXPECT_FALSE(Grows(Bench(), [&] { Client().Text(window, "WM_NAME", "STRING", "caf\xE9"); }));
    EXPECT_EQ(Bench().Listed(window).title, "caf\xC3\xA9");
    Client().Text(window, "_NET_WM_NAME", "UTF8_STRING", "one\ntwo \xFF");
    EXPECT_EQ(Bench().Listed(window).title, "one two \xEF\xBF\xBD");
    EXPECT_FALSE(
        Grows(Bench(), [&] { Client().Text(window, "WM_CLASS", "STRING", std::string("a\0B\0", 4)); }));
    EXPECT_EQ(Bench().tree.FindByWindow(window)->windowClass, "B");
}

TEST_F(WindowTree, GrowsItsGenerationWithWhatIsSeenAndNotWithoutIt) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    EXPECT_TRUE(Grows(Bench(), [&] { Client().Place(window, 5, 5, 50, 50); }));
    EXPECT_TRUE(Grows(Bench(), [&] { Client().Place(window, 5, 5, 60, 50); }));
    EXPECT_TRUE(Grows(Bench(), [&] { Client().Words(window, "_NET_WM_WINDOW_OPACITY", "CARDINAL", {0}); }));
    EXPECT_TRUE(Grows(Bench(), [&] {
        Client().Words(window, "_NET_WM_STATE", "ATOM", {Client().Atom("_NET_WM_STATE_ABOVE")});
    }));
    EXPECT_EQ(Bench().Listed(window).level, 3);
    EXPECT_TRUE(Grows(Bench(), [&] {
        xcb_unmap_window(Client().Get(), window);
        Client().RoundTrip();
    }));
    EXPECT_FALSE(Grows(Bench(), [&] { Client().Place(window, 7, 7, 60, 50); })) << "nobody sees it";
    EXPECT_FALSE(Grows(Bench(), [&] { Client().Create({0, 0, 5, 5}); }));
    EXPECT_FALSE(Grows(Bench(), [&] { Client().Words(window, "_SOMETHING", "CARDINAL", {1}); }));
    EXPECT_FALSE(Grows(Bench(), [] {}));
}

TEST_F(WindowTree, GrowsItsGenerationAtTheEventAndWithholdsTheListUntilItIsTrue) {
    const auto empty = Bench().Windows();
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    Bench().connection.RoundTrip();
    while (const platform::x11::Event event = Bench().connection.NextEvent())
        Bench().tree.OnEvent(*event);
    EXPECT_GT(Bench().tree.Generation(), empty->Generation());
    EXPECT_FALSE(Bench().tree.IsSettled());
    EXPECT_EQ(Bench().tree.Snapshot(), empty);
    Bench().tree.Settle();
    EXPECT_TRUE(Bench().tree.IsSettled());
    EXPECT_NE(Bench().tree.Snapshot()->Find(window), nullptr);
    EXPECT_EQ(Bench().tree.Snapshot()->Generation(), Bench().tree.Generation());
    EXPECT_EQ(Bench().tree.Snapshot(), Bench().tree.Snapshot());
}

TEST_F(WindowTree, BelievesOpacityOnlyWhileSomebodyComposites) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    Client().Words(window, "_NET_WM_WINDOW_OPACITY", "CARDINAL", {0x80000000});
    EXPECT_EQ(Bench().Listed(window).alpha, 1.0F);
    EXPECT_TRUE(Grows(Bench(), [&] { Bench().tree.SetComposited(true); }));
    EXPECT_NEAR(Bench().Listed(window).alpha, 0.5F, 0.001F);
}

TEST_F(WindowTree, CutsFramesByShadowAndShape) {
    const xcb_window_t window = Client().CreateMapped({100, 50, 200, 100});
    Client().Words(window, "_GTK_FRAME_EXTENTS", "CARDINAL", {10, 20, 5, 15});
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{110, 55}, {170, 80}}));
    EXPECT_TRUE(Grows(Bench(), [&] {
        const xcb_rectangle_t rects[] = {{20, 20, 30, 30}, {100, 40, 50, 50}};
        xcb_shape_rectangles(Client().Get(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING,
                             XCB_CLIP_ORDERING_UNSORTED, window, 0, 0, 2, rects);
        Client().RoundTrip();
    }));
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{120, 70}, {130, 65}}));
    EXPECT_EQ(Bench().tree.FindByWindow(window)->shape.size(), 4U) << "bands of a region";
    const std::uint32_t border = 4;
    xcb_configure_window(Client().Get(), window, XCB_CONFIG_WINDOW_BORDER_WIDTH, &border);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{124, 74}, {130, 69}}))
        << "the window stays, its inside moves";
    Client().Words(window, "_GTK_FRAME_EXTENTS", "CARDINAL", {0xFFFFFFFF, 20, 5, 15});
    xcb_shape_mask(Client().Get(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, window, 0, 0, XCB_NONE);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{100, 50}, {208, 108}}));
}

TEST_F(WindowTree, GivesAWindowOfAUsedNameAnotherId) {
    const xcb_window_t name = Client().CreateMapped({0, 0, 50, 50});
    Ids ids = Bench().Ids();
    ASSERT_EQ(ids, (Ids{name}));
    for (unsigned use = 1; use <= WindowIds::LAST_INCARNATION; ++use) {
        xcb_destroy_window(Client().Get(), name);
        Client().CreateMapped({0, 0, 50, 50}, name);
        const Ids now = Bench().Ids();
        ASSERT_EQ(now, (Ids{name | (use << WindowIds::NAME_BITS)}));
    }
}

/// What is started for the ninth time has the names that it had before, and was in no list and in no picture.
TEST_F(WindowTree, ListsAWindowHoweverOftenItsNameWasUsed) {
    const xcb_window_t name = Client().CreateMapped({0, 0, 50, 50});
    std::set<platform::CGWindowID> given;
    for (int use = 0; use < 50; ++use) {
        const Ids ids = Bench().Ids();
        ASSERT_EQ(ids.size(), 1U) << "use " << use;
        EXPECT_TRUE(given.insert(ids.front()).second) << "use " << use;
        EXPECT_FALSE(Bench().tree.ShowsUnlisted());
        xcb_destroy_window(Client().Get(), name);
        Client().CreateMapped({0, 0, 50, 50}, name);
    }
}

TEST_F(WindowTree, KeepsThePlainNamesOfOurOwnWindows) {
    XLink link(server->Display());
    const xcb_window_t window = xcb_generate_id(link.Get());
    for (int use = 0; use < 10; ++use) {
        xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, window, link.Root(), 0, 0, 50, 50, 0,
                          XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, 0, nullptr);
        xcb_map_window(link.Get(), window);
        link.RoundTrip();
        ASSERT_EQ(Bench().Ids(), (Ids{window}));
        EXPECT_EQ(Bench().Listed(window).owner, getpid());
        xcb_destroy_window(link.Get(), window);
        link.RoundTrip();
    }
}

TEST_F(WindowTree, ListsAClientUnderItsOwnIdInsideItsFrameAndAfterIt) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    const xcb_window_t frame = Client().Create({200, 100, 60, 80});
    const xcb_window_t inner = Client().Create({0, 0, 50, 50}, 0, frame);
    xcb_reparent_window(Client().Get(), window, inner, 0, 0);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    xcb_map_window(Client().Get(), inner);
    xcb_map_window(Client().Get(), frame);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{200, 100}, {60, 80}}));
    EXPECT_EQ(ReadAnew(), (Ids{window}));
    Client().Text(window, "WM_NAME", "STRING", "inside");
    EXPECT_EQ(Bench().Listed(window).title, "inside");

    xcb_unmap_window(Client().Get(), frame);
    Client().RoundTrip();
    ASSERT_EQ(Bench().Ids(), (Ids{window})) << "minimised windows are listed";
    EXPECT_FALSE(Bench().Listed(window).onScreen);
    EXPECT_TRUE(Grows(Bench(), [&] { Client().Words(window, "WM_STATE", "WM_STATE", {0, 0}); }));
    EXPECT_EQ(Bench().Ids(), Ids()) << "withdrawn ones are not";

    xcb_reparent_window(Client().Get(), window, Client().Root(), 7, 8);
    xcb_destroy_window(Client().Get(), frame);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{window})) << "the server maps it again";
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{7, 8}, {50, 50}}));
    xcb_destroy_window(Client().Get(), window);
    Client().CreateMapped({0, 0, 50, 50}, window);
    EXPECT_EQ(Bench().Ids(), (Ids{window | (1U << WindowIds::NAME_BITS)}));
    EXPECT_EQ(Bench().watcher.wrong, 0);
}

TEST_F(WindowTree, KnowsAClientNoMoreBesideItsFrameWhenItIsFoundThereAheadOfTheEvent) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
    Client().RoundTrip();
    Bench().connection.RoundTrip();
    while (const platform::x11::Event event = Bench().connection.NextEvent())
        Bench().tree.OnEvent(*event);
    xcb_reparent_window(Client().Get(), window, frame, 0, 0);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    Client().RoundTrip();
    Bench().tree.Settle();
    ASSERT_EQ(Bench().tree.FindByWindow(frame)->client, window);

    EXPECT_EQ(Bench().Ids(), (Ids{window}));
    EXPECT_EQ(Bench().tree.FindByWindow(window), nullptr);
    EXPECT_EQ(Bench().watcher.seen.count(window), 0U);
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{200, 100}, {60, 80}}));
    EXPECT_TRUE(Bench().Listed(window).onScreen);
    ASSERT_NE(Bench().tree.FindById(window), nullptr);
    EXPECT_EQ(Bench().tree.FindById(window)->window, frame);
}

TEST_F(WindowTree, HearsOfTheEndOfAClientInsideItsFrame) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
    xcb_reparent_window(Client().Get(), window, frame, 0, 0);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    xcb_destroy_window(Client().Get(), window);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), Ids{}) << "what is to be seen in the frame is what the client painted";
    Client().Create({0, 0, 50, 50}, window, frame);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    xcb_reparent_window(Client().Get(), window, Client().Root(), 0, 0);
    xcb_map_window(Client().Get(), window);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{window | (1U << WindowIds::NAME_BITS)}));
}

TEST_F(WindowTree, ListsAFrameThatLostItsClientOnlyWithAnotherClient) {
    const auto ids = [this] {
        Client().RoundTrip();
        return Bench().Ids();
    };
    const auto frameOfALostClient = [&] {
        const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
        const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
        xcb_reparent_window(Client().Get(), window, frame, 0, 0);
        Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
        EXPECT_EQ(ids(), (Ids{window}));
        xcb_destroy_window(Client().Get(), window);
        EXPECT_EQ(ids(), Ids{});
        return frame;
    };
    const xcb_window_t frame = frameOfALostClient();
    const std::uint32_t width = 70;
    xcb_configure_window(Client().Get(), frame, XCB_CONFIG_WINDOW_WIDTH, &width);
    EXPECT_EQ(ids(), Ids{}) << "what was painted is moved over";
    xcb_unmap_window(Client().Get(), frame);
    xcb_map_window(Client().Get(), frame);
    EXPECT_EQ(ids(), Ids{});
    const xcb_window_t next = Client().CreateMapped({0, 0, 50, 50});
    xcb_reparent_window(Client().Get(), next, frame, 0, 0);
    Client().Words(next, "WM_STATE", "WM_STATE", {1, 0});
    EXPECT_EQ(ids(), (Ids{next}));
}

TEST_F(WindowTree, DoesNotListAFrameWhoseClientWentOnItsWayIn) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
    ASSERT_EQ(Bench().Ids(), (Ids{frame, window}));
    xcb_reparent_window(Client().Get(), window, frame, 0, 0);
    xcb_destroy_window(Client().Get(), window); // before anybody listened to it there
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), Ids{});
    const xcb_window_t next = Client().CreateMapped({0, 0, 50, 50});
    xcb_reparent_window(Client().Get(), next, frame, 0, 0);
    Client().RoundTrip();
    ASSERT_EQ(Bench().Ids(), (Ids{next}));
    xcb_destroy_window(Client().Get(), next);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), Ids{});
}

TEST_F(WindowTree, KnowsWhenSomethingMayBeSeenThatItDoesNotList) {
    const auto showsUnlisted = [this] {
        Client().RoundTrip();
        EXPECT_TRUE(Bench().CatchUp());
        return Bench().tree.ShowsUnlisted();
    };
    EXPECT_FALSE(showsUnlisted());
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    EXPECT_FALSE(showsUnlisted());
    const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
    Client().CreateMapped({.inputOnly = true});
    Client().Create({0, 0, 50, 50});
    xcb_reparent_window(Client().Get(), window, frame, 0, 0);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    EXPECT_FALSE(showsUnlisted());
    xcb_destroy_window(Client().Get(), window);
    EXPECT_TRUE(showsUnlisted()) << "what its client has painted is still there";
    xcb_unmap_window(Client().Get(), frame);
    EXPECT_FALSE(showsUnlisted());
    xcb_map_window(Client().Get(), frame);
    EXPECT_TRUE(showsUnlisted());
    const xcb_window_t next = Client().CreateMapped({0, 0, 50, 50});
    xcb_reparent_window(Client().Get(), next, frame, 0, 0);
    Client().Words(next, "WM_STATE", "WM_STATE", {1, 0});
    EXPECT_FALSE(showsUnlisted());
}

TEST_F(WindowTree, FollowsAClientWhoseFrameGoesIntoAnotherWindow) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    const xcb_window_t frame = Client().CreateMapped({200, 100, 60, 80});
    xcb_reparent_window(Client().Get(), window, frame, 0, 0);
    Client().Words(window, "WM_STATE", "WM_STATE", {1, 0});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    const xcb_window_t outer = Client().CreateMapped({10, 10, 300, 300});
    xcb_reparent_window(Client().Get(), frame, outer, 5, 5);
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{10, 10}, {300, 300}}));
    Client().Text(window, "WM_NAME", "STRING", "still heard");
    EXPECT_EQ(Bench().Listed(window).title, "still heard");
    xcb_destroy_window(Client().Get(), outer);
    Client().CreateMapped({0, 0, 50, 50}, window);
    EXPECT_EQ(Bench().Ids(), (Ids{window | (1U << WindowIds::NAME_BITS)}));
}

TEST_F(WindowTree, TellsAWindowOnAnotherDesktopFromOneOnThisOne) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    Client().Words(window, "_NET_WM_DESKTOP", "CARDINAL", {2});
    EXPECT_TRUE(Bench().Listed(window).onScreen) << "there are no desktops";
    Client().Words(Client().Root(), "_NET_CURRENT_DESKTOP", "CARDINAL", {1});
    EXPECT_FALSE(Bench().Listed(window).onScreen);
    EXPECT_TRUE(
        Grows(Bench(), [&] { Client().Words(Client().Root(), "_NET_CURRENT_DESKTOP", "CARDINAL", {2}); }));
    EXPECT_TRUE(Bench().Listed(window).onScreen);
    Client().Words(window, "_NET_WM_DESKTOP", "CARDINAL", {0xFFFFFFFF});
    Client().Words(Client().Root(), "_NET_CURRENT_DESKTOP", "CARDINAL", {0});
    EXPECT_TRUE(Bench().Listed(window).onScreen);
    Client().Words(window, "_NET_WM_STATE", "ATOM", {Client().Atom("_NET_WM_STATE_HIDDEN")});
    EXPECT_FALSE(Bench().Listed(window).onScreen);
}

TEST_F(WindowTree, ListsTheRootAsTheRearmostWindowWhileItHasAPictureThatFits) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    const auto pixmapOf = [&](std::uint16_t width, std::uint16_t height) {
        const xcb_pixmap_t pixmap = xcb_generate_id(Client().Get());
        xcb_create_pixmap(Client().Get(), Client().Screen().root_depth, pixmap, Client().Root(), width,
                          height);
        return pixmap;
    };
    const xcb_pixmap_t small = pixmapOf(10, 10);
    const xcb_pixmap_t large = pixmapOf(1280, 720);
    Client().Words(Client().Root(), "_XROOTPMAP_ID", "PIXMAP", {small});
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
    EXPECT_TRUE(
        Grows(Bench(), [&] { Client().Words(Client().Root(), "ESETROOT_PMAP_ID", "PIXMAP", {large}); }));
    EXPECT_EQ(Bench().Ids(), (Ids{window, Client().Root()}));
    const WindowInfo root = Bench().Listed(Client().Root());
    EXPECT_EQ(root.frame, (CGRect{{0, 0}, {1280, 720}}));
    EXPECT_EQ(root.level, platform::CGWindowLevelForKey(platform::kCGDesktopWindowLevelKey));
    EXPECT_EQ(root.owner, 0);
    EXPECT_EQ(Bench().tree.Wallpaper(), large);
    Client().Words(Client().Root(), "ESETROOT_PMAP_ID", "CARDINAL", {large});
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
}

TEST_F(WindowTree, CountsFromTheMainDisplaysCorner) {
    const xcb_window_t window = Client().CreateMapped({100, 50, 50, 50});
    EXPECT_TRUE(Grows(Bench(), [&] { Bench().tree.SetDisplays({}, {30, 40}); }));
    EXPECT_EQ(Bench().Listed(window).frame, (CGRect{{70, 10}, {50, 50}}));
    EXPECT_FALSE(Grows(Bench(), [&] { Bench().tree.SetDisplays({}, {30, 40}); }));
}

TEST_F(WindowTree, IgnoresEventsThatClientsSend) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    xcb_destroy_notify_event_t lie{};
    lie.response_type = XCB_DESTROY_NOTIFY;
    lie.event = Client().Root();
    lie.window = window;
    std::array<char, 32> bytes{};
    std::memcpy(bytes.data(), &lie, sizeof lie);
    xcb_send_event(Client().Get(), 0, Client().Root(), XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY, bytes.data());
    Client().RoundTrip();
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
}

TEST_F(WindowTree, GivesTheSameIdsAfterReconnectingAndOthersToWhatCameMeanwhile) {
    const xcb_window_t kept = Client().CreateMapped({0, 0, 50, 50});
    const xcb_window_t replaced = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids(), (Ids{replaced, kept}));
    const xcb_window_t gone = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids().front(), gone);
    platform::x11::Memory memory = std::move(bench->memory);
    bench.reset();
    xcb_destroy_window(Client().Get(), gone);
    Client().Words(replaced, "_NET_WM_PID", "CARDINAL", {4321}); // as that of another process would
    bench.emplace(server->Display(), memory);
    bench->Begin();
    Client().CreateMapped({0, 0, 50, 50}, gone);
    EXPECT_EQ(Bench().Ids(),
              (Ids{gone | (1U << WindowIds::NAME_BITS), replaced | (1U << WindowIds::NAME_BITS), kept}));
    EXPECT_GT(Bench().Generation(), memory.generation);
}

TEST_F(WindowTree, BelievesNoIdOfAnotherServer) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    ASSERT_EQ(Bench().Ids(), (Ids{window}));
    const platform::x11::Memory memory = bench->memory;
    bench.reset();
    XServer other;
    ForeignClient again(other);
    again.CreateMapped({0, 0, 50, 50}, window);
    TreeBench anew(other.Display(), memory);
    anew.Begin();
    EXPECT_EQ(anew.Ids(), (Ids{window | (1U << WindowIds::NAME_BITS)}));
}

TEST_F(WindowTree, WithstandsPropertiesOfEverySort) {
    const xcb_window_t window = Client().CreateMapped({0, 0, 50, 50});
    const std::string huge(60000, '\xFE');
    for (const char* const property :
         {"WM_STATE", "_NET_WM_NAME", "WM_NAME", "_NET_WM_PID", "WM_CLIENT_MACHINE", "_NET_WM_STATE",
          "_NET_WM_DESKTOP", "_NET_WM_WINDOW_TYPE", "_NET_WM_WINDOW_OPACITY", "_NET_WM_STRUT",
          "_NET_WM_STRUT_PARTIAL", "_GTK_FRAME_EXTENTS", "WM_CLASS"}) {
        for (const char* const type : {"CARDINAL", "ATOM", "STRING", "UTF8_STRING", "WINDOW"}) {
            Client().Text(window, property, type, huge);
            ASSERT_TRUE(Bench().CatchUp());
            Client().Words(window, property, type, std::vector<std::uint32_t>(3000, 0xFFFFFFFF));
            ASSERT_TRUE(Bench().CatchUp());
            Client().Words(window, property, type, {});
            ASSERT_TRUE(Bench().CatchUp());
        }
    }
    const WindowInfo info = Bench().Listed(window);
    EXPECT_EQ(info.frame, (CGRect{{0, 0}, {50, 50}}));
    EXPECT_LE(info.title.size(), 3U * 4 * platform::x11::LONGEST_TEXT);
    for (int round = 0; round < 2000; ++round)
        Client().Create({0, 0, 5, 5, 0, round % 2 == 0}, round < 1000 ? 0U : window + 1000U);
    ASSERT_TRUE(Bench().CatchUp());
    EXPECT_EQ(Bench().Ids(), (Ids{window}));
}

} // namespace
