// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "tests/src/mac/desktop_share_desk.h"
#include "tests/x11/x11_desk.h"
#include "tests/x11/x11_rig.h"

#include <screenshare/share_engine.h>
#include <screenshare/share_window_info.h>

#include <gtest/gtest.h>

#include <cstring>
#include <functional>
#include <memory>
#include <optional>
#include <string>

/// What a picker is told of windows of a real X server, as they live.

namespace {

const std::string TITLE =
    "Gr\xC3\xB6\xC3\x9F"
    "e \xE2\x80\x94 \xE6\xBC\xA2\xE5\xAD\x97 \xF0\x9F\x98\x80";

std::optional<ShareWindowInfo> Asked(unsigned window) {
    ShareWindowInfo info{};
    info.structSize = sizeof info;
    return ShareGetWindowInfo(window, &info) == 0 ? std::optional<ShareWindowInfo>(info) : std::nullopt;
}

class X11WindowInfo : public testing::Test {
protected:
    /// `return` after it, when it gives false: the case is skipped.
    [[nodiscard]] bool Begin(XServer::Kind kind = XServer::Kind::Xvfb) {
        X11DeskOptions options;
        options.server.kind = kind;
        options.manager = X11DeskOptions::Manager::Openbox;
        if (const auto missing = MissingProgram(options.Programs())) {
            [&] { GTEST_SKIP() << *missing; }();
            return false;
        }
        m_desk = std::make_shared<X11Desk>(options);
        m_served.emplace(m_desk);
        m_desk->Settle();
        m_writer = m_desk->StartApplication("Writer").value_or(0);
        return true;
    }

