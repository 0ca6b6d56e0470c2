// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_util_mac.h"

#include "src/share_util.h"
#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <limits>
#include <string>
#include <utility>
#include <vector>

/// Rectangles between the platform and the library, and what the window server is asked about windows and
/// displays.

namespace {

using platform::CGRect;

constexpr float NOT_A_NUMBER = std::numeric_limits<float>::quiet_NaN();
constexpr int LOWEST = std::numeric_limits<int>::min();
constexpr int HIGHEST = std::numeric_limits<int>::max();

constexpr unsigned LEFT = CDesktopScope::LEFT;
constexpr unsigned RIGHT = CDesktopScope::RIGHT;
constexpr pid_t OWNER = 500;
constexpr unsigned NO_PROCESS = 0x80000000u;

platform::DisplayInfo DisplayWith(unsigned id, const CGRect& bounds, const CGRect& visible) {
    platform::DisplayInfo display = FakeDisplay(id, bounds);
    display.visibleBounds = visible;
    return display;
}

std::vector<platform::WindowInfo> SomeWindows(int count) {
    std::vector<platform::WindowInfo> windows;
    for (int i = 1; i <= count; ++i)
        windows.push_back(FakeWindow(static_cast<unsigned>(i), OWNER, {{0, 0}, {1, 1}}));
    return windows;
}

std::vector<int> NumbersTo(int last) {
    std::vector<int> numbers;
    for (int i = 1; i <= last; ++i)
        numbers.push_back(i);
    return numbers;
}

class ShareUtilMacWindows : public testing::Test {
protected:
    std::vector<int> ListedWindows(std::vector<int> before = {}) const {
        const int count = ShareUtilMac::GetOnScreenWindowList(before);
        EXPECT_EQ(static_cast<std::size_t>(count), before.size());
        return before;
    }
    /// Windows come up while the list is asked for: each look finds `step` more.
    void LetWindowsComeUp(int step) {
        desktop->SetHook([this, step] { desktop->SetWindows(SomeWindows(m_windows += step)); });
    }

    CDesktopScope desktop;

private:
    int m_windows = 0;
};

} // namespace

TEST(ShareUtilMac, AddsTheSizeToTheCutOrigin) {
    EXPECT_EQ(ShareUtilMac::CGRectToTVLRect({{1.9F, 2.9F}, {10.9F, 20.05F}}), (TVLRect{1, 2, 11, 22}));
    EXPECT_EQ(ShareUtilMac::CGRectToTVLRect({{-1.9F, -0.9F}, {1.5F, 0.5F}}), (TVLRect{-1, 0, 0, 0}));
    EXPECT_EQ(ShareUtilMac::CGRectToTVLRect({{NOT_A_NUMBER, 1e30F}, {5, -1e31F}}),
              (TVLRect{0, HIGHEST, 5, LOWEST}));
}

TEST(ShareUtilMac, TurnsEdgesIntoASize) {
    EXPECT_EQ(ShareUtilMac::TVLRectToCGRect({-3, 4, 10, 6}), (CGRect{{-3, 4}, {13, 2}}));
    EXPECT_EQ(ShareUtilMac::TVLRectToCGRect({LOWEST, 0, HIGHEST, 0}).size.width, -1.0F)
        << "as 32 bits make it";
}

TEST(ShareUtilMac, ComparesARectangleWithWhatAnotherIsCutTo) {
    const CGRect rect{{1.9F, 2.9F}, {10.9F, 20.05F}};
    EXPECT_TRUE(ShareUtilMac::RectIsEqual({1, 2, 11, 22}, rect));
    for (const TVLRect& other :
         {TVLRect{2, 2, 11, 22}, TVLRect{1, 3, 11, 22}, TVLRect{1, 2, 12, 22}, TVLRect{1, 2, 11, 23}})
        EXPECT_FALSE(ShareUtilMac::RectIsEqual(other, rect));
}

TEST(ShareUtilMac, WritesARectangleWithSixSignificantDigits) {
    EXPECT_EQ(ShareUtilMac::CGRectToString({{0, -1.5F}, {1234567, 0.0000125F}}),
              "{x=0 y=-1.5 w=1.23457e+06 h=1.25e-05}");
    const float longest = -std::numeric_limits<float>::min();
    EXPECT_EQ(ShareUtilMac::CGRectToString({{longest, longest}, {longest, longest}}),
              "{x=-1.17549e-38 y=-1.17549e-38 w=-1.17549e-38 h=-1.17549e-38}");
}

