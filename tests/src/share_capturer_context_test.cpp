// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer_context.h"

#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <thread>
#include <utility>
#include <vector>

/// The lists, the settings and the copies that the context gives.

namespace {

using Lines = std::vector<std::string>;

const std::string SOURCE = "src/share_capturer_context";

unsigned OwnPid() {
    return static_cast<unsigned>(getpid());
}

/// One of the four lists of windows and applications, with the one that is its opposite.
struct List {
    const char* add;
    const char* remove;
    const char* kind;
    unsigned invalid;
    int (ShareCapturerContext::*addTo)(unsigned);
    int (ShareCapturerContext::*removeFrom)(unsigned);
    int (ShareCapturerContext::*count)() const;
    Getter<Values> get;
    Values CContextProbe::*values;
    std::size_t opposite;
};

constexpr std::size_t LIST_COUNT = 4;
const List LISTS[LIST_COUNT] = {
    {"AddSharedWindow", "RemoveSharedWindow", "windowHandle", 0, &ShareCapturerContext::AddSharedWindow,
     &ShareCapturerContext::RemoveSharedWindow, &ShareCapturerContext::GetSharedWindowCount,
     &ShareCapturerContext::GetSharedWindows, &CContextProbe::m_vSharedWindows, 1},
    {"AddUnSharedWindow", "RemoveUnSharedWindow", "windowHandle", 0, &ShareCapturerContext::AddUnSharedWindow,
     &ShareCapturerContext::RemoveUnSharedWindow, &ShareCapturerContext::GetUnSharedWindowCount,
     &ShareCapturerContext::GetUnSharedWindows, &CContextProbe::m_vUnSharedWindows, 0},
    {"AddSharedApp", "RemoveSharedApp", "processId", 0x80000000u, &ShareCapturerContext::AddSharedApp,
     &ShareCapturerContext::RemoveSharedApp, &ShareCapturerContext::GetSharedAppCount,
     &ShareCapturerContext::GetSharedProcesses, &CContextProbe::m_vSharedApps, 3},
    {"AddUnSharedApp", "RemoveUnSharedApp", "processId", 0x80000000u, &ShareCapturerContext::AddUnSharedApp,
     &ShareCapturerContext::RemoveUnSharedApp, &ShareCapturerContext::GetUnSharedAppCount,
     &ShareCapturerContext::GetUnSharedProcesses, &CContextProbe::m_vUnSharedApps, 2},
};

/// Never inlined: where it is, the compiler takes the table for unset.
[[gnu::noinline]] int CountOf(const ShareCapturerContext& context, const List& list) {
    return (context.*list.count)();
}

class ShareCapturerContextList : public testing::TestWithParam<std::size_t> {
protected:
    int Add(unsigned value) { return (context.*list.addTo)(value); }
    int Remove(unsigned value) { return (context.*list.removeFrom)(value); }
    int AddToOpposite(unsigned value) { return (context.*opposite.addTo)(value); }
    Values InList() const { return Got(context, list.get, Values{99, 98}); }
    Values InOpposite() const { return Got(context, opposite.get); }

    std::string Line(const char* operation, unsigned value, int before) const {
        return Info(std::string("ShareCapturerContext::") + operation + " " + list.kind + "=" +
                    std::to_string(value) + ",current total count=" + std::to_string(before));
    }
    void ExpectRefusal(const char* operation) const {
        const Lines lines = trace.Lines();
        ASSERT_EQ(lines.size(), 1u);
        const std::string text = std::string("ShareCapturerContext::") + operation + " invalidate params " +
                                 list.kind + "=" + std::to_string(list.invalid);
        EXPECT_TRUE(IsLineAt(lines[0], Warning(text), SOURCE));
    }

    const List& list = LISTS[GetParam()];
    const List& opposite = LISTS[list.opposite];
    CContextProbe context;
    CTraceLog trace;
};

/// Whether another thread could take the lock now.
bool IsFree(std::recursive_mutex& mutex) {
    bool isFree = false;
    std::thread([&] {
        isFree = mutex.try_lock();
        if (isFree)
            mutex.unlock();
    }).join();
    return isFree;
}

} // namespace

INSTANTIATE_TEST_SUITE_P(EachList, ShareCapturerContextList, testing::Range<std::size_t>(0, LIST_COUNT),
                         [](const auto& each) { return std::string(LISTS[each.param].add); });

