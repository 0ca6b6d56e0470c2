// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"

#include <gtest/gtest.h>

#include <vector>

/// What the walk finds of windows that a picture of their display would show and that are not kept.

namespace {

class ExposedByTheWalk : public WindowWalk {
protected:
    ExposedByTheWalk() { context.m_bFindsExposed = true; }

    Rects Exposed() { return RegionGot(context, &ShareCapturerContext::GetExposedRegion); }
};

} // namespace

TEST_F(ExposedByTheWalk, IsNothingUnlessItIsWanted) {
    context.m_bFindsExposed = false;
    ShareApp();
    WalkOver({Window(1, OTHER_APP, {10, 10, 50, 50}), Window(2, OTHER_APP, {0, 100, 200, 120}, DockLevel())});
    EXPECT_EQ(Exposed(), Rects{});
}

TEST_F(ExposedByTheWalk, IsEachWindowThatIsNotKeptLessTheKeptOnesInFront) {
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {0, 0, 90, 90}), Window(2, OTHER_APP, {10, 10, 50, 50}),
              Window(3, SHARED_APP, {30, 0, 90, 90}), Window(4, OTHER_APP, {60, 50, 70, 60})});
    EXPECT_EQ(Exposed(), (Rects{{10, 10, 30, 50}, {60, 50, 70, 60}}));
}

TEST_F(ExposedByTheWalk, HoldsTheDockAndTheDesktopsOwnWindowsInAShareOfAnApplication) {
    ShareApp();
    WalkOver({Window(1, OTHER_APP, {0, 0, 20, 20}, DesktopLevel()), Window(2, SHARED_APP, {0, 0, 20, 10}),
              Window(3, OTHER_APP, {0, 100, 200, 120}, DockLevel())});
    EXPECT_EQ(Exposed(), (Rects{{0, 10, 20, 20}, {0, 100, 200, 120}}));
}

TEST_F(ExposedByTheWalk, LeavesOutWhatIsWhollyTransparent) {
    ShareApp();
    WalkOver(
        {Window(1, OTHER_APP, {10, 10, 50, 50}, 0, 0.0F), Window(2, OTHER_APP, {60, 10, 90, 50}, 0, 0.1F)});
    EXPECT_EQ(Exposed(), (Rects{{60, 10, 90, 50}}));
}

TEST_F(ExposedByTheWalk, IsNotCoveredByAKeptWindowThatGivesNoPixels) {
    ShareApp();
    platform::WindowInfo withheld = Window(2, SHARED_APP, {10, 10, 30, 50});
    withheld.sharing = platform::SharingState::None;
    WalkOver({Window(1, OTHER_APP, {10, 10, 50, 50}), withheld});
    EXPECT_EQ(Exposed(), (Rects{{10, 10, 50, 50}}));
}

TEST_F(ExposedByTheWalk, IsCoveredByATranslucentWindowOfASharedApplication) {
    ShareApp();
    WalkOver({Window(1, OTHER_APP, {10, 10, 50, 50}), Window(2, SHARED_APP, {10, 10, 30, 50}, 0, 0.5F)});
    EXPECT_EQ(Exposed(), (Rects{{30, 10, 50, 50}}));
}

TEST_F(ExposedByTheWalk, IsCoveredByOpaqueWindowsAloneInAShareOfADesktop) {
    ShareDesktop();
    context.AddUnSharedWindow(1);
    WalkOver({Window(1, OTHER_APP, {10, 10, 50, 50}), Window(2, OTHER_APP, {10, 10, 30, 50}, 0, 0.9F),
              Window(3, OTHER_APP, {40, 10, 50, 50})});
    EXPECT_EQ(Exposed(), (Rects{{10, 10, 40, 50}}));
}

TEST_F(ExposedByTheWalk, EndsAtTheEdgesOfTheSharedDisplays) {
    ShareApp();
    WalkOver({Window(1, OTHER_APP, {150, 20, 250, 60})});
    EXPECT_EQ(Exposed(), (Rects{{150, 20, 200, 60}}));
}

TEST_F(ExposedByTheWalk, IsFoundAnewByEachWalk) {
    ShareApp();
    WalkOver({Window(1, OTHER_APP, {10, 10, 50, 50})});
    WalkOver({Window(2, OTHER_APP, {60, 10, 90, 50})});
    EXPECT_EQ(Exposed(), (Rects{{60, 10, 90, 50}}));
}
