// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <iterator>
#include <map>
#include <ostream>
#include <random>
#include <string>
#include <vector>

/// Verdicts on windows and applications, and what a walk publishes.

namespace {

using Lines = std::vector<std::string>;
using DisplayRects = std::map<unsigned, TVLRect>;

constexpr unsigned LEFT = CDesktopScope::LEFT;
constexpr unsigned RIGHT = CDesktopScope::RIGHT;
constexpr unsigned WINDOW = 11;
constexpr unsigned OWNER = 500;
constexpr unsigned NOBODYS_WINDOW = 12;
constexpr unsigned UNKNOWN_WINDOW = 13;

class ShareCapturerContextWalk : public testing::Test {
protected:
    ShareCapturerContextWalk() {
        desktop->SetWindows({FakeWindow(WINDOW, OWNER, {{10, 10}, {50, 50}}),
                             FakeWindow(NOBODYS_WINDOW, 0, {{10, 10}, {50, 50}})});
    }
    ~ShareCapturerContextWalk() override {
        AppShareConfig::Instance()->m_nShareConfigFlags = 0u;
        AppShareConfig::Instance()->m_bAppDisplayByWindow = true;
    }

    void Publish(const Values& displays, const Values& windows) {
        context.m_vAppDisplays = displays;
        context.m_vCapturedWindows = windows;
    }
    Values CapturedAfter(const Values& before) const {
        return Got(context, &ShareCapturerContext::GetCapturedWindows, before);
    }

    /// The displays that an application share with these windows lies on.
    Values DisplaysOf(const Rects& windows) {
        context.SetShareType(SHARE_TYPE_APP);
        context.m_paramSet.reset();
        for (const TVLRect& window : windows)
            context.m_paramSet.rgnApplications.AddRect(window);
        context._UpdateAppsDisplay(context.m_paramSet, CContextProbe::AppDisplayRule::InForce());
        return context.m_paramSet.vAppDisplays;
    }
    Values DisplaysByArea(const Rects& windows) {
        AppShareConfig::Instance()->m_bAppDisplayByWindow = false;
        return DisplaysOf(windows);
    }

    CDesktopScope desktop;
    CContextProbe context;
};

/// Where a window and its owner stand, and what follows for a share of some type.
struct VerdictCase {
    SHARE_TYPE type;
    bool isWindowShared;
    bool isWindowUnShared;
    bool isAppShared;
    bool isAppUnShared;
    bool isSystemProcess;
    // Expected.
    bool appShared;
    bool appUnShared;
    bool windowShared;
    bool windowUnShared;
};

void PrintTo(const VerdictCase& one, std::ostream* out) {
    *out << "type " << one.type << ", window " << one.isWindowShared << one.isWindowUnShared
         << ", application " << one.isAppShared << one.isAppUnShared << ", system " << one.isSystemProcess;
}

constexpr auto DESKTOP = SHARE_TYPE_DESKTOP;
constexpr auto APP = SHARE_TYPE_APP;
constexpr auto WIN = SHARE_TYPE_WINDOW;

const VerdictCase VERDICTS[] = {
    // A desktop share shows what isn't kept out.
    {DESKTOP, 0, 0, 0, 0, 0, true, false, true, false},
    {DESKTOP, 0, 0, 1, 0, 0, true, false, true, false},
    {DESKTOP, 0, 0, 0, 1, 0, false, true, false, true},
    {DESKTOP, 0, 0, 1, 1, 0, false, true, false, true},
    {DESKTOP, 0, 0, 0, 0, 1, false, true, false, true},
    {DESKTOP, 0, 1, 0, 0, 0, true, false, false, true},
    {DESKTOP, 1, 0, 0, 1, 0, false, true, true, true},
    {DESKTOP, 1, 0, 0, 0, 1, false, true, true, true},
    {DESKTOP, 1, 1, 0, 0, 0, true, false, false, true},
    // The others show what is shared.
    {APP, 0, 0, 0, 0, 0, false, false, false, true},
    {APP, 0, 0, 1, 0, 0, true, false, true, false},
    {APP, 0, 0, 1, 1, 0, true, true, true, true},
    {APP, 0, 0, 1, 0, 1, true, true, true, true},
    {APP, 0, 1, 1, 0, 0, true, false, false, true},
    {APP, 1, 0, 0, 0, 0, false, false, true, true},
    {APP, 1, 1, 1, 0, 0, true, false, false, true},
    {WIN, 0, 0, 0, 0, 0, false, false, false, true},
    {WIN, 0, 0, 1, 0, 0, true, false, true, false},
    {WIN, 1, 0, 0, 0, 0, false, false, true, true},
    {WIN, 1, 1, 0, 0, 0, false, false, false, true},
};

} // namespace