TEST_P(ShareCapturerContextList, KeepsTheOrderOfAddingAndTracesTheCountBefore) {
    EXPECT_EQ(Add(7), 0);
    EXPECT_EQ(Add(0xFFFFFFFFu), 0);
    EXPECT_EQ(Add(3), 0);
    EXPECT_EQ(InList(), (Values{7, 0xFFFFFFFFu, 3}));
    EXPECT_EQ(CountOf(context, list), 3);
    EXPECT_EQ(InOpposite(), Values{});
    const Lines expected{Line(list.add, 7, 0), Line(list.add, 0xFFFFFFFFu, 1), Line(list.add, 3, 2)};
    EXPECT_EQ(trace.Lines(), expected);
}

TEST_P(ShareCapturerContextList, RefusesTheInvalidValueWithOneWarning) {
    EXPECT_EQ(Add(5), 0);
    trace.Clear();
    context.SetShareType(SHARE_TYPE_WINDOW);
    trace.Clear();
    EXPECT_EQ(Add(list.invalid), -2);
    ExpectRefusal(list.add);
    trace.Clear();
    EXPECT_EQ(Remove(list.invalid), -2);
    ExpectRefusal(list.remove);
    EXPECT_EQ(InList(), Values{5});
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_WINDOW);
}

TEST_P(ShareCapturerContextList, TakesAValueOffTheOppositeList) {
    for (const unsigned value : {1u, 2u, 3u})
        EXPECT_EQ(AddToOpposite(value), 0);
    trace.Clear();
    EXPECT_EQ(Add(2), 0);
    EXPECT_EQ(InList(), Values{2});
    EXPECT_EQ(InOpposite(), (Values{1, 3}));
    EXPECT_EQ(trace.Lines(), (Lines{Line(list.add, 2, 0), Line(opposite.remove, 2, 3)}));
}

TEST_P(ShareCapturerContextList, DoesNothingAtAllForAValueThatIsThere) {
    (context.*list.values) = {4};
    (context.*opposite.values) = {4};
    EXPECT_EQ(Add(4), 0);
    EXPECT_EQ(InList(), Values{4});
    EXPECT_EQ(InOpposite(), Values{4});
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_DESKTOP);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_P(ShareCapturerContextList, RemovesOneValueAndKeepsTheOrderOfTheRest) {
    for (const unsigned value : {8u, 9u, 10u})
        EXPECT_EQ(Add(value), 0);
    trace.Clear();
    EXPECT_EQ(Remove(9), 0);
    EXPECT_EQ(InList(), (Values{8, 10}));
    EXPECT_EQ(trace.Lines(), Lines{Line(list.remove, 9, 3)});
}

TEST_P(ShareCapturerContextList, SaysThatAnAbsentValueIsNotThere) {
    EXPECT_EQ(AddToOpposite(1), 0);
    trace.Clear();
    EXPECT_EQ(Remove(1), -1);
    EXPECT_EQ(InOpposite(), Values{1});
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST_P(ShareCapturerContextList, CountsEachChangeOfWhatMayBeSeenOnce) {
    const bool addingAdmits = GetParam() % 2 == 0;
    using Counts = std::pair<std::uint64_t, std::uint64_t>;
    const auto counts = [&] {
        const Counts found{context.Admissions(), context.Withdrawals()};
        return addingAdmits ? found : Counts{found.second, found.first};
    };
    Add(7);
    EXPECT_EQ(counts(), Counts(1, 0));
    Add(7);
    EXPECT_EQ(counts(), Counts(1, 0)) << "it is there already";
    Remove(7);
    EXPECT_EQ(counts(), Counts(1, 1));
    Remove(7);
    EXPECT_EQ(counts(), Counts(1, 1)) << "it is gone already";
    AddToOpposite(7);
    Add(7);
    EXPECT_EQ(counts(), Counts(2, 2));
}

TEST_P(ShareCapturerContextList, HoldsNoLockWhileItTraces) {
    struct Seen {
        CContextProbe& context;
        std::vector<bool> isFree;
    } seen{context, {}};
    EXPECT_EQ(AddToOpposite(6), 0);
    CmSetTraceReceiver(
        [](void* to, int, const char*, const char*, int) {
            auto& into = *static_cast<Seen*>(to);
            into.isFree.push_back(IsFree(into.context.m_paramLock));
        },
        &seen);
    EXPECT_EQ(Add(6), 0);
    EXPECT_EQ(Remove(6), 0);
    EXPECT_EQ(Add(list.invalid), -2);
    CmSetTraceReceiver(nullptr, nullptr);
    EXPECT_EQ(seen.isFree, std::vector<bool>(4, true));
}

TEST(ShareCapturerContext, StartsWithNothingSharedAndNothingFound) {
    const ShareCapturerContext context;
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_DESKTOP);
    EXPECT_EQ(context.GetCaptureFps(), 5);
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetCaptureMaxSize), (TVLSize{2880, 1800}));
    EXPECT_TRUE(context.m_bNoWindowBaseArea);
    EXPECT_FALSE(context.m_bExcludeMenuBar);
    for (const List& list : LISTS) {
        EXPECT_EQ(CountOf(context, list), 0);
        EXPECT_EQ(Got(context, list.get, {1}), Values{});
    }
    EXPECT_EQ(context.GetSharedMonitorCount(), 0);
    for (const auto get :
         {&ShareCapturerContext::GetSharedMonitors, &ShareCapturerContext::GetAppMonitors,
          &ShareCapturerContext::GetCapturedWindows, &ShareCapturerContext::GetCapturedExcludedWindows})
        EXPECT_EQ(Got(context, get, {1}), Values{});
    for (const auto get :
         {&ShareCapturerContext::GetOverlapRegion, &ShareCapturerContext::GetVisiableRegion,
          &ShareCapturerContext::GetSharedWindowRegion, &ShareCapturerContext::GetDisplayRegion,
          &ShareCapturerContext::GetInvisiableRegion, &ShareCapturerContext::GetBackgroundInvisiableRegion})
        EXPECT_EQ(RegionGot(context, get), Rects{});
    EXPECT_TRUE(Got(context, &ShareCapturerContext::GetDisplayRects).empty());
}

