// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"

#include <gtest/gtest.h>

#include <vector>

/// What the walk makes of a stack of windows.

namespace {

const TVLRect LEFT_RECT{0, 0, 200, 120};

} // namespace

// ---- The walk as a whole

TEST_F(WindowWalk, LeavesEverythingAloneWhenItIsSwitchedOff) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {10, 10, 50, 50}), Window(2, OTHER_APP, {40, 40, 90, 90})});
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_WINDOW_WALK;
    SetStack({});
    EXPECT_EQ(context.UpdateShareCapturerContext(), 0);
    EXPECT_EQ(Captured(), (Values{1}));
    EXPECT_EQ(Excluded(), (Values{2}));
    EXPECT_EQ(SharedWindows(), (Rects{{10, 10, 50, 50}}));
    EXPECT_FALSE(Overlap().empty());
    EXPECT_FALSE(Visible().empty());
}

TEST_F(WindowWalk, OverNoWindowsEmptiesWhatWasPublished) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {10, 10, 50, 50}), Window(2, OTHER_APP, {40, 40, 90, 90})});
    WalkOver({});
    EXPECT_TRUE(Visible().empty());
    EXPECT_TRUE(Overlap().empty());
    EXPECT_TRUE(SharedWindows().empty());
    EXPECT_TRUE(Applications().empty());
    EXPECT_TRUE(Captured().empty());
    EXPECT_TRUE(Excluded().empty());
}

TEST_F(WindowWalk, FollowsTheExampleOfThreeWindows) {
    ReserveEdges(0, 0, 0, 20);
    ShareApp();
    WalkOver({Window(1, OTHER_APP, LEFT_RECT, DesktopLevel()), Window(2, SHARED_APP, {20, 20, 100, 110}),
              Window(3, OTHER_APP, {60, 0, 140, 60}), Window(4, SHARED_APP, {80, 40, 120, 80}),
              Window(5, OTHER_APP, LEFT_RECT, DockLevel())});
    EXPECT_EQ(Captured(), (Values{4, 2}));
    EXPECT_EQ(Excluded(), (Values{3}));
    // The third window's part of the second, less what the fourth has, and the Dock's part at the bottom.
    EXPECT_EQ(Overlap(), (Rects{{60, 20, 100, 40}, {60, 40, 80, 60}, {20, 100, 100, 110}}));
    EXPECT_EQ(
        Visible(),
        (Rects{
            {20, 20, 60, 40}, {20, 40, 60, 60}, {80, 40, 120, 60}, {20, 60, 120, 80}, {20, 80, 100, 100}}));
    EXPECT_EQ(SharedWindows(), (Rects{{20, 20, 100, 40}, {20, 40, 120, 80}, {20, 80, 100, 110}}));
}

TEST_F(WindowWalk, ListsKeptWindowsFrontToBackAndOthersBackToFront) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 9, 9}), Window(2, OTHER_APP, {20, 0, 29, 9}),
              Window(3, SHARED_APP, {40, 0, 49, 9}), Window(4, OTHER_APP, {60, 0, 69, 9})});
    EXPECT_EQ(Captured(), (Values{3, 1}));
    EXPECT_EQ(Excluded(), (Values{2, 4}));
}

TEST_F(WindowWalk, CutsFramesTowardZeroBeforeTheSizeIsAdded) {
    ShareApp();
    WalkOver({FakeWindow(1, SHARED_APP, {{10.75F, 20.75F}, {9.5F, 9.5F}})});
    EXPECT_EQ(Visible(), (Rects{{10, 20, 19, 29}}));
}

TEST_F(WindowWalk, SeesListChangesAtTheNextWalk) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 9, 9})});
    context.AddUnSharedWindow(1);
    EXPECT_EQ(Captured(), (Values{1}));
    Walk();
    EXPECT_EQ(Captured(), Values{});
    EXPECT_EQ(Excluded(), (Values{1}));
    EXPECT_TRUE(Visible().empty());
}

TEST_F(WindowWalk, KeepsAWindowByItsOwnListBeforeItsApplications) {
    ShareApp();
    context.AddSharedWindow(1);
    context.AddUnSharedWindow(2);
    WalkOver({Window(1, OTHER_APP, {0, 0, 9, 9}), Window(2, SHARED_APP, {20, 0, 29, 9})});
    EXPECT_EQ(Captured(), (Values{1}));
    EXPECT_EQ(Excluded(), (Values{2}));
}