TEST_F(ShareCapturerContextWalk, JudgesAWindowByItsOwnListsBeforeThoseOfItsApplication) {
    for (const VerdictCase& one : VERDICTS) {
        SCOPED_TRACE(testing::PrintToString(one));
        CContextProbe judge;
        judge.m_vSharedWindows = Values(one.isWindowShared, WINDOW);
        judge.m_vUnSharedWindows = Values(one.isWindowUnShared, WINDOW);
        judge.m_vSharedApps = Values(one.isAppShared, OWNER);
        judge.m_vUnSharedApps = Values(one.isAppUnShared, OWNER);
        judge.systemProcess = one.isSystemProcess ? OWNER : OWNER + 1;
        judge.SetShareType(one.type);
        EXPECT_EQ(judge.IsAppShared(OWNER), one.appShared);
        EXPECT_EQ(judge._IsAppShared(OWNER), one.appShared);
        EXPECT_EQ(judge.IsAppUnShared(OWNER), one.appUnShared);
        EXPECT_EQ(judge._IsAppUnShared(OWNER), one.appUnShared);
        EXPECT_EQ(judge.IsWindowShared(WINDOW), one.windowShared);
        EXPECT_EQ(judge.__IsWindowShared(WINDOW), one.windowShared);
        EXPECT_EQ(judge.IsWindowUnShared(WINDOW), one.windowUnShared);
        EXPECT_EQ(judge._IsWindowUnShared(WINDOW), one.isWindowUnShared);
    }
}

TEST_F(ShareCapturerContextWalk, TakesAWindowWithoutAnOwnerForOneOfTheProcessThatIsNone) {
    for (const unsigned window : {NOBODYS_WINDOW, UNKNOWN_WINDOW}) {
        context.SetShareType(SHARE_TYPE_DESKTOP);
        EXPECT_TRUE(context.IsWindowShared(window));
        EXPECT_FALSE(context.IsWindowUnShared(window));
        context.SetShareType(SHARE_TYPE_APP);
        EXPECT_FALSE(context.IsWindowShared(window));
        EXPECT_TRUE(context.IsWindowUnShared(window));
    }
    context.m_vSharedApps = {0};
    EXPECT_FALSE(context.IsWindowShared(NOBODYS_WINDOW)) << "not one of process 0";
    context.m_vSharedApps = {SHARE_INVALID_PROCESS};
    EXPECT_TRUE(context.IsWindowShared(NOBODYS_WINDOW));
}

TEST_F(ShareCapturerContextWalk, JudgesAListOfWindowsAsItJudgesEachOfThem) {
    constexpr unsigned SECOND = OWNER + 1;
    desktop->SetWindows(
        {FakeWindow(WINDOW, OWNER, {{10, 10}, {50, 50}}), FakeWindow(NOBODYS_WINDOW, 0, {{10, 10}, {50, 50}}),
         FakeWindow(21, SECOND, {{10, 10}, {50, 50}}), FakeWindow(22, OWNER, {{0, 0}, {5, 5}})});
    const std::vector<int> all{22, UNKNOWN_WINDOW, 21, WINDOW, NOBODYS_WINDOW};
    const Values windows{WINDOW, NOBODYS_WINDOW, UNKNOWN_WINDOW, 21, 22};
    const Values owners{OWNER, SECOND, SHARE_INVALID_PROCESS, 0};
    std::mt19937 random(1);
    int kept = 0;
    for (int i = 0; i < 2000; ++i) {
        CContextProbe judge;
        const auto some = [&random](const Values& values) {
            Values chosen;
            std::copy_if(values.begin(), values.end(), std::back_inserter(chosen),
                         [&](unsigned) { return random() % 4 == 0; });
            return chosen;
        };
        judge.m_vSharedWindows = some(windows);
        judge.m_vUnSharedWindows = some(windows);
        judge.m_vSharedApps = some(owners);
        judge.m_vUnSharedApps = some(owners);
        judge.systemProcess = random() % 4 == 0 ? SECOND : OWNER + 9;
        judge.SetShareType(random() % 2 == 0 ? SHARE_TYPE_DESKTOP : SHARE_TYPE_APP);
        desktop->SetLife(random() % 8 == 0 ? platform::Life::Lost : platform::Life::Alive);
        std::vector<int> expected;
        std::copy_if(all.begin(), all.end(), std::back_inserter(expected), [&](int id) {
            const auto window = static_cast<unsigned>(id);
            return judge.IsWindowShared(window) && !judge.MayBeKeptOut(window);
        });
        std::vector<int> left = all;
        judge.KeepShared(left);
        ASSERT_EQ(left, expected) << i;
        kept += static_cast<int>(left.size());
    }
    EXPECT_GT(kept, 1000);
}