TEST(ShareCapturerContext, WalksNothingByItself) {
    ShareCapturerContext context;
    EXPECT_EQ(context.UpdateShareCapturerContext(), -3);
    EXPECT_EQ(context.InitDisplays(), -3);
    EXPECT_FALSE(context.shouldPauseCapturing());
    EXPECT_FALSE(context.IsFilterOutSystemProcess(1));
    EXPECT_FALSE(context._IsWindowShared(4));
    context.AddSharedWindow(4);
    EXPECT_TRUE(context._IsWindowShared(4));
}

TEST(ShareCapturerContext, TurnsIntoAnApplicationShareWithANewApplication) {
    CContextProbe context;
    for (const SHARE_TYPE before : {SHARE_TYPE_DESKTOP, SHARE_TYPE_WINDOW}) {
        context.SetShareType(before);
        const CTraceLog trace;
        EXPECT_EQ(context.AddSharedApp(static_cast<unsigned>(before)), 0);
        EXPECT_EQ(context.GetShareType(), SHARE_TYPE_APP);
        EXPECT_FALSE(trace.Contains("SetShareType"));
    }
    context.SetShareType(SHARE_TYPE_WINDOW);
    EXPECT_EQ(context.AddSharedApp(SHARE_TYPE_WINDOW), 0) << "it is there already";
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_WINDOW);
    EXPECT_EQ(context.AddUnSharedApp(20), 0);
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_WINDOW);
}

TEST(ShareCapturerContext, MakesTheDisplaysAnewWithEachDisplayThatComesOrGoes) {
    CContextProbe context;
    CTraceLog trace;
    Lines order;
    bool isLocked = true;
    context.onInitDisplays = [&] {
        order = trace.Lines();
        isLocked = isLocked && !IsFree(context.m_displayLock) && IsFree(context.m_paramLock);
    };
    EXPECT_EQ(context.AddSharedDisplay(0), 0);
    EXPECT_EQ(context.AddSharedDisplay(5), 0);
    EXPECT_EQ(context.initDisplaysCalls, 2);
    EXPECT_EQ(order,
              (Lines{Info("ShareCapturerContext::AddSharedDisplay displayId=0,current total count=0"),
                     Info("ShareCapturerContext::AddSharedDisplay displayId=5,current total count=1")}))
        << "traced before the displays are made";
    trace.Clear();
    EXPECT_EQ(context.RemoveSharedDisplay(0), 0);
    EXPECT_EQ(context.initDisplaysCalls, 3);
    EXPECT_EQ(order,
              Lines{Info("ShareCapturerContext::RemoveSharedDisplay displayId=0,current total count=2")});
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetSharedMonitors, {1, 2}), Values{5});
    EXPECT_EQ(context.GetSharedMonitorCount(), 1);
    EXPECT_TRUE(isLocked) << "the list and the tables change together, and apart from the other lists";
}

TEST(ShareCapturerContext, LeavesTheDisplaysAloneWhenNoneComesOrGoes) {
    CContextProbe context;
    context.AddSharedDisplay(5);
    const CTraceLog trace;
    EXPECT_EQ(context.AddSharedDisplay(5), 0);
    EXPECT_EQ(context.RemoveSharedDisplay(6), 0) << "unlike the other lists";
    EXPECT_EQ(context.initDisplaysCalls, 1);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetSharedMonitors), Values{5});
}

