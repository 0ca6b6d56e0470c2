// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_session.h"
#include "tests/support/test_effort.h"
#include "tests/x11/component_bench.h"
#include "tests/x11/x11_fixture.h"

#include <gtest/gtest.h>
#include <xcb/shape.h>
#include <xcb/xtest.h>

#include <cstring>
#include <iostream>
#include <random>
#include <vector>

/// Random histories of a small desk, in which the moment of the last picture tells whether that picture still
/// holds: where it says so, a picture taken anew has to be the same.
namespace {

using namespace platform;

/// What a tick of a capturer sees.
struct Sight {
    std::vector<CGWindowID> asked;
    std::shared_ptr<const WindowPicture> picture; ///< Never null.
    std::shared_ptr<const WindowSnapshot> windows;
    std::shared_ptr<const CursorImage> cursor;
};

testing::AssertionResult AreAlike(const Picture& one, const Picture& other) {
    if (one.width != other.width || one.height != other.height || one.format != other.format ||
        !(one.rect == other.rect))
        return testing::AssertionFailure() << "a layer of another kind";
    for (int y = 0; y < one.height; ++y) {
        const auto row = [y](const Picture& of) {
            return of.pixels + static_cast<std::size_t>(y) * of.stride;
        };
        if (std::memcmp(row(one), row(other), static_cast<std::size_t>(one.width) * 4) != 0)
            return testing::AssertionFailure() << "other pixels in row " << y;
    }
    return testing::AssertionSuccess();
}

testing::AssertionResult AreAlike(const Sight& one, const Sight& other) {
    if (one.windows != other.windows)
        return testing::AssertionFailure() << "another list of windows";
    if (one.cursor != other.cursor)
        return testing::AssertionFailure() << "another cursor";
    const WindowPicture& first = *one.picture;
    const WindowPicture& second = *other.picture;
    if (first.generation != second.generation || first.pointer != second.pointer)
        return testing::AssertionFailure() << "another generation, or the pointer elsewhere";
    if (first.layers.size() != second.layers.size())
        return testing::AssertionFailure() << "other layers";
    for (std::size_t i = 0; i < first.layers.size(); ++i) {
        const PictureLayer& a = first.layers[i];
        const PictureLayer& b = second.layers[i];
        if (a.window != b.window || !(a.frame == b.frame) || a.alpha != b.alpha || a.stale != b.stale)
            return testing::AssertionFailure() << "another layer " << i;
        if (const auto result = AreAlike(*a.picture, *b.picture); !result)
            return result;
    }
    return testing::AssertionSuccess();
}

/// A server whose only client does this and that, and somebody who looks.
class RandomDesk {
public:
    explicit RandomDesk(unsigned seed)
        : m_rig(SmallServer(XServerOptions::Kind::Xvfb)),
          m_link(m_rig.Display()),
          m_server(m_rig.Display()),
          m_random(seed) {
        for (int i = 0; i < 4; ++i)
            AddWindow();
        Settle();
    }

    /// Something, or nothing. All of it has been told when it returns.
    void Change() {
        switch (Number(20)) {
            case 0:
            case 12:
                PaintAll();
                break;
            case 1:
            case 2:
                Paint(Any(), Number(3) == 0);
                break;
            case 3:
                Configure(XCB_CONFIG_WINDOW_X, static_cast<std::uint32_t>(Number(250)));
                break;
            case 4:
                Configure(XCB_CONFIG_WINDOW_STACK_MODE,
                          Number(2) == 0 ? XCB_STACK_MODE_ABOVE : XCB_STACK_MODE_BELOW);
                break;
            case 5:
                Configure(XCB_CONFIG_WINDOW_HEIGHT, 40 + static_cast<std::uint32_t>(Number(40)));
                break;
            case 6:
                xcb_unmap_window(m_link.Get(), Any());
                break;
            case 10:
            case 11:
                xcb_map_window(m_link.Get(), Any());
                break;
            case 7:
                xcb_test_fake_input(m_link.Get(), XCB_MOTION_NOTIFY, 0, XCB_CURRENT_TIME, m_link.Root(),
                                    static_cast<std::int16_t>(Number(320)),
                                    static_cast<std::int16_t>(Number(240)), 0);
                break;
            case 8:
                SetTitle();
                break;
            case 9:
                CutOut();
                break;
            default:
                break;
        }
        Settle();
    }

    std::vector<CGWindowID> Seen() const {
        std::vector<CGWindowID> seen;
        const auto listed = m_server.GetWindows();
        for (const WindowInfo& each : listed->Windows()) {
            if (each.onScreen)
                seen.push_back(each.id);
        }
        return seen;
    }

    Sight Look(std::vector<CGWindowID> windows) {
        WindowPictureRequest request;
        request.windows = windows;
        request.rect = {{0, 0}, {320, 240}};
        request.deadline = CmSteadyNow() + PATIENCE;
        Sight sight;
        sight.asked = std::move(windows);
        sight.picture = m_server.TakeWindowPicture(request).picture;
        if (sight.picture == nullptr) // there are none of them
            sight.picture = std::make_shared<const WindowPicture>();
        sight.windows = m_server.GetWindows();
        sight.cursor = m_server.GetCursor();
        return sight;
    }