TEST_F(ShareCapturerContextWalk, AsksOnceForTheOwnersOfAListOfWindows) {
    std::vector<int> windows{WINDOW, NOBODYS_WINDOW, UNKNOWN_WINDOW};
    context.KeepShared(windows);
    EXPECT_EQ(windows, (std::vector<int>{WINDOW, NOBODYS_WINDOW})) << "whose the last one is can't be told";
    EXPECT_EQ(desktop->calls.windows, 1);
}

TEST_F(ShareCapturerContextWalk, LooksForTheOwnerOnlyWhenTheWindowsListsLeaveItOpen) {
    context.m_vSharedWindows = {WINDOW};
    context.m_vUnSharedWindows = {NOBODYS_WINDOW};
    EXPECT_TRUE(context.IsWindowShared(WINDOW));
    EXPECT_FALSE(context.IsWindowShared(NOBODYS_WINDOW));
    EXPECT_TRUE(context.IsWindowUnShared(NOBODYS_WINDOW));
    EXPECT_EQ(desktop->calls.windows, 0);
    EXPECT_TRUE(context.IsWindowShared(UNKNOWN_WINDOW));
    EXPECT_NE(desktop->calls.windows, 0);
    const int before = desktop->calls.windows;
    EXPECT_FALSE(context.IsWindowUnShared(WINDOW)) << "asks the application of a shared window, too";
    EXPECT_NE(desktop->calls.windows, before);
}

TEST_F(ShareCapturerContextWalk, NeverShowsAWindowThatOneListTakesOverFromTheOther) {
    // First the application is kept out, then only this window of it: at no moment it is to be seen.
    context.AddUnSharedApp(OWNER);
    desktop->SetHook([&] {
        context.AddUnSharedWindow(WINDOW);
        context.RemoveUnSharedApp(OWNER);
    });
    EXPECT_FALSE(context.IsWindowShared(WINDOW));
    context.AddUnSharedApp(OWNER);
    context.RemoveUnSharedWindow(WINDOW);
    EXPECT_TRUE(context.IsWindowUnShared(WINDOW));
}

TEST_F(ShareCapturerContextWalk, LeavesItsListsFreeWhileItAsksThePlatform) {
    Publish({LEFT, RIGHT}, {WINDOW, NOBODYS_WINDOW});
    int asked = 0;
    desktop->SetHook([&] {
        ++asked;
        // Comes back only if no lock is held: it takes both.
        const CCallOnThread other([&context = context, display = static_cast<unsigned>(asked)] {
            context.AddSharedDisplay(display);
            context.AddSharedWindow(1000);
        });
    });
    const auto expectAsked = [&](const char* what) {
        EXPECT_NE(asked, 0) << what;
        asked = 0;
    };
    context.IsWindowShared(WINDOW);
    expectAsked("IsWindowShared");
    context.IsWindowUnShared(WINDOW);
    expectAsked("IsWindowUnShared");
    CapturedAfter({});
    expectAsked("GetCapturedWindows");
    context.m_nTopAppWindow = WINDOW;
    DisplaysOf({{0, 0, 400, 10}});
    expectAsked("_UpdateAppsDisplay");
}

TEST_F(ShareCapturerContextWalk, GivesAllCapturedWindowsOfAShareOnOneDisplay) {
    desktop->SetWindows({FakeWindow(21, OWNER, {{210, 0}, {50, 50}})});
    for (const Values& displays : {Values{}, Values{LEFT}}) {
        Publish(displays, {21, 22, 20});
        EXPECT_EQ(CapturedAfter({1, 2, 3, 4}), (Values{21, 22, 20})) << "replaced";
    }
    Publish({LEFT}, {});
    EXPECT_EQ(CapturedAfter({1}), Values{});
    EXPECT_EQ(desktop->calls.windows, 0) << "nobody asks where they are";
}

