// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_failure.h"
#include "platform/x11/x11_session.h"
#include "tests/support/threads.h"
#include "tests/x11/component_bench.h"
#include "tests/x11/x11_fixture.h"

#include <gtest/gtest.h>
#include <xcb/xtest.h>

#include <array>
#include <chrono>
#include <functional>
#include <optional>
#include <string>
#include <thread>
#include <utility>

/// Pictures for which the server is asked nothing, since it has nothing to tell.
namespace platform::x11 {
namespace {

using namespace std::chrono_literals;

class SilentListener : public SessionListener {
public:
    void OnDisplays(std::shared_ptr<const DisplayList>) override {}
    void OnWindows(std::shared_ptr<const WindowSnapshot> windows) override { seen = std::move(windows); }
    void OnApplications(std::shared_ptr<const ApplicationList>) override {}
    void OnCursor(std::shared_ptr<const CursorImage> image) override { cursor = std::move(image); }
    void OnStreamPicture(std::uint64_t) override {}

    std::shared_ptr<const WindowSnapshot> seen;
    std::shared_ptr<const CursorImage> cursor;
};

/// A session on a server with one green window; the test is its thread.
class QuietSession : public ComponentBench {
public:
    static constexpr std::uint32_t GREEN = 0x00FF00;
    static constexpr std::uint32_t BLUE = 0x0000FF;

    QuietSession()
        : ComponentBench(SmallServer(XServerOptions::Kind::Xvfb)),
          window(AddWindow({10, 20, 60, 40}, GREEN)) {
        session.emplace(connection, memory, applications, listener);
        connection.SetDeadline(CmSteadyNow() + PATIENCE);
        session->Begin();
    }

    xcb_window_t AddWindow(const xcb_rectangle_t& place, std::uint32_t rgb) {
        const xcb_window_t made = xcb_generate_id(link.Get());
        xcb_create_window(link.Get(), XCB_COPY_FROM_PARENT, made, link.Root(), place.x, place.y, place.width,
                          place.height, 0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT,
                          XCB_CW_BACK_PIXEL, &rgb);
        xcb_map_window(link.Get(), made);
        link.RoundTrip();
        return made;
    }

    void MoveMouse(int x, int y) {
        xcb_test_fake_input(link.Get(), XCB_MOTION_NOTIFY, 0, XCB_CURRENT_TIME, link.Root(),
                            static_cast<std::int16_t>(x), static_cast<std::int16_t>(y), 0);
        link.RoundTrip();
    }

    std::shared_ptr<const WindowPicture> TakeAll() {
        WindowPictureRequest request;
        request.rect = {{0, 0}, {4000, 4000}};
        for (const WindowInfo& each : listener.seen->Windows())
            request.windows.push_back(each.id);
        return Take(std::move(request));
    }
    std::shared_ptr<const WindowPicture> TakeOne(CGWindowID id) {
        WindowPictureRequest request;
        request.rect = {{0, 0}, {4000, 4000}};
        request.windows = {id};
        return Take(std::move(request));
    }

    /// How many requests `work` has made.
    unsigned RequestsOf(const std::function<void()>& work) {
        const unsigned before = xcb_no_operation(connection.Get()).sequence;
        work();
        return xcb_no_operation(connection.Get()).sequence - before - 1;
    }

    /// Takes pictures until one was made without a question; false if there never is one.
    bool BecomesQuiet() {
        return ComesTrue([this] { return RequestsOf([this] { TakeAll(); }) == 0; });
    }

    /// Of the layer of the window, in its middle; nothing without one.
    std::optional<std::uint32_t> ColourOf(const WindowPicture& picture, xcb_window_t id) const {
        for (const PictureLayer& layer : picture.layers) {
            if (layer.window == id)
                return ArgbAt(*layer.picture, layer.picture->width / 2, layer.picture->height / 2) &
                       0xFFFFFFU;
        }
        return std::nullopt;
    }

    /// A new window shows what lay behind it until it has painted.
    bool IsShownOncePainted(xcb_window_t id, std::uint32_t rgb) {
        return ComesTrue([this, id, rgb] {
            Fill(id, rgb, {0, 0, 1000, 1000});
            link.RoundTrip();
            return ColourOf(*TakeAll(), id) == rgb;
        });
    }