    X11Desk& Desk() { return *m_desk; }
    pid_t Writer() const { return m_writer; }
    unsigned Add(const platform::CGRect& frame) {
        const auto window = Desk().AddWindow(m_writer, frame, 0x336699);
        EXPECT_TRUE(window);
        EXPECT_TRUE(Comes(window.value_or(0), [](const ShareWindowInfo&) { return true; }));
        return window.value_or(0);
    }
    /// Whether it comes to be told.
    static bool Comes(unsigned window, const std::function<bool(const ShareWindowInfo&)>& condition) {
        return ComesTrue([&] {
            const auto info = Asked(window);
            return info && condition(*info);
        });
    }
    bool SetName(unsigned window, const std::string& property, const std::string& type,
                 const std::string& bytes) {
        return Desk().Application(m_writer)->SetProperty(Desk().NameOf(window), property, type, 8, bytes);
    }

private:
    std::shared_ptr<X11Desk> m_desk;
    std::optional<CServedDesk> m_served;
    pid_t m_writer = 0;
};

TEST_F(X11WindowInfo, TellsOwnerPlaceAndDisplay) {
    if (!Begin())
        return;
    const unsigned window = Add({{120, 80}, {333, 222}});
    EXPECT_TRUE(Comes(window, [](const ShareWindowInfo& info) {
        return info.rect == TVLRect{120, 80, 453, 302} && info.onScreen == 1;
    }));
    const auto info = Asked(window);
    ASSERT_TRUE(info);
    EXPECT_EQ(info->ownerPid, Writer());
    EXPECT_EQ(info->displayId, platform::CGMainDisplayID());
    EXPECT_EQ(info->structSize, sizeof *info);
}

TEST_F(X11WindowInfo, FollowsAWindowThatMovesAndGrows) {
    if (!Begin())
        return;
    const unsigned window = Add({{120, 80}, {333, 222}});
    ASSERT_TRUE(Desk().SetFrame(window, {{10, 20}, {444, 111}}));
    EXPECT_TRUE(Comes(window, [](const ShareWindowInfo& info) {
        return info.rect == TVLRect{10, 20, 454, 131};
    }));
}

TEST_F(X11WindowInfo, TellsThatAMinimisedWindowIsOffTheScreenAndWhereItWas) {
    if (!Begin())
        return;
    const unsigned window = Add({{120, 80}, {333, 222}});
    ASSERT_TRUE(Desk().Minimise(window));
    ASSERT_TRUE(Comes(window, [](const ShareWindowInfo& info) { return info.onScreen == 0; }));
    EXPECT_EQ(Asked(window)->rect, (TVLRect{120, 80, 453, 302}));
    ASSERT_TRUE(Desk().Restore(window));
    EXPECT_TRUE(Comes(window, [](const ShareWindowInfo& info) { return info.onScreen == 1; }));
}

TEST_F(X11WindowInfo, TellsTitlesInUtf8HoweverTheyAreSet) {
    if (!Begin())
        return;
    const unsigned window = Add({{120, 80}, {333, 222}});
    const auto isTitled = [](const std::string& title) {
        return [title](const ShareWindowInfo& info) { return info.title == title; };
    };
    ASSERT_TRUE(SetName(window, "WM_NAME", "STRING",
                        "Gr\xF6\xDF"
                        "e"));
    EXPECT_TRUE(Comes(window, isTitled("Gr\xC3\xB6\xC3\x9F"
                                       "e")))
        << Asked(window)->title;
    ASSERT_TRUE(Desk().SetTitle(window, TITLE));
    EXPECT_TRUE(Comes(window, isTitled(TITLE))) << Asked(window)->title;
    ASSERT_TRUE(Desk().SetTitle(window, "torn \xE6\xBC"));
    EXPECT_TRUE(Comes(window, isTitled("torn \xEF\xBF\xBD\xEF\xBF\xBD"))) << Asked(window)->title;
}

TEST_F(X11WindowInfo, CutsALongTitleAtACharacter) {
    if (!Begin())
        return;
    const unsigned window = Add({{120, 80}, {333, 222}});
    std::string title = "x";
    while (title.size() < 3 * SHARE_WINDOW_TITLE_SIZE)
        title += "\xE6\xBC\xA2";
    ASSERT_TRUE(Desk().SetTitle(window, title));
    ASSERT_TRUE(Comes(window, [](const ShareWindowInfo& info) { return info.title[0] == 'x'; }));
    // 1 and 170 times 3 bytes are as many as fit, which is one less than the room.
    EXPECT_EQ(Asked(window)->title, title.substr(0, 511));
    ASSERT_TRUE(Desk().SetTitle(window, "yz" + title.substr(1)));
    ASSERT_TRUE(Comes(window, [](const ShareWindowInfo& info) { return info.title[0] == 'y'; }));
    EXPECT_EQ(Asked(window)->title, "yz" + title.substr(1, 507));
}

TEST_F(X11WindowInfo, NamesTheDisplayThatAWindowHasMovedTo) {
    if (!Begin(XServer::Kind::Xorg))
        return;
    const auto side = Desk().AddDisplay({640, 480});
    ASSERT_TRUE(side);
    ASSERT_TRUE(ComesTrue([&] { return platform::CGDisplayBounds(*side).size.width > 0; }));
    const unsigned main = platform::CGMainDisplayID();
    const unsigned window = Add({{50, 60}, {200, 100}});
    EXPECT_TRUE(Comes(window, [&](const ShareWindowInfo& info) { return info.displayId == main; }));
    const platform::CGPoint origin = platform::CGDisplayBounds(*side).origin;
    ASSERT_TRUE(Desk().SetFrame(window, {{origin.x + 20, origin.y + 30}, {200, 100}}));
    EXPECT_TRUE(Comes(window, [&](const ShareWindowInfo& info) { return info.displayId == *side; }));
}

TEST_F(X11WindowInfo, FailsForAWindowThatIsGoneAndWritesNothing) {
    if (!Begin())
        return;
    const unsigned closed = Add({{120, 80}, {333, 222}});
    const unsigned orphan = Add({{20, 80}, {333, 222}});
    ASSERT_TRUE(Desk().Close(closed));
    EXPECT_TRUE(ComesTrue([&] { return !Asked(closed); }));
    EXPECT_TRUE(Asked(orphan));
    ASSERT_TRUE(Desk().EndApplication(Writer()));
    EXPECT_TRUE(ComesTrue([&] { return !Asked(orphan); }));
    for (const unsigned window : {closed, orphan, 0xFFFFFFFFu}) {
        ShareWindowInfo info;
        std::memset(&info, 0x5A, sizeof info);
        info.structSize = sizeof info;
        const ShareWindowInfo before = info;
        EXPECT_EQ(ShareGetWindowInfo(window, &info), -1);
        EXPECT_EQ(std::memcmp(&info, &before, sizeof info), 0);
    }
}

} // namespace
