// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/window_levels.h"

#include "platform/core_graphics.h"

#include <gtest/gtest.h>

#include <vector>

namespace {

using namespace platform::x11;
using platform::CGRect;
using platform::DisplayInfo;
using platform::DisplayList;
using Levels = std::vector<int>;

constexpr CGRect ANYWHERE{{300, 300}, {200, 100}};
const int NORMAL = platform::CGWindowLevelForKey(platform::kCGNormalWindowLevelKey);
const int DOCK = platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey);
const int MENU_BAR = platform::CGWindowLevelForKey(platform::kCGMainMenuWindowLevelKey);
const int ICONS = platform::CGWindowLevelForKey(platform::kCGDesktopIconWindowLevelKey);
const int PICTURE = platform::CGWindowLevelForKey(platform::kCGDesktopWindowLevelKey);

DisplayInfo Display(const CGRect& bounds, const CGRect& visible) {
    DisplayInfo display;
    display.bounds = bounds;
    display.visibleBounds = visible;
    return display;
}

DisplayList OneDisplay(const CGRect& visible) {
    return {Display({{0, 0}, {1000, 800}}, visible)};
}

LevelInput Window(WindowType type, const CGRect& frame = ANYWHERE) {
    LevelInput window;
    window.type = type;
    window.frame = frame;
    return window;
}

LevelInput Background() {
    LevelInput window = Window(WindowType::Desktop);
    window.isBackground = true;
    return window;
}

int LevelOfDock(const CGRect& frame, const DisplayList& displays) {
    return LevelsOf({Window(WindowType::Dock, frame)}, displays).front();
}

TEST(LevelsOf, FollowsTheTypes) {
    LevelInput bare = Window(WindowType::Unset);
    bare.overrideRedirect = true;
    LevelInput above = Window(WindowType::Normal);
    above.above = true;
    EXPECT_EQ(LevelsOf({Window(WindowType::Tip), Window(WindowType::Menu), bare, above,
                        Window(WindowType::Normal), Window(WindowType::Unset)},
                       {}),
              (Levels{102, 101, 101, 3, 0, 0}));
}

TEST(LevelsOf, PutsTheDesktopBelowAllOnlyWhileNothingElseLiesBelowIt) {
    EXPECT_EQ(LevelsOf({Window(WindowType::Normal), Window(WindowType::Desktop), Window(WindowType::Desktop),
                        Background()},
                       {}),
              (Levels{NORMAL, ICONS, ICONS, PICTURE}));
    EXPECT_EQ(
        LevelsOf({Window(WindowType::Desktop), Window(WindowType::Normal), Window(WindowType::Desktop)}, {}),
        (Levels{NORMAL, NORMAL, ICONS}));
    EXPECT_LT(ICONS, 0);
    EXPECT_LT(PICTURE, ICONS);
}

TEST(LevelsOf, LetsWhatNobodySeesLieBelowTheDesktop) {
    LevelInput minimised = Window(WindowType::Normal);
    minimised.onScreen = false;
    EXPECT_EQ(LevelsOf({Window(WindowType::Desktop), minimised}, {}), (Levels{ICONS, NORMAL}));
}

TEST(LevelsOf, KnowsADockInsideTheReservedBottomEdge) {
    const DisplayList displays = OneDisplay({{0, 0}, {1000, 760}});
    EXPECT_EQ(LevelOfDock({{0, 760}, {1000, 40}}, displays), DOCK);
    EXPECT_EQ(LevelOfDock({{300, 770}, {400, 30}}, displays), DOCK);
    EXPECT_EQ(LevelOfDock({{300, 759}, {400, 41}}, displays), 25) << "it covers more than the edge";
    EXPECT_EQ(LevelOfDock({{0, 790}, {1000, 40}}, displays), DOCK) << "what isn't seen covers nothing";
    EXPECT_EQ(LevelOfDock({{0, 800}, {1000, 40}}, displays), 25) << "outside";
    EXPECT_EQ(LevelOfDock({{300, 770}, {0, 0}}, displays), 25);
    EXPECT_EQ(LevelOfDock({{0, 760}, {1000, 40}}, OneDisplay({{0, 0}, {1000, 800}})), 25)
        << "nothing is reserved";
}

TEST(LevelsOf, KnowsADockInsideAReservedSide) {
    EXPECT_EQ(LevelOfDock({{0, 0}, {60, 800}}, OneDisplay({{60, 0}, {940, 800}})), DOCK);
    EXPECT_EQ(LevelOfDock({{940, 0}, {60, 800}}, OneDisplay({{0, 0}, {940, 800}})), DOCK);
    EXPECT_EQ(LevelOfDock({{0, 760}, {1000, 40}}, OneDisplay({{60, 0}, {940, 760}})), 25)
        << "the side is the Dock's edge";
    EXPECT_EQ(LevelOfDock({{0, 0}, {60, 800}}, OneDisplay({{60, 0}, {880, 800}})), 25)
        << "with both sides reserved there is no one edge";
}

TEST(LevelsOf, AsksEveryDisplayThatShowsADock) {
    const DisplayList displays = {Display({{0, 0}, {1000, 800}}, {{0, 0}, {1000, 760}}),
                                  Display({{1000, 0}, {1000, 800}}, {{1000, 0}, {1000, 800}})};
    EXPECT_EQ(LevelOfDock({{100, 760}, {400, 40}}, displays), DOCK);
    EXPECT_EQ(LevelOfDock({{900, 760}, {400, 40}}, displays), 25);
}

TEST(LevelsOf, KnowsABarThatFillsATopEdge) {
    const DisplayList displays = {Display({{0, 0}, {1000, 800}}, {{0, 30}, {1000, 770}}),
                                  Display({{1000, 0}, {500, 800}}, {{1000, 0}, {500, 800}})};
    EXPECT_EQ(LevelOfDock({{0, 0}, {1000, 30}}, displays), MENU_BAR);
    EXPECT_EQ(LevelOfDock({{1000, 0}, {500, 30}}, displays), MENU_BAR);
    EXPECT_EQ(LevelOfDock({{0, 0}, {1500, 30}}, displays), 25);
    EXPECT_EQ(LevelOfDock({{100, 0}, {800, 30}}, displays), 25);
    EXPECT_EQ(LevelOfDock({{0, 0}, {1000, 800}}, displays), 25) << "a bar is no curtain";
}

} // namespace