TEST(ShareUtilMac, TakesAColourApart) {
    float red = -1;
    float green = -1;
    float blue = -1;
    ShareUtilMac::GetRGBfromInt(0x10FF8040, red, green, blue);
    EXPECT_EQ(red, 1.0F);
    EXPECT_EQ(green, static_cast<float>(0x80 / 255.0));
    EXPECT_EQ(blue, static_cast<float>(0x40 / 255.0));
    ShareUtilMac::GetRGBfromInt(-1, red, green, blue);
    EXPECT_EQ(red, 1.0F);
    EXPECT_EQ(green, 1.0F);
    EXPECT_EQ(blue, 1.0F);
}

TEST(ShareUtil, MultipliesAsThirtyTwoBitsDo) {
    EXPECT_EQ(ShareUtil::Area({10, 20, 13, 25}), 15);
    EXPECT_EQ(ShareUtil::Area({0, 0, 65536, 32768}), LOWEST);
    EXPECT_EQ(ShareUtil::Area({0, 0, 65536, 65536}), 0);
    EXPECT_EQ(ShareUtil::Area({LOWEST, LOWEST, HIGHEST, HIGHEST}), 1);
}

TEST(ShareUtil, FindsNothingCommonWhereRectanglesOnlyTouch) {
    const TVLRect rect{0, 0, 10, 10};
    EXPECT_EQ(ShareUtil::Intersect(rect, {5, -5, 15, 5}), (TVLRect{5, 0, 10, 5}));
    EXPECT_EQ(ShareUtil::Intersect({5, -5, 15, 5}, rect), (TVLRect{5, 0, 10, 5}));
    EXPECT_EQ(ShareUtil::Intersect(rect, rect), rect);
    for (const TVLRect& other :
         {TVLRect{10, 0, 20, 10}, TVLRect{0, 10, 10, 20}, TVLRect{11, 0, 20, 10}, TVLRect{5, 5, 5, 9}})
        EXPECT_EQ(ShareUtil::Intersect(rect, other), (TVLRect{0, 0, 0, 0}));
}

TEST(ShareUtil, KnowsItsOwnProcess) {
    EXPECT_EQ(ShareUtil::GetCurrentPID(), static_cast<unsigned>(getpid()));
}

TEST_F(ShareUtilMacWindows, NamesTheProcessOfAWindow) {
    desktop->SetWindows({FakeWindow(7, OWNER, {}), FakeWindow(8, 0, {})});
    EXPECT_EQ(ShareUtil::GetPIDOfWindowHandle(7), static_cast<unsigned>(OWNER));
    EXPECT_EQ(ShareUtil::GetPIDOfWindowHandle(8), NO_PROCESS) << "of an unknown owner";
    EXPECT_EQ(ShareUtil::GetPIDOfWindowHandle(9), NO_PROCESS) << "not there";
    desktop->SetLife(platform::Life::Lost);
    EXPECT_EQ(ShareUtil::GetPIDOfWindowHandle(7), NO_PROCESS);
}

TEST_F(ShareUtilMacWindows, GivesTheFrameOfAWindow) {
    desktop->SetWindows({FakeWindow(7, OWNER, {{1.9F, -2.9F}, {10.9F, 20}})});
    TVLRect rect{9, 9, 9, 9};
    ShareUtil::GetWindowRect(7, rect);
    EXPECT_EQ(rect, (TVLRect{1, -2, 11, 18}));
    ShareUtil::GetWindowRect(8, rect);
    EXPECT_EQ(rect, (TVLRect{0, 0, 0, 0}));
}

TEST_F(ShareUtilMacWindows, ListsTheWindowsOnScreenFrontFirst) {
    std::vector<platform::WindowInfo> windows = SomeWindows(3);
    windows[1].onScreen = false;
    desktop->SetWindows(std::move(windows));
    const CTraceLog trace;
    EXPECT_EQ(ListedWindows({9, 9, 9, 9, 9}), (std::vector<int>{1, 3}));
    desktop->SetWindows({});
    EXPECT_EQ(ListedWindows({9}), std::vector<int>{});
    desktop->SetWindows({FakeWindow(0xFFFFFFFEu, OWNER, {})});
    EXPECT_EQ(ListedWindows(), std::vector<int>{-2}) << "ids are 32 bits, whatever their sign";
    EXPECT_EQ(trace.Lines(), std::vector<std::string>{});
}

TEST_F(ShareUtilMacWindows, ListsNothingWhenTheServerIsLost) {
    desktop->SetWindows(SomeWindows(3));
    desktop->SetLife(platform::Life::Lost);
    EXPECT_EQ(ListedWindows({9}), std::vector<int>{});
}