    std::uint64_t Moment() const { return m_server.GetMoment(); }

private:
    int Number(int end) { return static_cast<int>(m_random() % static_cast<unsigned>(end)); }
    xcb_window_t Any() {
        return m_windows[static_cast<std::size_t>(Number(static_cast<int>(m_windows.size())))];
    }

    void AddWindow() {
        const xcb_window_t made = xcb_generate_id(m_link.Get());
        const std::uint32_t colour = 0x00FF00;
        xcb_create_window(m_link.Get(), XCB_COPY_FROM_PARENT, made, m_link.Root(),
                          static_cast<std::int16_t>(Number(250)), static_cast<std::int16_t>(Number(180)), 60,
                          50, 0, XCB_WINDOW_CLASS_INPUT_OUTPUT, XCB_COPY_FROM_PARENT, XCB_CW_BACK_PIXEL,
                          &colour);
        xcb_map_window(m_link.Get(), made);
        m_windows.push_back(made);
    }

    /// Of what lies behind a window or isn't painted, no picture is sure to hold.
    void PaintAll() {
        for (const xcb_window_t window : m_windows) {
            xcb_map_window(m_link.Get(), window);
            Paint(window, true);
        }
    }

    void Paint(xcb_window_t window, bool isWhole) {
        const xcb_gcontext_t context = xcb_generate_id(m_link.Get());
        const auto colour = static_cast<std::uint32_t>(m_random() & 0xFFFFFFU);
        xcb_create_gc(m_link.Get(), context, window, XCB_GC_FOREGROUND, &colour);
        const xcb_rectangle_t whole{0, 0, 100, 100};
        const xcb_rectangle_t part{static_cast<std::int16_t>(Number(60)),
                                   static_cast<std::int16_t>(Number(50)),
                                   static_cast<std::uint16_t>(1 + Number(30)), 10};
        xcb_poly_fill_rectangle(m_link.Get(), window, context, 1, isWhole ? &whole : &part);
        xcb_free_gc(m_link.Get(), context);
    }

    void Configure(std::uint16_t what, std::uint32_t value) {
        xcb_configure_window(m_link.Get(), Any(), what, &value);
    }

    void SetTitle() {
        const std::string title = std::to_string(m_random());
        xcb_change_property(m_link.Get(), XCB_PROP_MODE_REPLACE, Any(), m_link.Atom("_NET_WM_NAME"),
                            m_link.Atom("UTF8_STRING"), 8, static_cast<std::uint32_t>(title.size()),
                            title.data());
    }

    void CutOut() {
        const xcb_rectangle_t shape{0, 0, static_cast<std::uint16_t>(20 + Number(60)), 80};
        xcb_shape_rectangles(m_link.Get(), XCB_SHAPE_SO_SET, XCB_SHAPE_SK_BOUNDING, 0, Any(), 0, 0, 1,
                             &shape);
    }

    /// A server sends to one client after the other: with the second answer the others have what they were
    /// told before the first one.
    void Settle() {
        m_link.RoundTrip();
        m_link.RoundTrip();
    }

    XServer m_rig;
    XLink m_link;
    X11WindowServer m_server;
    std::mt19937 m_random;
    std::vector<xcb_window_t> m_windows;
};

void JudgeHistory() {
    if (const auto missing = MissingProgram(XServer::ProgramsOf(XServerOptions::Kind::Xvfb)))
        GTEST_SKIP() << *missing;
    const unsigned seed = std::random_device{}();
    const int rounds = TestRounds(2000);
    RandomDesk desk(seed);
    Sight last = desk.Look(desk.Seen());
    int stood = 0;
    int told = 0;
    for (int i = 0; i < rounds && !testing::Test::HasFailure(); ++i) {
        desk.Change();
        const bool stands = last.picture->moment != 0 && desk.Moment() == last.picture->moment;
        Sight next = desk.Look(stands ? last.asked : desk.Seen());
        const bool isSameMoment = next.picture->moment != 0 && next.picture->moment == last.picture->moment &&
                                  next.asked == last.asked;
        if (stands || isSameMoment) {
            EXPECT_TRUE(AreAlike(last, next))
                << (stands ? "it stands" : "it has that name") << ", step " << i;
        }
        stood += stands ? 1 : 0;
        told += next.picture->moment != 0 ? 1 : 0;
        last = std::move(next);
    }
    std::cout << "seed " << seed << ", pictures that held: " << stood << " of " << told << " with a moment\n";
    EXPECT_GT(stood, rounds / 40);
}

TEST(X11MomentRandom, SaysThatAPictureHoldsOnlyWhereItDoes) {
    JudgeHistory();
}

TEST(X11MomentRandom, SaysSoToThoseWhoBorrowTheConnection) {
    const CBrokenPipeBlocked blocked;
    JudgeHistory();
}

} // namespace