TEST(ShareCapturerContext, CountsEachDisplayThatGoesAsAWithdrawal) {
    CContextProbe context;
    context.AddSharedDisplay(5);
    EXPECT_EQ(context.Withdrawals(), 0u);
    context.RemoveSharedDisplay(5);
    EXPECT_EQ(context.Withdrawals(), 1u);
    context.RemoveSharedDisplay(5);
    EXPECT_EQ(context.Withdrawals(), 1u) << "it is gone already";
    context.ClearSharedDisplay();
    EXPECT_EQ(context.Withdrawals(), 2u);
    EXPECT_EQ(context.Admissions(), 0u);
}

TEST(ShareCapturerContext, RefusesTheDisplayThatIsNone) {
    CContextProbe context;
    CTraceLog trace;
    EXPECT_EQ(context.AddSharedDisplay(0xFFFFFFFFu), -2);
    EXPECT_EQ(context.RemoveSharedDisplay(0xFFFFFFFFu), -2);
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 2u);
    const std::string end = "SharedDisplay invalidate params displayId=4294967295";
    EXPECT_TRUE(IsLineAt(lines[0], Warning("ShareCapturerContext::Add" + end), SOURCE));
    EXPECT_TRUE(IsLineAt(lines[1], Warning("ShareCapturerContext::Remove" + end), SOURCE));
    EXPECT_EQ(context.initDisplaysCalls, 0);
    EXPECT_EQ(context.GetSharedMonitorCount(), 0);
}

TEST(ShareCapturerContext, SucceedsWithADisplayWhateverBecomesOfTheTables) {
    CContextProbe context;
    context.initDisplaysResult = -3;
    EXPECT_EQ(context.AddSharedDisplay(5), 0);
    EXPECT_EQ(context.UpdateSharedDisplay(5), 0);
    EXPECT_EQ(context.SetCaptureMaxSize({10, 10}), 0);
    EXPECT_EQ(context.RemoveSharedDisplay(5), 0);
    EXPECT_EQ(context.initDisplaysCalls, 4);
}

TEST(ShareCapturerContext, UpdatesAllDisplaysWhicheverIsNamed) {
    CContextProbe context;
    const CTraceLog trace;
    EXPECT_EQ(context.UpdateSharedDisplay(1), 0);
    EXPECT_EQ(context.UpdateSharedDisplay(0xFFFFFFFFu), 0);
    EXPECT_EQ(context.initDisplaysCalls, 2);
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST(ShareCapturerContext, ClearsTheDisplaysButNotWhatWasMadeOfThem) {
    CContextProbe context;
    context.AddSharedDisplay(5);
    context.m_mapDisplayRects = {{5, {0, 0, 3, 4}}};
    context.m_rgnDisplay.AddRect({0, 0, 3, 4});
    const CTraceLog trace;
    EXPECT_EQ(context.ClearSharedDisplay(), 0);
    EXPECT_EQ(context.initDisplaysCalls, 1);
    EXPECT_EQ(context.GetSharedMonitorCount(), 0);
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetDisplayRects),
              (std::map<unsigned, TVLRect>{{5, {0, 0, 3, 4}}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetDisplayRegion), (Rects{{0, 0, 3, 4}}));
    EXPECT_EQ(trace.Lines(), Lines{});
}

TEST(ShareCapturerContext, KnowsTheNewSizeLimitBeforeItMakesTheDisplays) {
    CContextProbe context;
    TVLSize seen{};
    context.onInitDisplays = [&] { context.GetCaptureMaxSize(seen); };
    EXPECT_EQ(context.SetCaptureMaxSize({640, 480}), 0);
    EXPECT_EQ(seen, (TVLSize{640, 480}));
    EXPECT_EQ(context.initDisplaysCalls, 1);
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetCaptureMaxSize), (TVLSize{640, 480}));
}

TEST(ShareCapturerContext, TracesAShareTypeOnlyWhenItChanges) {
    CContextProbe context;
    CTraceLog trace;
    EXPECT_EQ(context.SetShareType(SHARE_TYPE_DESKTOP), 0);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(context.SetShareType(SHARE_TYPE_WINDOW), 0);
    EXPECT_EQ(context.SetShareType(SHARE_TYPE_WINDOW), 0);
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_WINDOW);
    EXPECT_EQ(trace.Lines(), Lines{Info("ShareCapturerContext::SetShareType eShareType=3")});
}