TEST_F(ShareUtilMacWindows, HasRoomForEightWindowsThatComeUpMeanwhile) {
    const CTraceLog trace;
    LetWindowsComeUp(8);
    EXPECT_EQ(ListedWindows(), NumbersTo(16));
    EXPECT_EQ(desktop->calls.windows, 2) << "counted once, listed once";
    EXPECT_EQ(trace.Lines(), std::vector<std::string>{});
}

TEST_F(ShareUtilMacWindows, AsksOnceMoreWhenMoreCameUp) {
    const CTraceLog trace;
    desktop->SetHook([this] { desktop->SetWindows(SomeWindows(desktop->calls.windows == 0 ? 1 : 30)); });
    EXPECT_EQ(ListedWindows(), NumbersTo(30));
    EXPECT_EQ(desktop->calls.windows, 3);
    EXPECT_EQ(trace.Lines(), std::vector<std::string>{});
}

TEST_F(ShareUtilMacWindows, WarnsWhenTheyKeepComingUpAndTakesTheFrontOnes) {
    const CTraceLog trace;
    LetWindowsComeUp(10);
    // 10 were counted, 20 found instead of 18, then 30 instead of 28.
    EXPECT_EQ(ListedWindows(), NumbersTo(28));
    const std::vector<std::string> lines = trace.Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0],
                         Warning("GetOnScreenWindowList incorrect windows list count, windowCount=28"
                                 ", windowCountRead=30"),
                         "src/mac/share_util_mac"));
}

TEST_F(ShareUtilMacWindows, ListsNothingWhenTheServerGetsLostBetweenTheTwoQuestions) {
    desktop->SetHook([this] {
        const int calls = desktop->calls.windows;
        desktop->SetWindows(SomeWindows(calls == 0 ? 1 : 30));
        if (calls == 2)
            desktop->SetLife(platform::Life::Lost);
    });
    EXPECT_EQ(ListedWindows(), std::vector<int>{}) << "and no window 0";
}

TEST_F(ShareUtilMacWindows, SkipsWindowsOfTheDesktopAndThoseOfUnknownLevel) {
    desktop->SetWindows(
        {FakeWindow(1, OWNER, {}, -1), FakeWindow(2, OWNER, {}, 0), FakeWindow(3, OWNER, {}, 20)});
    EXPECT_TRUE(ShareUtilMac::need_skip_window(1));
    EXPECT_FALSE(ShareUtilMac::need_skip_window(2));
    EXPECT_FALSE(ShareUtilMac::need_skip_window(3));
    EXPECT_TRUE(ShareUtilMac::need_skip_window(4)) << "not there";
    EXPECT_TRUE(ShareUtilMac::need_skip_window(2, -1)) << "the level that was given counts";
    EXPECT_FALSE(ShareUtilMac::need_skip_window(1, 0));
}

TEST_F(ShareUtilMacWindows, FindsTheEdgeOfTheMenuBar) {
    desktop->SetDisplays({DisplayWith(LEFT, {{0, 0}, {200, 120}}, {{0, 24}, {200, 80}})});
    // From the bottom the visible frame begins at 16.
    EXPECT_EQ(ShareUtilMac::GetMenuBarRect(LEFT), (CGRect{{0, 0}, {200, 24}}));
    EXPECT_EQ(ShareUtilMac::GetMenuBarRect(RIGHT), CGRect{});
}

TEST_F(ShareUtilMacWindows, FindsTheDockAtWhicheverEdgeItIs) {
    const CGRect bounds{{200, -30}, {300, 200}};
    const auto dockWith = [&](const CGRect& visible) {
        desktop->SetDisplays({FakeDisplay(LEFT, {{0, 0}, {200, 120}}), DisplayWith(RIGHT, bounds, visible)});
        return ShareUtilMac::GetDockBarRect(RIGHT);
    };
    EXPECT_EQ(dockWith({{200, -10}, {260, 180}}), (CGRect{{460, -10}, {40, 180}})) << "right";
    EXPECT_EQ(dockWith({{240, -10}, {260, 180}}), (CGRect{{200, -10}, {40, 180}})) << "left";
    EXPECT_EQ(dockWith({{200, -10}, {300, 130}}), (CGRect{{200, 120}, {300, 50}})) << "bottom";
    EXPECT_EQ(dockWith({{200, -10}, {300, 180}}), (CGRect{{200, 170}, {300, 0}})) << "hidden";
    EXPECT_EQ(ShareUtilMac::GetDockBarRect(99), CGRect{});
}