TEST_F(ShareCapturerContextWalk, AppendsThoseOnTheMainDisplayOfAShareOnTwo) {
    desktop->SetWindows({
        FakeWindow(21, OWNER, {{210, 0}, {50, 50}}),
        FakeWindow(22, OWNER, {{0, 0}, {50, 50}}),
        FakeWindow(23, OWNER, {{190, 0}, {50, 50}}),
        FakeWindow(24, OWNER, {{150, 0}, {60, 50}}),
    });
    Publish({RIGHT, LEFT}, {24, 23, 22, 21, UNKNOWN_WINDOW});
    EXPECT_EQ(CapturedAfter({9, 21}), (Values{9, 21, 23, 21}));
    Publish({LEFT, RIGHT}, {24, 23, 22, 21, UNKNOWN_WINDOW});
    EXPECT_EQ(CapturedAfter({}), (Values{24, 22, UNKNOWN_WINDOW}))
        << "a window that is gone counts for the main display of the desktop";
}

TEST_F(ShareCapturerContextWalk, ResetsWhatItFoundAndKeepsTheRoomForIt) {
    CContextProbe::ParamSet& found = context.m_paramSet;
    for (TVLRegion* region :
         {&found.rgnOverlap, &found.rgnVisible, &found.rgnSharedWindow, &found.rgnApplications})
        region->AddRect({0, 0, 5, 5});
    for (Values* values : {&found.vCapturedWindows, &found.vCapturedExcludedWindows, &found.vAppDisplays})
        *values = Values(100, 7);
    found.reset();
    for (const TVLRegion* region :
         {&found.rgnOverlap, &found.rgnVisible, &found.rgnSharedWindow, &found.rgnApplications})
        EXPECT_TRUE(region->IsEmpty());
    for (const Values* values :
         {&found.vCapturedWindows, &found.vCapturedExcludedWindows, &found.vAppDisplays}) {
        EXPECT_TRUE(values->empty());
        EXPECT_GE(values->capacity(), 100u);
    }
}

TEST_F(ShareCapturerContextWalk, PublishesWhatItFound) {
    CContextProbe::ParamSet& found = context.m_paramSet;
    found.rgnOverlap.AddRect({0, 0, 1, 1});
    found.rgnVisible.AddRect({0, 0, 2, 2});
    found.rgnSharedWindow.AddRect({0, 0, 3, 3});
    found.rgnApplications.AddRect({0, 0, 4, 4});
    found.vCapturedWindows = {1, 2};
    found.vCapturedExcludedWindows = {3, 4};
    found.vAppDisplays = {5};
    Publish({50}, {10, 20});
    context.m_vCapturedExcludedWindows = {30};
    context._CommitParamSet(found);
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetOverlapRegion), (Rects{{0, 0, 1, 1}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetVisiableRegion), (Rects{{0, 0, 2, 2}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetSharedWindowRegion), (Rects{{0, 0, 3, 3}}));
    EXPECT_EQ(RectsOf(context.m_rgnApplications), (Rects{{0, 0, 4, 4}}));
    EXPECT_EQ(CapturedAfter({}), (Values{1, 2}));
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetCapturedExcludedWindows, {9}), (Values{3, 4}));
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetAppMonitors, {9}), Values{5});
    // The regions were copied; the vectors changed places, so that their memory goes round.
    EXPECT_EQ(RectsOf(found.rgnOverlap), (Rects{{0, 0, 1, 1}}));
    EXPECT_EQ(RectsOf(found.rgnVisible), (Rects{{0, 0, 2, 2}}));
    EXPECT_EQ(RectsOf(found.rgnSharedWindow), (Rects{{0, 0, 3, 3}}));
    EXPECT_EQ(RectsOf(found.rgnApplications), (Rects{{0, 0, 4, 4}}));
    EXPECT_EQ(found.vCapturedWindows, (Values{10, 20}));
    EXPECT_EQ(found.vCapturedExcludedWindows, Values{30});
    EXPECT_EQ(found.vAppDisplays, Values{50});
}

