// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/x11/known_windows.h"
#include "tests/x11/x11_desk.h"
#include "tests/x11/x11_rig.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_window_info.h>

#include <gtest/gtest.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <optional>
#include <random>
#include <string>
#include <vector>

/// Thumbnails of windows of a real desktop with a window manager, pixel by pixel.

namespace {

using Ids = std::vector<unsigned>;

/// All windows that a picker would show, front first.
Ids PickerWindows() {
    struct Walk : ITvlEnumWindowsCallback {
        bool OnWindow(unsigned window) override {
            ids.push_back(window);
            return true;
        }
        Ids ids;
    } walk;
    EXPECT_EQ(TvlEnumWindows(&walk, SHARE_WINDOW_ENUM_NORMAL), 0);
    return walk.ids;
}

std::optional<ShareWindowInfo> InfoOf(unsigned window) {
    ShareWindowInfo info{};
    info.structSize = sizeof info;
    return ShareGetWindowInfo(window, &info) == 0 ? std::optional<ShareWindowInfo>(info) : std::nullopt;
}

bool IsInside(const TVLRect& rect, int x, int y) {
    return x >= rect.left && x < rect.right && y >= rect.top && y < rect.bottom;
}

class X11Thumbnails : public testing::Test {
protected:
    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin() {
        X11DeskOptions options;
        options.manager = X11DeskOptions::Manager::Openbox;
        if (const auto missing = MissingProgram(options.Programs())) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        m_desk = std::make_shared<X11Desk>(options);
        m_served.emplace(m_desk);
        m_desk->Settle();
        return true;
    }

    X11Desk& Desk() { return *m_desk; }
    const std::vector<KnownWindow>& Known() const { return m_known; }
    const KnownWindow& Window(unsigned id) const {
        return *std::find_if(m_known.begin(), m_known.end(),
                             [id](const KnownWindow& each) { return each.id == id; });
    }
    Ids KnownIds() const {
        Ids ids;
        for (const KnownWindow& each : m_known)
            ids.push_back(each.id);
        return ids;
    }

    pid_t StartApplication(const std::string& name) { return Desk().StartApplication(name).value_or(0); }

    /// In front of everything else; bare, unless the options say something else.
    const KnownWindow& Add(pid_t owner, const TVLRect& place, const std::string& options = {}) {
        KnownWindow window;
        window.owner = owner;
        const auto number = static_cast<std::uint32_t>(m_known.size());
        window.name = "w" + std::to_string(number);
        window.place = place;
        window.colour = (40 + number * 7) << 16 | (250 - number * 5) << 8 | (number * 53 + 11) % 256;
        const std::string form = std::to_string(place.left) + " " + std::to_string(place.top) + " " +
                                 std::to_string(window.Width()) + " " + std::to_string(window.Height()) +
                                 " " + HexOf(window.colour) + " mark=" + HexOf(window.Mark()) + " " + options;
        X11Client& client = *Desk().Application(owner);
        window.id = client.Create(window.name, form).value_or(0);
        EXPECT_NE(window.id, 0u);
        Desk().Settle();
        EXPECT_TRUE(client.Tell("raise " + window.name));
        m_known.push_back(window);
        return m_known.back();
    }

    bool Tell(const KnownWindow& window, const std::string& command) {
        return Desk().Application(window.owner)->Tell(command + " " + window.name);
    }

    /// Every window has been put where it belongs and painted.
    testing::AssertionResult AllAreThere() {
        Desk().Settle();
        const Ids asked = KnownIds();
        testing::AssertionResult shown = testing::AssertionFailure();
        ComesTrue([&] {
            shown = testing::AssertionSuccess();
            for (const ThumbnailTold& told : ThumbnailsOfWindows(asked)) {
                if (shown)
                    shown = ShowsWindow(told, Window(told.id));
            }
            return static_cast<bool>(shown);
        });
        return shown;
    }