TEST_F(WindowWalk, ClipsWhatItPublishesToTheSharedDisplays) {
    ShareApp();
    const TVLRect across{150, 20, 250, 60};
    WalkOver({Window(1, SHARED_APP, across), Window(2, OTHER_APP, {190, 0, 300, 40})});
    EXPECT_EQ(SharedWindows(), (Rects{{150, 20, 200, 60}}));
    EXPECT_EQ(Overlap(), (Rects{{190, 20, 200, 40}}));
    EXPECT_EQ(Visible(), (Rects{{150, 20, 190, 40}, {150, 40, 200, 60}}));
    EXPECT_EQ(Applications(), (Rects{across})) << "this one shows windows on displays outside the share";
}

// ---- What hides what

TEST_F(WindowWalk, CountsAsOverlapOnlyWhatTheFrontWindowLeavesUncovered) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 100, 40}), Window(2, OTHER_APP, {50, 0, 90, 40}),
              Window(3, SHARED_APP, {70, 0, 120, 40})});
    EXPECT_EQ(Overlap(), (Rects{{50, 0, 70, 40}}));
    EXPECT_EQ(Visible(), (Rects{{0, 0, 50, 40}, {70, 0, 120, 40}}));
}

TEST_F(WindowWalk, LetsATransparentWindowHideNothingAndListsItAllTheSame) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 100, 40}), Window(2, OTHER_APP, {50, 0, 90, 40}, 0, 0.0F)});
    EXPECT_TRUE(Overlap().empty());
    EXPECT_EQ(Visible(), (Rects{{0, 0, 100, 40}}));
    EXPECT_EQ(Excluded(), (Values{2}));
}

TEST_F(WindowWalk, LetsAWindowThatIsHardlyVisibleHide) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 100, 40}), Window(2, OTHER_APP, {50, 0, 90, 40}, 0, 0.01F)});
    EXPECT_EQ(Overlap(), (Rects{{50, 0, 90, 40}}));
}

TEST_F(WindowWalk, AsksForTheAlphaOfThoseWindowsOnlyThatTouchSomethingVisible) {
    const CJumpingClockScope nothingStaysPinned;
    ShareApp();
    const auto lookUps = [&](const TVLRect& other) {
        SetStack({Window(1, SHARED_APP, {0, 0, 100, 40}), Window(2, OTHER_APP, other)});
        const int before = desktop->calls.windows;
        Walk();
        return desktop->calls.windows - before;
    };
    const int apart = lookUps({100, 0, 150, 40});
    EXPECT_EQ(lookUps({99, 0, 150, 40}), apart + 1);
    EXPECT_EQ(lookUps({100, 0, 150, 40}), apart);
}

TEST_F(WindowWalk, NamesTheFrontmostKeptWindowOfTheNormalLevel) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 9, 9}), Window(2, SHARED_APP, {0, 0, 9, 9}),
              Window(3, SHARED_APP, {0, 0, 9, 9}, 3), Window(4, OTHER_APP, {0, 0, 9, 9})});
    EXPECT_EQ(context.m_nTopAppWindow, 2u);
    WalkOver({Window(3, SHARED_APP, {0, 0, 9, 9}, 3)});
    EXPECT_EQ(context.m_nTopAppWindow, 0u);
}

TEST_F(WindowWalk, PutsTheDisplayOfThatWindowFirst) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 150, 100}), Window(2, SHARED_APP, {210, 0, 220, 10})});
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetAppMonitors), (Values{RIGHT, LEFT}));
}

// ---- Desktop shares

TEST_F(WindowWalk, OfADesktopKeepsEveryWindow) {
    ShareDesktop();
    WalkOver({Window(1, OTHER_APP, {-10, -10, 500, 500}, DesktopLevel()),
              Window(2, OTHER_APP, {10, 10, 50, 50}), Window(3, SHARED_APP, {30, 30, 80, 80}),
              Window(4, 0, {60, 60, 90, 90}, MenuLevel())});
    EXPECT_EQ(Captured(), (Values{4, 3, 2, 1}));
    EXPECT_TRUE(Excluded().empty());
    EXPECT_TRUE(Overlap().empty());
    EXPECT_EQ(Visible(), (Rects{LEFT_RECT}));
    EXPECT_EQ(SharedWindows(), Visible());
}

TEST_F(WindowWalk, OfADesktopTakesTheDocksDrawnPartForItsWindow) {
    ReserveEdges(0, 0, 0, 20);
    ShareDesktop();
    WalkOver({Window(1, OTHER_APP, LEFT_RECT, DockLevel())});
    EXPECT_EQ(Captured(), (Values{1}));
    EXPECT_EQ(Visible(), (Rects{{0, 100, 200, 120}}));
    EXPECT_EQ(Applications(), (Rects{{0, 100, 200, 120}}));
}

