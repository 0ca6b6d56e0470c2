// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"

#include <gtest/gtest.h>

#include <algorithm>

/// Menu bars in shares that are cut out by windows.

namespace {

constexpr TVLRect MENU_BAR{0, 0, 200, 10};
constexpr TVLRect BELOW{0, 0, 100, 60};

/// An application share with the rule on. The walk knows the displays from the one before it.
class MenuBars : public WindowWalk {
protected:
    MenuBars() {
        ShareApp();
        context.m_bNoWindowBaseArea = false;
        context.m_bExcludeMenuBar = true;
        WalkOver({Window(1, SHARED_APP, {0, 50, 9, 59})});
    }

    platform::WindowInfo MenuBar(const TVLRect& rect = MENU_BAR) const {
        return Window(20, SHARED_APP, rect, MenuLevel());
    }
    platform::WindowInfo Item(const TVLRect& rect) const {
        return Window(30, SHARED_APP, rect, MenuLevel() + 1);
    }
    bool IsKept(unsigned window) {
        const Values captured = Captured();
        return std::count(captured.begin(), captured.end(), window) == 1;
    }
};

} // namespace

TEST_F(MenuBars, AreKeptOutOfASharedApplicationAndHideWhatIsBelow) {
    WalkOver({Window(10, SHARED_APP, BELOW), MenuBar()});
    EXPECT_EQ(Captured(), (Values{10}));
    EXPECT_EQ(Excluded(), (Values{20}));
    EXPECT_EQ(Overlap(), (Rects{{0, 0, 100, 10}}));
    EXPECT_EQ(Visible(), (Rects{{0, 10, 100, 60}}));
}

TEST_F(MenuBars, AreKeptWithOneOfTheTwoSettingsOff) {
    context.m_bNoWindowBaseArea = true;
    WalkOver({MenuBar()});
    EXPECT_TRUE(IsKept(20));
    context.m_bNoWindowBaseArea = false;
    context.m_bExcludeMenuBar = false;
    Walk();
    EXPECT_TRUE(IsKept(20));
}

TEST_F(MenuBars, AreKeptInADesktopShare) {
    context.SetShareType(SHARE_TYPE_DESKTOP);
    WalkOver({MenuBar()});
    EXPECT_TRUE(IsKept(20));
}

TEST_F(MenuBars, AreKeptOutOfAWindowShare) {
    context.SetShareType(SHARE_TYPE_WINDOW);
    context.AddSharedWindow(20);
    WalkOver({MenuBar()});
    EXPECT_FALSE(IsKept(20));
}

TEST_F(MenuBars, AreKnownByTheCornerOfAnyDisplay) {
    WalkOver({MenuBar({200, 0, 210, 5})});
    EXPECT_FALSE(IsKept(20));
    for (const TVLRect elsewhere :
         {TVLRect{1, 0, 200, 10}, TVLRect{0, 1, 200, 10}, TVLRect{400, 0, 600, 10}}) {
        WalkOver({MenuBar(elsewhere)});
        EXPECT_TRUE(IsKept(20)) << elsewhere.left << "," << elsewhere.top;
    }
}

TEST_F(MenuBars, AreOnlyWindowsOfTheirLevel) {
    WalkOver({Window(20, SHARED_APP, MENU_BAR, MenuLevel() - 1),
              Window(21, SHARED_APP, MENU_BAR, MenuLevel() + 1)});
    EXPECT_TRUE(IsKept(20));
    EXPECT_TRUE(IsKept(21));
}

TEST_F(MenuBars, OfUnsharedApplicationsAreKeptOutToo) {
    WalkOver({Window(10, SHARED_APP, BELOW), Window(20, OTHER_APP, MENU_BAR, MenuLevel()),
              Item({150, 0, 160, 10})});
    EXPECT_EQ(Captured(), (Values{10}));
    EXPECT_EQ(Excluded(), (Values{20, 30})) << "and their bar counts for what lies in it";
}

TEST_F(MenuBars, KeepOutWhatLiesInThem) {
    WalkOver({MenuBar(), Item({150, 0, 160, 10})});
    EXPECT_FALSE(IsKept(30));
    WalkOver({MenuBar(), Item(MENU_BAR)});
    EXPECT_FALSE(IsKept(30));
}

TEST_F(MenuBars, LetWindowsBeThatStickOut) {
    for (const TVLRect rect : {TVLRect{150, 0, 160, 11}, TVLRect{190, 0, 201, 10}, TVLRect{150, 10, 160, 20},
                               TVLRect{150, 50, 160, 60}}) {
        WalkOver({MenuBar(), Item(rect)});
        EXPECT_TRUE(IsKept(30)) << rect.right << "," << rect.bottom;
    }
}

TEST_F(MenuBars, LetWindowsBehindThemBe) {
    WalkOver({Item({150, 0, 160, 10}), MenuBar()});
    EXPECT_TRUE(IsKept(30));
}

TEST_F(MenuBars, OfOneWalkAreForgottenInTheNext) {
    WalkOver({MenuBar(), Item({150, 0, 160, 10})});
    WalkOver({Item({150, 0, 160, 10})});
    EXPECT_TRUE(IsKept(30));
}

TEST_F(MenuBars, KeepOutASharedWindowWithoutAFrame) {
    WalkOver({MenuBar(), Item({0, 0, 0, 0})});
    EXPECT_FALSE(IsKept(30)) << "no part of it lies in the bar, and no part is all of it";
    WalkOver({MenuBar(), Item({5, 5, 5, 9})});
    EXPECT_TRUE(IsKept(30));
}

TEST_F(MenuBars, WithoutAnAreaKeepOutNothingElse) {
    WalkOver({MenuBar({0, 0, 200, 0}), Item({0, 0, 0, 0})});
    EXPECT_FALSE(IsKept(20));
    EXPECT_TRUE(IsKept(30));
}

TEST_F(MenuBars, AreNotKnownBeforeADisplayIs) {
    CMacContextProbe fresh;
    fresh.AddSharedDisplay(LEFT);
    fresh.AddSharedApp(SHARED_APP);
    fresh.m_bNoWindowBaseArea = false;
    fresh.m_bExcludeMenuBar = true;
    SetStack({MenuBar()});
    fresh.UpdateShareCapturerContext();
    EXPECT_EQ(fresh.m_vCapturedWindows, (Values{20}));
    fresh.UpdateShareCapturerContext();
    EXPECT_EQ(fresh.m_vCapturedWindows, Values{});
}