    /// Ten windows of each of three applications: a row that is covered wholly, one that is covered in part,
    /// and others that lie about.
    void AddThirty() {
        const std::array<pid_t, 3> owners{StartApplication("Writer"), StartApplication("Reader"),
                                          StartApplication("Painter")};
        const auto add = [&](int x, int y, int width, int height) {
            Add(owners[m_known.size() % owners.size()], {x, y, x + width, y + height});
        };
        for (int i = 0; i < 24; ++i) {
            const int column = i % 6;
            const int row = i / 6;
            add(20 + column * 208, 10 + row * 172, 61 + i * 37 % 130, 80 + i * 29 % 71);
        }
        add(10, 5, 1250, 165);
        add(10, 225, 1250, 115);
        add(30, 400, 333, 200);
        add(100, 450, 200, 150);
        add(600, 380, 51, 301);
        add(620, 400, 302, 47);
    }

    /// How much of a window others cover, from 0 to 1, by what the product says of the stack.
    static std::map<unsigned, double> CoveredShares() {
        std::vector<TVLRect> inFront;
        std::map<unsigned, double> shares;
        for (const unsigned id : PickerWindows()) {
            const auto info = InfoOf(id);
            if (!info)
                continue;
            int all = 0;
            int covered = 0;
            for (int y = info->rect.top; y < info->rect.bottom; ++y) {
                for (int x = info->rect.left; x < info->rect.right; ++x, ++all) {
                    covered += std::any_of(inFront.begin(), inFront.end(),
                                           [&](const TVLRect& rect) { return IsInside(rect, x, y); })
                                   ? 1
                                   : 0;
                }
            }
            shares[id] = static_cast<double>(covered) / std::max(all, 1);
            inFront.push_back(info->rect);
        }
        return shares;
    }

private:
    std::vector<KnownWindow> m_known;
    std::shared_ptr<X11Desk> m_desk;
    std::optional<CServedDesk> m_served;
};

// ---- Thirty windows

TEST_F(X11Thumbnails, MatchThePixelsOfThirtyWindowsCoveredAndNot) {
    if (!Begin())
        return;
    AddThirty();
    ASSERT_TRUE(AllAreThere());
    int wholly = 0;
    int partly = 0;
    int free = 0;
    const std::map<unsigned, double> shares = CoveredShares();
    for (const KnownWindow& window : Known()) {
        ASSERT_EQ(shares.count(window.id), 1u) << window.name;
        const double share = shares.at(window.id);
        EXPECT_EQ(InfoOf(window.id)->rect, window.place) << window.name;
        ++(share == 1 ? wholly : share > 0 ? partly : free);
    }
    EXPECT_GE(wholly, 6);
    EXPECT_GE(partly, 6);
    EXPECT_GE(free, 6);

    Ids asked = KnownIds();
    std::shuffle(asked.begin(), asked.end(), std::mt19937(20261));
    const std::vector<ThumbnailTold> calls = ThumbnailsOfWindows(asked);
    ExpectThumbnails(calls, asked, false);
    for (const ThumbnailTold& told : calls)
        EXPECT_TRUE(ShowsWindow(told, Window(told.id)));
}

TEST_F(X11Thumbnails, OfApplicationsAreTheirLargestWindows) {
    if (!Begin())
        return;
    AddThirty();
    ASSERT_TRUE(AllAreThere());
    std::map<unsigned, const KnownWindow*> largest;
    const auto area = [](const KnownWindow& window) { return window.Width() * window.Height(); };
    for (const KnownWindow& window : Known()) {
        const KnownWindow*& best = largest[static_cast<unsigned>(window.owner)];
        if (best == nullptr || area(window) > area(*best))
            best = &window;
    }
    ASSERT_EQ(largest.size(), 3u);
    Ids asked;
    for (const auto& [pid, window] : largest)
        asked.insert(asked.begin(), pid);
    const std::vector<ThumbnailTold> calls = ThumbnailsOfApps(asked);
    ExpectThumbnails(calls, asked, true);
    for (const ThumbnailTold& told : calls)
        EXPECT_TRUE(ShowsWindow(told, *largest.at(told.id)));

    CPictureLog everything;
    ASSERT_EQ(EnumAppThumbnail(nullptr, 0, &everything), 0);
    ASSERT_TRUE(everything.HasEnded());
    const std::vector<ThumbnailTold> all = everything.Calls();
    int known = 0;
    for (std::size_t i = 0; i < all.size(); ++i) {
        EXPECT_TRUE(i == 0 || all[i - 1].id < all[i].id) << "not in the order of their ids";
        EXPECT_EQ(all[i].last, i + 1 == all.size());
        if (largest.count(all[i].id) == 0)
            continue;
        EXPECT_TRUE(ShowsWindow(all[i], *largest.at(all[i].id)));
        ++known;
    }
    EXPECT_EQ(known, 3);
}

// ---- Windows that are not bare, or not on the screen

TEST_F(X11Thumbnails, HoldTheFrameThatTheWindowManagerHasPutAroundAWindow) {
    if (!Begin())
        return;
    const pid_t writer = StartApplication("Writer");
    const KnownWindow window = Add(writer, {200, 150, 420, 290}, "decorated");
    const XLink link(Desk().Rig().Display());
    std::vector<std::uint32_t> extents; // left, right, top, bottom
    ASSERT_TRUE(ComesTrue([&] {
        extents = link.Property(window.id, "_NET_FRAME_EXTENTS");
        return extents.size() == 4 && extents[2] > 0;
    })) << "without a title bar";
    const int left = static_cast<int>(extents[0]);
    const int top = static_cast<int>(extents[2]);
    const int width = left + window.Width() + static_cast<int>(extents[1]);
    const int height = top + window.Height() + static_cast<int>(extents[3]);
    ThumbnailTold told;
    const auto isInside = [&](int x, int y) {
        const std::uint32_t pixel =
            told.pixels[static_cast<std::size_t>(y + top) * static_cast<std::size_t>(width) +
                        static_cast<std::size_t>(x + left)];
        return pixel == window.PixelAt(x, y);
    };
    EXPECT_TRUE(ComesTrue([&] {
        told = ThumbnailsOfWindows({window.id}).at(0);
        if (told.failed || told.width != width || told.height != height)
            return false;
        for (int y = 0; y < window.Height(); ++y) {
            for (int x = 0; x < window.Width(); ++x) {
                if (!isInside(x, y))
                    return false;
            }
        }
        return true;
    })) << told.width
        << "x" << told.height;
}

TEST_F(X11Thumbnails, OfMinimisedWindowsShowTheirLastMoment) {
    if (!Begin())
        return;
    const pid_t writer = StartApplication("Writer");
    const Ids ids{Add(writer, {10, 10, 210, 110}).id, Add(writer, {50, 30, 350, 230}).id,
                  Add(writer, {60, 40, 300, 200}).id};
    ASSERT_TRUE(AllAreThere());
    for (const unsigned id : {ids[0], ids[2]}) {
        ASSERT_TRUE(Tell(Window(id), "minimise"));
        ASSERT_TRUE(ComesTrue([&] {
            const auto info = InfoOf(id);
            return info && info->onScreen == 0;
        }));
    }
    const std::vector<ThumbnailTold> calls = ThumbnailsOfWindows(ids);
    ExpectThumbnails(calls, ids, false);
    for (const ThumbnailTold& told : calls)
        EXPECT_TRUE(ShowsWindow(told, Window(told.id)));

    ASSERT_TRUE(Tell(Window(ids[0]), "restore"));
    EXPECT_TRUE(ComesTrue([&] { return InfoOf(ids[0])->onScreen == 1; }));
    EXPECT_TRUE(AllAreThere());
}

/// Its pixels are gone with its storage. What has taken their place on the screen must not pass for it.
TEST_F(X11Thumbnails, AreBlackOfAMinimisedWindowThatNobodyHasLookedAt) {
    if (!Begin())
        return;
    const pid_t writer = StartApplication("Writer");
    const KnownWindow behind = Add(writer, {0, 0, 400, 300});
    const KnownWindow window = Add(writer, {20, 20, 220, 140});
    ASSERT_TRUE(ComesTrue([&] { return InfoOf(window.id).has_value(); }));
    ASSERT_TRUE(Tell(window, "minimise"));
    ASSERT_TRUE(ComesTrue([&] { return InfoOf(window.id)->onScreen == 0; }));
    const std::vector<ThumbnailTold> calls = ThumbnailsOfWindows({window.id, behind.id});
    ExpectThumbnails(calls, {window.id, behind.id}, false);
    EXPECT_FALSE(calls[0].failed);
    EXPECT_EQ(calls[0].width, window.Width());
    EXPECT_EQ(calls[0].height, window.Height());
    EXPECT_EQ(calls[0].pixels, std::vector<std::uint32_t>(calls[0].pixels.size(), 0));
}

TEST_F(X11Thumbnails, OfAnApplicationFailWhenAllItsWindowsAreMinimised) {
    if (!Begin())
        return;
    const pid_t writer = StartApplication("Writer");
    const pid_t reader = StartApplication("Reader");
    ASSERT_TRUE(Desk().Application(writer)->Tell("destroy application"));
    const KnownWindow window = Add(writer, {20, 20, 220, 140});
    const KnownWindow other = Add(reader, {300, 20, 420, 140});
    ASSERT_TRUE(AllAreThere());
    ASSERT_TRUE(Tell(window, "minimise"));
    ASSERT_TRUE(ComesTrue([&] { return InfoOf(window.id)->onScreen == 0; }));
    const Ids asked{static_cast<unsigned>(writer), static_cast<unsigned>(reader)};
    const std::vector<ThumbnailTold> calls = ThumbnailsOfApps(asked);
    ExpectThumbnails(calls, asked, true);
    EXPECT_TRUE(calls[0].failed);
    EXPECT_TRUE(ShowsWindow(calls[1], other));
}

// ---- Windows that vanish

TEST_F(X11Thumbnails, OfAWindowThatVanishesMeanwhileFailAndTheOthersCome) {
    if (!Begin())
        return;
    const pid_t writer = StartApplication("Writer");
    for (int i = 0; i < 6; ++i)
        Add(writer, {20 + i * 50, 30, 220 + i * 50, 150 + i * 10});
    ASSERT_TRUE(AllAreThere());
    const Ids asked = KnownIds();
    CPictureLog log;
    log.during = [&](std::size_t count) {
        if (count != 2)
            return;
        EXPECT_TRUE(Tell(Known()[3], "destroy"));
        EXPECT_TRUE(ComesTrue([&] { return !InfoOf(asked[3]); }));
    };
    ASSERT_EQ(EnumWindowThumbnail(asked.data(), static_cast<int>(asked.size()), &log), 0);
    ASSERT_TRUE(log.HasEnded());
    const std::vector<ThumbnailTold> calls = log.Calls();
    ExpectThumbnails(calls, asked, false);
    for (std::size_t i = 0; i < calls.size(); ++i) {
        if (i == 3) {
            EXPECT_TRUE(calls[i].failed && calls[i].pixels.empty());
        } else {
            EXPECT_TRUE(ShowsWindow(calls[i], Known()[i]));
        }
    }
}

TEST_F(X11Thumbnails, OfAnApplicationThatEndsMeanwhileFailAndTheOthersCome) {
    if (!Begin())
        return;
    Ids asked;
    for (int i = 0; i < 4; ++i) {
        const pid_t pid = StartApplication("Writer " + std::to_string(i));
        Add(pid, {20 + i * 50, 30, 220 + i * 50, 150 + i * 10});
        asked.push_back(static_cast<unsigned>(pid));
    }
    ASSERT_TRUE(AllAreThere());
    CPictureLog log;
    log.during = [&](std::size_t count) {
        if (count != 1)
            return;
        EXPECT_TRUE(Desk().EndApplication(Known()[1].owner));
        EXPECT_TRUE(Desk().EndApplication(Known()[3].owner));
        EXPECT_TRUE(ComesTrue([&] { return !InfoOf(Known()[1].id) && !InfoOf(Known()[3].id); }));
    };
    ASSERT_EQ(EnumAppThumbnail(asked.data(), static_cast<int>(asked.size()), &log), 0);
    ASSERT_TRUE(log.HasEnded());
    const std::vector<ThumbnailTold> calls = log.Calls();
    ExpectThumbnails(calls, asked, true);
    for (std::size_t i = 0; i < calls.size(); ++i) {
        if (i % 2 == 1) {
            EXPECT_TRUE(calls[i].failed) << "the last one too";
        } else {
            EXPECT_TRUE(ShowsWindow(calls[i], Known()[i]));
        }
    }
}

} // namespace