TEST(ShareCapturerContext, RefusesARateBelowOneInSilence) {
    CContextProbe context;
    CTraceLog trace;
    EXPECT_EQ(context.SetCaptureFps(0), -2);
    EXPECT_EQ(context.SetCaptureFps(-1), -2);
    EXPECT_EQ(context.SetCaptureFps(5), 0);
    EXPECT_EQ(context.GetCaptureFps(), 5);
    EXPECT_EQ(trace.Lines(), Lines{});
    EXPECT_EQ(context.SetCaptureFps(1), 0);
    EXPECT_EQ(context.SetCaptureFps(1), 0);
    EXPECT_EQ(context.GetCaptureFps(), 1);
    EXPECT_EQ(trace.Lines(), Lines{Info("ShareCapturerContext::SetCaptureFps fps=1")});
}

TEST(ShareCapturerContext, KeepsThisProcessOutOfADesktopShareOnRequest) {
    CContextProbe context;
    EXPECT_EQ(context.SetFilterSelf(true), 0);
    EXPECT_TRUE(context.m_bFilterSelf);
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetUnSharedProcesses), Values{OwnPid()});
    EXPECT_EQ(context.GetShareType(), SHARE_TYPE_DESKTOP);
    EXPECT_EQ(context.SetFilterSelf(false), 0);
    EXPECT_FALSE(context.m_bFilterSelf);
    EXPECT_EQ(context.GetUnSharedAppCount(), 0);
    EXPECT_EQ(context.SetFilterSelf(false), 0) << "also when the process isn't on the list";
}

TEST(ShareCapturerContext, OnlyRemembersTheSelfFilterInOtherShares) {
    for (const SHARE_TYPE type : {SHARE_TYPE_APP, SHARE_TYPE_WINDOW}) {
        CContextProbe context;
        context.SetShareType(type);
        EXPECT_EQ(context.SetFilterSelf(true), 0);
        EXPECT_TRUE(context.m_bFilterSelf);
        EXPECT_EQ(context.GetUnSharedAppCount(), 0);
        context.AddUnSharedApp(OwnPid());
        EXPECT_EQ(context.SetFilterSelf(false), 0);
        EXPECT_FALSE(context.m_bFilterSelf);
        EXPECT_EQ(context.GetUnSharedAppCount(), 1);
    }
}

TEST(ShareCapturerContext, GivesCopiesOfItsRegions) {
    CContextProbe context;
    context.m_rgnOverlap.AddRect({0, 0, 1, 1});
    context.m_rgnVisible.AddRect({0, 0, 2, 2});
    context.m_rgnSharedWindow.AddRect({0, 0, 3, 3});
    context.m_rgnDisplay.AddRect({0, 0, 4, 4});
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetOverlapRegion), (Rects{{0, 0, 1, 1}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetVisiableRegion), (Rects{{0, 0, 2, 2}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetSharedWindowRegion), (Rects{{0, 0, 3, 3}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetDisplayRegion), (Rects{{0, 0, 4, 4}}));
    TVLRegion copy;
    context.GetVisiableRegion(copy);
    copy.Empty();
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetVisiableRegion), (Rects{{0, 0, 2, 2}}));
}

TEST(ShareCapturerContext, WorksOutWhatIsNotSeen) {
    CContextProbe context;
    context.m_rgnDisplay.AddRect({0, 0, 30, 10});
    context.m_rgnVisible.AddRect({0, 0, 10, 10});
    context.m_rgnOverlap.AddRect({10, 0, 20, 10});
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetInvisiableRegion), (Rects{{10, 0, 30, 10}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetBackgroundInvisiableRegion),
              (Rects{{20, 0, 30, 10}}));
    EXPECT_EQ(RegionGot(context, &ShareCapturerContext::GetDisplayRegion), (Rects{{0, 0, 30, 10}}));
}

TEST(ShareCapturerContext, BoxesTheSharedWindowsAndTheDisplays) {
    CContextProbe context;
    for (const auto get :
         {&ShareCapturerContext::GetSharedWindowBoxRect, &ShareCapturerContext::GetDisplayBoxRect}) {
        TVLRect box{1, 2, 3, 4};
        EXPECT_EQ((context.*get)(box), -1);
        EXPECT_EQ(box, (TVLRect{0, 0, 0, 0}));
    }
    context.m_rgnSharedWindow.AddRect({1, 2, 3, 4});
    context.m_rgnSharedWindow.AddRect({10, 20, 30, 40});
    context.m_rgnDisplay.AddRect({-5, -6, 7, 8});
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetSharedWindowBoxRect), (TVLRect{1, 2, 30, 40}));
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetDisplayBoxRect), (TVLRect{-5, -6, 7, 8}));
}