TEST_F(ShareCapturerContextWalk, TracesTheDisplaysOfTheShareWhenTheyChange) {
    CTraceLog trace;
    const auto commit = [&](const Values& displays) {
        trace.Clear();
        context.m_paramSet.vAppDisplays = displays;
        context._CommitParamSet(context.m_paramSet);
        return trace.Lines();
    };
    const std::string start = "ShareCapturerContext::_CommitParamSet, shared display:";
    EXPECT_EQ(commit({}), Lines{});
    EXPECT_EQ(commit({4, 4294967294u}), Lines{Detail(start + "4,4294967294,")});
    EXPECT_EQ(commit({4, 4294967294u}), Lines{});
    EXPECT_EQ(commit({4294967294u, 4}), Lines{Detail(start + "4294967294,4,")}) << "another order";
    EXPECT_EQ(commit({4}), Lines{Detail(start + "4,")});
    EXPECT_EQ(commit({}), Lines{Detail(start)});
    CmSetTraceThreshold(CM_TRACE_DEBUG);
    EXPECT_EQ(commit({7}), Lines{});
    EXPECT_EQ(context.m_vAppDisplays, Values{7});
}

TEST_F(ShareCapturerContextWalk, TakesTheSharedDisplaysInADesktopShare) {
    context.m_vSharedDisplays = {RIGHT, 5};
    context.m_mapDisplayRects = {{5, {1, 2, 3, 4}}};
    context.m_mapAppDisplayRects = {{6, {}}};
    context.m_nTopAppWindow = WINDOW;
    context.m_paramSet.vAppDisplays = {9};
    context._UpdateAppsDisplay(context.m_paramSet, CContextProbe::AppDisplayRule::InForce());
    EXPECT_EQ(context.m_paramSet.vAppDisplays, (Values{RIGHT, 5}));
    EXPECT_EQ(context.m_mapAppDisplayRects, (DisplayRects{{5, {1, 2, 3, 4}}}));
    EXPECT_EQ(desktop->calls.displays, 0);
}

TEST_F(ShareCapturerContextWalk, TakesTheSharedDisplaysInAnyShareWhenToldSo) {
    AppShareConfig::Instance()->m_nShareConfigFlags = SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET;
    context.m_vSharedDisplays = {5};
    context.m_mapDisplayRects = {{5, {1, 2, 3, 4}}};
    EXPECT_EQ(DisplaysOf({{0, 0, 400, 10}}), Values{5});
    EXPECT_EQ(context.m_mapAppDisplayRects, (DisplayRects{{5, {1, 2, 3, 4}}}));
    AppShareConfig::Instance()->m_nShareConfigFlags = ~0u ^ SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET;
    EXPECT_EQ(DisplaysOf({{0, 0, 10, 10}}), Values{LEFT});
}

TEST_F(ShareCapturerContextWalk, LeavesEverythingAsItIsWithoutADisplay) {
    desktop->SetDisplays({});
    context.SetShareType(SHARE_TYPE_APP);
    context.m_mapAppDisplayRects = {{6, {}}};
    context.m_paramSet.vAppDisplays = {9};
    context._UpdateAppsDisplay(context.m_paramSet, CContextProbe::AppDisplayRule::InForce());
    EXPECT_EQ(context.m_paramSet.vAppDisplays, Values{9});
    EXPECT_EQ(context.m_mapAppDisplayRects, (DisplayRects{{6, {}}}));
}

TEST_F(ShareCapturerContextWalk, KnowsTheRectangleOfADisplayThatHasNothingOfTheShare) {
    context.m_mapAppDisplayRects = {{6, {}}};
    EXPECT_EQ(DisplaysOf({{210, 10, 220, 20}}), Values{RIGHT});
    EXPECT_EQ(context.m_mapAppDisplayRects,
              (DisplayRects{{LEFT, {0, 0, 200, 120}}, {RIGHT, {200, 0, 400, 120}}}));
    EXPECT_EQ(DisplaysOf({}), Values{});
    EXPECT_EQ(DisplaysOf({{400, 0, 500, 100}}), Values{}) << "next to the displays";
}