    ApplicationWatch applications;
    SilentListener listener;
    const xcb_window_t window;
    std::optional<X11Session> session;

private:
    std::shared_ptr<const WindowPicture> Take(WindowPictureRequest request) {
        connection.SetDeadline(CmSteadyNow() + PATIENCE);
        request.deadline = CmSteadyNow() + PATIENCE;
        const WindowPictureResult result = session->TakeWindowPicture(request);
        connection.Flush();
        EXPECT_EQ(result.outcome, PictureOutcome::Ok);
        return result.picture != nullptr ? result.picture : std::make_shared<const WindowPicture>();
    }
};

class X11Quiet : public testing::Test {
protected:
    void SetUp() override {
        if (const auto missing = MissingProgram(XServer::ProgramsOf(XServerOptions::Kind::Xvfb)))
            GTEST_SKIP() << *missing;
        bench.emplace();
        ASSERT_TRUE(bench->BecomesQuiet());
    }

    std::optional<QuietSession> bench;
};

TEST_F(X11Quiet, AsksNothingWithinTheLimitAndThenOnce) {
    int asked = 0;
    int quiet = 0;
    for (int i = 0; i < 1000 || quiet < 100; ++i) {
        const unsigned requests = bench->RequestsOf([&] {
            const auto picture = bench->TakeAll();
            EXPECT_EQ(bench->ColourOf(*picture, bench->window), bench->GREEN);
            EXPECT_EQ(picture->generation, bench->listener.seen->Generation());
        });
        (requests > 0 ? asked : quiet) += 1;
        EXPECT_LE(requests, 2U) << "no more than the pointer and what it takes to watch it";
    }
    EXPECT_LT(asked, quiet / 2);
    std::this_thread::sleep_for(X11Session::QUIET_LIMIT);
    EXPECT_GT(bench->RequestsOf([&] { bench->TakeAll(); }), 0U) << "a server that stands still isn't found";
}

TEST_F(X11Quiet, GivesTheSamePictureAsLongAsNothingChanges) {
    const auto first = bench->TakeAll();
    const auto second = bench->TakeAll();
    ASSERT_EQ(first->layers.size(), second->layers.size());
    for (std::size_t i = 0; i < first->layers.size(); ++i) {
        EXPECT_EQ(first->layers[i].window, second->layers[i].window);
        EXPECT_EQ(first->layers[i].picture, second->layers[i].picture);
    }
    EXPECT_EQ(first->pointer, second->pointer);
}

TEST_F(X11Quiet, ShowsWhatIsPaintedInTheVeryNextPicture) {
    for (int i = 0; i < 20; ++i) {
        const std::uint32_t rgb = i % 2 == 0 ? QuietSession::BLUE : QuietSession::GREEN;
        ASSERT_TRUE(bench->BecomesQuiet());
        bench->Fill(bench->window, rgb, {0, 0, 60, 40});
        bench->link.RoundTrip();
        EXPECT_EQ(bench->ColourOf(*bench->TakeAll(), bench->window), rgb) << i;
    }
}

TEST_F(X11Quiet, ShowsWindowsThatMoveOrComeOrGoInTheVeryNextPicture) {
    const std::array<std::uint32_t, 2> place{33, 44};
    xcb_configure_window(bench->link.Get(), bench->window, XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y,
                         place.data());
    bench->link.RoundTrip();
    EXPECT_EQ(bench->TakeOne(bench->window)->layers.at(0).frame.origin, (CGPoint{33, 44}));

    ASSERT_TRUE(bench->BecomesQuiet());
    const xcb_window_t above = bench->AddWindow({0, 0, 50, 50}, QuietSession::BLUE);
    bench->TakeAll();
    EXPECT_NE(bench->listener.seen->Find(above), nullptr);
    ASSERT_TRUE(bench->IsShownOncePainted(above, QuietSession::BLUE));

    ASSERT_TRUE(bench->BecomesQuiet());
    const std::uint32_t below = XCB_STACK_MODE_BELOW;
    xcb_configure_window(bench->link.Get(), above, XCB_CONFIG_WINDOW_STACK_MODE, &below);
    bench->link.RoundTrip();
    EXPECT_EQ(bench->TakeAll()->layers.back().window, bench->window);

    ASSERT_TRUE(bench->BecomesQuiet());
    xcb_unmap_window(bench->link.Get(), above);
    bench->link.RoundTrip();
    EXPECT_FALSE(bench->ColourOf(*bench->TakeAll(), above));

    // Only a compositor makes windows translucent.
    xcb_set_selection_owner(bench->link.Get(), bench->window, bench->link.Atom("_NET_WM_CM_S0"),
                            XCB_CURRENT_TIME);
    bench->link.RoundTrip();
    ASSERT_TRUE(bench->BecomesQuiet());
    const std::uint32_t half = 0x7FFFFFFF;
    const xcb_atom_t opacity = bench->link.Atom("_NET_WM_WINDOW_OPACITY");
    xcb_change_property(bench->link.Get(), XCB_PROP_MODE_REPLACE, bench->window, opacity, XCB_ATOM_CARDINAL,
                        32, 1, &half);
    bench->link.RoundTrip();
    EXPECT_NEAR(bench->TakeOne(bench->window)->layers.at(0).alpha, 0.5F, 0.01F);
}

TEST_F(X11Quiet, TellsAnotherCursorWithTheVeryNextPicture) {
    const auto before = bench->listener.cursor;
    const xcb_font_t font = xcb_generate_id(bench->link.Get());
    xcb_open_font(bench->link.Get(), font, 6, "cursor");
    const xcb_cursor_t cursor = xcb_generate_id(bench->link.Get());
    xcb_create_glyph_cursor(bench->link.Get(), cursor, font, font, 60, 61, 0, 0, 0, 0xFFFF, 0x8080, 0);
    xcb_change_window_attributes(bench->link.Get(), bench->link.Root(), XCB_CW_CURSOR, &cursor);
    bench->link.RoundTrip();
    bench->TakeAll();
    EXPECT_NE(bench->listener.cursor, before);
}

TEST_F(X11Quiet, KeepsWindowsApartForAskersInTurn) {
    const xcb_window_t other = bench->AddWindow({100, 100, 50, 50}, QuietSession::BLUE);
    ASSERT_TRUE(bench->IsShownOncePainted(other, QuietSession::BLUE));
    for (int i = 0; i < 20; ++i) {
        const auto first = bench->TakeOne(bench->window);
        const auto second = bench->TakeOne(other);
        ASSERT_EQ(first->layers.size(), 1U);
        ASSERT_EQ(second->layers.size(), 1U);
        EXPECT_EQ(bench->ColourOf(*first, bench->window), QuietSession::GREEN);
        EXPECT_EQ(bench->ColourOf(*second, other), QuietSession::BLUE);
    }
}

TEST_F(X11Quiet, HearsOfAMouseThatMovesOnceAPicture) {
    for (int i = 1; i < 20; ++i) {
        ASSERT_TRUE(bench->BecomesQuiet());
        const CGPoint place{static_cast<float>(5 * i), static_cast<float>(3 * i)};
        bench->MoveMouse(5 * i, 3 * i);
        EXPECT_EQ(bench->TakeAll()->pointer, place) << i;
    }
    ASSERT_TRUE(bench->BecomesQuiet());
    bench->MoveMouse(1, 1);
    bench->session->CatchUp(EventsFrom::Socket);
    bench->connection.RoundTrip(); // from now on it isn't listened to
    bench->session->CatchUp(EventsFrom::Socket);
    const std::uint64_t before = bench->session->EventsSoFar();
    for (int i = 0; i < 100; ++i)
        bench->MoveMouse(i, i);
    bench->connection.RoundTrip();
    bench->session->CatchUp(EventsFrom::Socket);
    EXPECT_EQ(bench->session->EventsSoFar(), before);
    EXPECT_EQ(bench->TakeAll()->pointer, (CGPoint{99, 99}));
}

TEST_F(X11Quiet, FindsAPointerThatAClientHasWarpedWithinTheLimit) {
    ASSERT_TRUE(bench->BecomesQuiet());
    const auto begin = CmSteadyNow();
    bench->MovePointer(77, 66);
    while (bench->TakeAll()->pointer != CGPoint{77, 66})
        ASSERT_LT(CmSteadyNow(), begin + PATIENCE);
    const auto found = CmSteadyNow();
    // The machine may be busy; how long it may take is judged by what would have been asked anyway.
    EXPECT_LT(found - begin, X11Session::QUIET_LIMIT + 1s);
}

TEST_F(X11Quiet, FindsADeadServerAtOnceAndOneThatStandsStillWithinTheLimit) {
    bench->server.Stop();
    const auto begin = CmSteadyNow();
    const auto take = [this] {
        WindowPictureRequest request;
        request.rect = {{0, 0}, {4000, 4000}};
        request.windows = {bench->window};
        bench->connection.SetDeadline(CmSteadyNow() + 20ms);
        bench->session->TakeWindowPicture(request);
    };
    EXPECT_THROW(while (CmSteadyNow() < begin + PATIENCE) take(), Unanswered);
    EXPECT_LT(CmSteadyNow() - begin, X11Session::QUIET_LIMIT + 1s);
    bench->server.Continue();
    ASSERT_TRUE(bench->BecomesQuiet());
    bench->server.Kill();
    EXPECT_THROW(take(), Lost);
}

TEST_F(X11Quiet, AsksEachTimeOnAClockThatIsMovedByHand) {
    const CManualClockScope clock;
    for (int i = 0; i < 5; ++i)
        EXPECT_GT(bench->RequestsOf([&] { bench->TakeAll(); }), 0U) << i;
}

} // namespace
} // namespace platform::x11