TEST_F(ShareUtilMacWindows, ListsWhereTheDisplaysLie) {
    const std::vector<ShareDisplayPlace> displays = ListDisplayPlaces();
    ASSERT_EQ(displays.size(), 2u);
    EXPECT_EQ(displays[0].id, LEFT);
    EXPECT_EQ(displays[0].rect, (TVLRect{0, 0, 200, 120}));
    EXPECT_EQ(displays[1].id, RIGHT);
    EXPECT_EQ(displays[1].rect, (TVLRect{200, 0, 400, 120}));
    desktop->SetDisplays({});
    EXPECT_TRUE(ListDisplayPlaces().empty());
}

TEST_F(ShareUtilMacWindows, FindsTheDisplayThatHasMostOfAWindow) {
    const auto displayOf = [this](const CGRect& frame) {
        desktop->SetWindows({FakeWindow(7, OWNER, frame)});
        return ShareUtil::GetWindowDisplayID(7);
    };
    EXPECT_EQ(displayOf({{0, 0}, {100, 100}}), LEFT);
    EXPECT_EQ(displayOf({{199, 0}, {100, 100}}), RIGHT);
    EXPECT_EQ(displayOf({{150, 0}, {100, 100}}), LEFT) << "of equal pieces the first display's";
    EXPECT_EQ(displayOf({{149, 0}, {104, 100}}), RIGHT);
    EXPECT_EQ(displayOf({{400, 0}, {100, 100}}), LEFT) << "on none: the main display";
    EXPECT_EQ(displayOf({{300, 0}, {0, 100}}), LEFT) << "nothing to see of it";
    EXPECT_EQ(ShareUtil::GetWindowDisplayID(8), LEFT) << "not there";
    desktop->SetDisplays({});
    EXPECT_EQ(displayOf({{0, 0}, {100, 100}}), 0u);
}

TEST_F(ShareUtilMacWindows, FindsTheDisplayOfTheLargestPieceOfAnyOneWindow) {
    desktop->SetWindows({
        FakeWindow(1, OWNER, {{0, 0}, {60, 100}}),
        FakeWindow(2, OWNER, {{60, 0}, {60, 100}}),
        FakeWindow(3, OWNER + 1, {{0, 0}, {200, 120}}),
        FakeWindow(4, OWNER, {{190, 0}, {90, 100}}),
        FakeWindow(5, 0, {{0, 0}, {200, 120}}),
    });
    const auto pid = static_cast<unsigned>(OWNER);
    EXPECT_EQ(ShareUtil::GetAppDisplayID(pid), RIGHT) << "pieces of several windows are not added";
    EXPECT_EQ(ShareUtil::GetAppDisplayID(pid + 1), LEFT);
    EXPECT_EQ(ShareUtil::GetAppDisplayID(pid + 2), LEFT) << "no such process: the main display";
    EXPECT_EQ(ShareUtil::GetAppDisplayID(NO_PROCESS), LEFT) << "windows of nobody are not its";
}

TEST_F(ShareUtilMacWindows, TakesTheDisplayWithTheLowestIdOfEqualPieces) {
    desktop->SetDisplays({FakeDisplay(9, {{0, 0}, {200, 120}}), FakeDisplay(3, {{200, 0}, {200, 120}})});
    desktop->SetWindows({FakeWindow(1, OWNER, {{150, 0}, {100, 100}})});
    EXPECT_EQ(ShareUtil::GetAppDisplayID(static_cast<unsigned>(OWNER)), 3u);
    EXPECT_EQ(ShareUtil::GetWindowDisplayID(1), 9u) << "unlike a window's, which goes by the displays' order";
}

TEST_F(ShareUtilMacWindows, AsksForNoWindowWhenThereIsNoChoiceOfDisplays) {
    desktop->SetDisplays({FakeDisplay(5, {{0, 0}, {200, 120}})});
    EXPECT_EQ(ShareUtil::GetAppDisplayID(static_cast<unsigned>(OWNER)), 5u);
    desktop->SetDisplays({});
    EXPECT_EQ(ShareUtil::GetAppDisplayID(static_cast<unsigned>(OWNER)), 0u);
    EXPECT_EQ(desktop->calls.windows, 0);
}

TEST_F(ShareUtilMacWindows, NamesTheMainDisplayForAProcessWithNoWindowOnAnyDisplay) {
    desktop->SetApplications({FakeApplication(OWNER, "editor")});
    EXPECT_EQ(ShareUtil::GetAppDisplayID(static_cast<unsigned>(OWNER)), LEFT);
    desktop->SetWindows({FakeWindow(1, OWNER, {{1000, 0}, {100, 100}})});
    EXPECT_EQ(ShareUtil::GetAppDisplayID(static_cast<unsigned>(OWNER)), LEFT);
}