TEST_F(ShareCapturerContextWalk, PutsTheDisplayOfTheTopWindowFirst) {
    const Rects mostOnTheLeft{{0, 0, 250, 100}};
    EXPECT_EQ(DisplaysOf(mostOnTheLeft), (Values{LEFT, RIGHT}));
    desktop->SetWindows({FakeWindow(WINDOW, OWNER, {{210, 0}, {20, 20}})});
    context.m_nTopAppWindow = WINDOW;
    EXPECT_EQ(DisplaysOf(mostOnTheLeft), (Values{RIGHT, LEFT}));
    EXPECT_EQ(DisplaysOf({{0, 0, 10, 10}}), Values{LEFT}) << "a display that has nothing of the share";
    context.m_nTopAppWindow = 0u;
    EXPECT_EQ(DisplaysOf({{190, 0, 400, 100}}), (Values{LEFT, RIGHT}))
        << "no top window: nothing is reordered";
}

TEST_F(ShareCapturerContextWalk, KeepsTheOrderOfTheOtherDisplays) {
    desktop->SetDisplays({FakeDisplay(1, {{0, 0}, {10, 10}}), FakeDisplay(2, {{10, 0}, {10, 10}}),
                          FakeDisplay(3, {{20, 0}, {10, 10}}), FakeDisplay(4, {{30, 0}, {10, 10}})});
    desktop->SetWindows({FakeWindow(WINDOW, OWNER, {{21, 0}, {5, 5}})});
    context.m_nTopAppWindow = WINDOW;
    EXPECT_EQ(DisplaysOf({{0, 0, 40, 5}}), (Values{3, 2, 1, 4})) << "the first and the best change places";
}

TEST_F(ShareCapturerContextWalk, PutsTheDisplayWithTheLargestBoxFirstWhenToldNotToGoByTheWindow) {
    context.m_nTopAppWindow = WINDOW; // on the left
    EXPECT_EQ(DisplaysByArea({{190, 0, 300, 100}}), (Values{RIGHT, LEFT}));
    EXPECT_EQ(DisplaysByArea({{100, 0, 300, 100}}), (Values{LEFT, RIGHT})) << "the first of two equals";
    // Two specks at opposite corners count as all that lies between them.
    EXPECT_EQ(DisplaysByArea({{0, 0, 150, 120}, {200, 0, 201, 1}, {399, 119, 400, 120}}),
              (Values{RIGHT, LEFT}));
}

TEST_F(ShareCapturerContextWalk, TakesABoxBeyondThe32BitsOfItsAreaForASmallOne) {
    desktop->SetDisplays({FakeDisplay(1, {{0, 0}, {10, 10}}), FakeDisplay(2, {{100, 0}, {65536, 32768}}),
                          FakeDisplay(3, {{0, 100000}, {65536, 65537}})});
    EXPECT_EQ(DisplaysByArea({{0, 0, 10, 1}, {100, 0, 65636, 32768}}), (Values{1, 2})) << "negative";
    EXPECT_EQ(DisplaysByArea({{0, 0, 10, 1}, {0, 100000, 65536, 165537}}), (Values{3, 1})) << "65536";
}

TEST_F(ShareCapturerContextWalk, TracesHowTheDisplaysOfAShareCameOut) {
    context.m_rgnApplications.AddRect({1, 1, 2, 2});
    const CTraceLog trace;
    DisplaysOf({{10, 20, 30, 40}});
    const std::string start = "ShareCapturerContext::_UpdateAppsDisplay";
    const Lines lines = trace.LinesContaining(start);
    ASSERT_EQ(lines.size(), 4u) << "two for each display";
    const auto text = [](const Rects& rects) { return Region(rects).ToString(); };
    EXPECT_EQ(lines[0], Detail(start + ",rcDisplay={left:0,top:0,right:200,bottom:120,width:200,height:120}" +
                               ",rgnOneDisplay=" + text({{0, 0, 200, 120}}) +
                               ",m_rgnApplications=" + text({{1, 1, 2, 2}})))
        << "the applications are those of the walk before";
    EXPECT_EQ(lines[1], Detail(start + " after AND,rgnOneDisplay=" + text({{10, 20, 30, 40}})));
    EXPECT_EQ(lines[3], Detail(start + " after AND,rgnOneDisplay=" + text({})));
    CmSetTraceThreshold(CM_TRACE_DEBUG);
    DisplaysOf({{10, 20, 30, 40}});
    EXPECT_EQ(trace.CountContaining(start), 4u);
}