TEST_F(WindowWalk, OfADesktopTakesTheDockOfTheFirstSharedDisplay) {
    ReserveEdges(0, 0, 0, 20);
    EXPECT_EQ(context.AddSharedDisplay(RIGHT), 0);
    ShareDesktop();
    WalkOver({Window(1, OTHER_APP, LEFT_RECT, DockLevel())});
    EXPECT_TRUE(Applications().empty()) << "the right display has no Dock";
}

TEST_F(WindowWalk, OfADesktopLeavesAnUnsharedDockItsFrame) {
    ReserveEdges(0, 0, 0, 20);
    ShareDesktop();
    context.AddUnSharedWindow(2);
    WalkOver({Window(1, OTHER_APP, {0, 0, 50, 50}), Window(2, OTHER_APP, LEFT_RECT, DockLevel())});
    EXPECT_EQ(Overlap(), (Rects{{0, 0, 50, 50}}));
    EXPECT_EQ(Excluded(), (Values{2}));
}

TEST_F(WindowWalk, OfADesktopWithoutDisplaysPublishesNothing) {
    ReserveEdges(0, 0, 0, 20);
    WalkOver({Window(1, OTHER_APP, {0, 0, 50, 50}), Window(2, OTHER_APP, LEFT_RECT, DockLevel())});
    EXPECT_EQ(Applications(), (Rects{LEFT_RECT})) << "the Dock keeps its frame";
    EXPECT_TRUE(Visible().empty());
    EXPECT_TRUE(SharedWindows().empty());
    EXPECT_EQ(Captured(), (Values{2, 1}));
}

TEST_F(WindowWalk, OfADesktopHidesBehindTheWindowsOfUnsharedApplications) {
    ShareDesktop();
    context.AddUnSharedApp(OTHER_APP);
    WalkOver({Window(1, SHARED_APP, LEFT_RECT, DesktopLevel()), Window(2, OTHER_APP, {10, 10, 50, 50})});
    EXPECT_EQ(Captured(), (Values{1}));
    EXPECT_EQ(Excluded(), (Values{2}));
    EXPECT_EQ(Overlap(), (Rects{{10, 10, 50, 50}}));
}

// ---- Docks and the desktop's own windows in other shares

TEST_F(WindowWalk, PassesOverTheDockAndWindowsBelowTheNormalLevel) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 9, 9}, DesktopLevel()), Window(2, SHARED_APP, {20, 0, 29, 9}, -1),
              Window(3, SHARED_APP, {40, 0, 49, 9}, DockLevel()),
              Window(4, OTHER_APP, {0, 0, 200, 120}, DockLevel()),
              Window(5, SHARED_APP, {60, 0, 69, 9}, DockLevel() + 1)});
    EXPECT_EQ(Captured(), (Values{5}));
    EXPECT_TRUE(Excluded().empty());
    EXPECT_EQ(Visible(), (Rects{{60, 0, 69, 9}}));
}

TEST_F(WindowWalk, TakesTheDockOutOfAWindowShareToo) {
    ReserveEdges(0, 10, 30, 0);
    ShareDesktop();
    context.SetShareType(SHARE_TYPE_WINDOW);
    context.AddSharedWindow(1);
    WalkOver({Window(1, OTHER_APP, {100, 0, 200, 50})});
    EXPECT_EQ(Overlap(), (Rects{{170, 10, 200, 50}}));
    EXPECT_EQ(Visible(), (Rects{{100, 0, 200, 10}, {100, 10, 170, 50}}));
}

TEST_F(WindowWalk, TakesOutTheDocksOfSharedDisplaysOnly) {
    ReserveEdges(0, 0, 0, 20);
    EXPECT_EQ(context.AddSharedDisplay(RIGHT), 0);
    context.AddSharedApp(SHARED_APP);
    WalkOver({Window(1, SHARED_APP, {150, 50, 250, 120})});
    EXPECT_TRUE(Overlap().empty());
    EXPECT_EQ(Visible(), (Rects{{200, 50, 250, 120}}));
    EXPECT_EQ(context.AddSharedDisplay(LEFT), 0);
    Walk();
    EXPECT_EQ(Overlap(), (Rects{{150, 100, 200, 120}}));
}

TEST_F(WindowWalk, TakesNothingOutForADockThatIsHidden) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, LEFT_RECT)});
    EXPECT_TRUE(Overlap().empty());
    EXPECT_EQ(Visible(), (Rects{LEFT_RECT}));
}
