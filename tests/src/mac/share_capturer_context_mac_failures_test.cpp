// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstdio>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

/// Walks over a desktop that fails or changes under them.

namespace {

using platform::DisplayList;
using platform::WindowSnapshot;

/// A window server that knows nothing at chosen calls, counted from 1: at one, or from one on.
class CFailingWindowServer final : public CFakeWindowServer {
public:
    struct Failure {
        int at = 0; ///< 0 for never.
        bool isLasting = false;

        bool Strikes(int call) const { return at != 0 && (isLasting ? call >= at : call == at); }
    };

    Failure windowsFail;
    Failure displaysFail;
    mutable int windowCalls = 0;
    mutable int displayCalls = 0;

    std::shared_ptr<const WindowSnapshot> GetWindows() const override {
        return windowsFail.Strikes(++windowCalls) ? std::make_shared<const WindowSnapshot>()
                                                  : CFakeWindowServer::GetWindows();
    }
    std::shared_ptr<const DisplayList> GetDisplays() const override {
        return displaysFail.Strikes(++displayCalls) ? std::make_shared<const DisplayList>()
                                                    : CFakeWindowServer::GetDisplays();
    }
};

/// Shared window 1, and in front of it window 2, transparent and kept out. Nothing stays pinned, so every
/// question reaches the server: the number of windows is 1, their list 2, then level and frame of window 1
/// are 3 and 4; level, frame and alpha of window 2 are 5 to 7.
class FailingWalk : public testing::Test {
protected:
    FailingWalk() : m_former(platform::ReplaceWindowServer(server)) {
        platform::DisplayInfo display = FakeDisplay(1, {{0, 0}, {200, 120}});
        display.visibleBounds = {{0, 0}, {200, 100}};
        server->SetDisplays({display});
        platform::WindowInfo transparent = FakeWindow(2, 600, {{50, 0}, {50, 120}});
        transparent.alpha = 0;
        server->SetWindows({transparent, FakeWindow(1, 500, {{0, 0}, {100, 120}})});
        context.AddSharedDisplay(1);
        context.SetShareType(SHARE_TYPE_WINDOW);
        context.AddSharedWindow(1);
        context.AddUnSharedWindow(2);
    }
    ~FailingWalk() override { platform::ReplaceWindowServer(m_former); }

    void WalkFailing(CFailingWindowServer::Failure windows, CFailingWindowServer::Failure displays = {}) {
        server->windowCalls = server->displayCalls = 0;
        server->windowsFail = windows;
        server->displaysFail = displays;
        EXPECT_EQ(context.UpdateShareCapturerContext(), -1);
        server->windowsFail = server->displaysFail = {};
    }

    Rects Visible() { return RegionGot(context, &ShareCapturerContext::GetVisiableRegion); }
    Rects Overlap() { return RegionGot(context, &ShareCapturerContext::GetOverlapRegion); }

    const CSettingsScope settings;
    const CJumpingClockScope nothingStaysPinned;
    const std::shared_ptr<CFailingWindowServer> server = std::make_shared<CFailingWindowServer>();
    CMacContextProbe context;

private:
    const std::shared_ptr<platform::WindowServer> m_former;
};

struct Outcome {
    int failingCall;
    bool isLasting;
    Values captured;
    Values excluded;
    Rects visible;
    Rects overlap;
};

const Rects ALL_BUT_DOCK{{0, 0, 100, 100}};
const Rects DOCK_PART{{0, 100, 100, 120}};

} // namespace

TEST_F(FailingWalk, TakesTheDefaultOfEachQuestionThatFailsOnceOrFromThenOn) {
    const std::vector<Outcome> outcomes = {
        {0, false, {1}, {2}, ALL_BUT_DOCK, DOCK_PART},
        {1, false, {1}, {2}, ALL_BUT_DOCK, DOCK_PART}, // room for 8 more than were counted
        {1, true, {}, {}, {}, {}},
        {2, false, {}, {}, {}, {}}, // no list
        {2, true, {}, {}, {}, {}},
        {3, false, {}, {2}, {}, {}}, // level -1: skipped
        {3, true, {}, {}, {}, {}},
        {4, false, {1}, {2}, {}, {}}, // no frame: kept, and nothing to see
        {4, true, {1}, {}, {}, {}},
        {5, false, {1}, {}, ALL_BUT_DOCK, DOCK_PART},
        {5, true, {1}, {}, ALL_BUT_DOCK, DOCK_PART},
        {6, false, {1}, {2}, ALL_BUT_DOCK, DOCK_PART},
        {6, true, {1}, {2}, ALL_BUT_DOCK, DOCK_PART},
        // Opaque when its alpha can't be told: rather hidden than shown.
        {7, false, {1}, {2}, {{0, 0, 50, 100}}, {{50, 0, 100, 100}, {0, 100, 100, 120}}},
        {7, true, {1}, {2}, {{0, 0, 50, 100}}, {{50, 0, 100, 100}, {0, 100, 100, 120}}},
    };
    for (const Outcome& outcome : outcomes) {
        SCOPED_TRACE("call " + std::to_string(outcome.failingCall) +
                     (outcome.isLasting ? " and all later" : ""));
        WalkFailing({outcome.failingCall, outcome.isLasting});
        EXPECT_EQ(context.m_vCapturedWindows, outcome.captured);
        EXPECT_EQ(context.m_vCapturedExcludedWindows, outcome.excluded);
        EXPECT_EQ(Visible(), outcome.visible);
        EXPECT_EQ(Overlap(), outcome.overlap);
    }
}

TEST_F(FailingWalk, KeepsAWindowOfUnknownOwnerInADesktopShareOnly) {
    context.RemoveSharedWindow(1);
    context.AddSharedApp(500);
    // The owner is asked first: call 3 in place of the level.
    WalkFailing({3, false});
    EXPECT_EQ(context.m_vCapturedWindows, Values{});
    EXPECT_EQ(context.m_vCapturedExcludedWindows, (Values{1, 2}));
    context.RemoveSharedApp(500);
    context.AddUnSharedApp(500);
    context.SetShareType(SHARE_TYPE_DESKTOP);
    WalkFailing({3, false});
    EXPECT_EQ(context.m_vCapturedWindows, (Values{1}));
    WalkFailing({});
    EXPECT_EQ(context.m_vCapturedWindows, Values{});
}

TEST_F(FailingWalk, TakesNoDockOutWhenTheDisplayCannotBeFound) {
    WalkFailing({}, {1, true});
    EXPECT_EQ(Visible(), (Rects{{0, 0, 100, 120}}));
    EXPECT_TRUE(Overlap().empty());
    EXPECT_TRUE(Got(context, &ShareCapturerContext::GetAppMonitors).empty());
    WalkFailing({});
    EXPECT_EQ(Overlap(), DOCK_PART);
    EXPECT_EQ(Got(context, &ShareCapturerContext::GetAppMonitors), (Values{1}));
}

TEST_F(FailingWalk, FinishesWhicheverQuestionAboutDisplaysFails) {
    WalkFailing({});
    const int questions = server->displayCalls;
    ASSERT_GT(questions, 3);
    for (int call = 1; call <= questions; ++call) {
        for (const bool isLasting : {false, true}) {
            WalkFailing({}, {call, isLasting});
            EXPECT_EQ(context.m_vCapturedWindows, (Values{1})) << call;
        }
    }
}

TEST_F(FailingWalk, PublishesNothingWithoutAWindowServer) {
    WalkFailing({});
    server->SetLife(platform::Life::Lost);
    WalkFailing({});
    EXPECT_TRUE(Visible().empty());
    EXPECT_TRUE(context.m_vCapturedWindows.empty());
    EXPECT_TRUE(context.m_vCapturedExcludedWindows.empty());
    server->SetLife(platform::Life::Alive);
    WalkFailing({});
    EXPECT_EQ(Visible(), ALL_BUT_DOCK) << "a server that comes back is used again";
}

// ---- Windows that go away, and lists that change, while a walk is at work

namespace {

/// Does something when a walk tells of a window: in its middle.
class CWhenTraced {
public:
    CWhenTraced(std::string text, std::function<void()> action)
        : m_text(std::move(text)),
          m_action(std::move(action)) {
        CmSetTraceThreshold(CM_TRACE_DETAIL);
        CmSetTraceReceiver(&CWhenTraced::Receive, this);
    }
    ~CWhenTraced() {
        CmSetTraceReceiver(nullptr, nullptr);
        CmSetTraceThreshold(-1);
    }
    CWhenTraced(const CWhenTraced&) = delete;
    CWhenTraced& operator=(const CWhenTraced&) = delete;

private:
    static void Receive(void* context, int, const char*, const char* text, int) {
        auto* const self = static_cast<CWhenTraced*>(context);
        if (std::string(text).find(self->m_text) != std::string::npos)
            self->m_action();
    }

    const std::string m_text;
    const std::function<void()> m_action;
};

} // namespace

TEST_F(WindowWalk, SeesOneMomentHoweverTheDesktopGoesOn) {
    ShareApp();
    SetStack({Window(1, SHARED_APP, {0, 0, 50, 50}), Window(2, OTHER_APP, {40, 0, 90, 50})});
    const CWhenTraced moment("oneWindow=1", [this] { SetStack({Window(1, SHARED_APP, {0, 0, 50, 50})}); });
    Walk();
    EXPECT_EQ(Excluded(), (Values{2}));
    EXPECT_EQ(Overlap(), (Rects{{40, 0, 50, 50}}));
    Walk();
    EXPECT_EQ(Excluded(), Values{});
}

TEST_F(WindowWalk, SkipsWindowsThatVanishedInAWalkThatTakesTooLong) {
    CManualClockScope clock;
    ShareApp();
    SetStack({Window(1, SHARED_APP, {0, 0, 50, 50}), Window(2, SHARED_APP, {60, 0, 90, 50}),
              Window(3, OTHER_APP, {0, 0, 90, 50})});
    const CWhenTraced moment("oneWindow=1", [&] {
        clock->Advance(std::chrono::milliseconds(100));
        SetStack({});
    });
    Walk();
    EXPECT_EQ(Captured(), (Values{1}));
    EXPECT_EQ(Excluded(), Values{});
    EXPECT_EQ(Visible(), (Rects{{0, 0, 50, 50}}));
}

TEST_F(WindowWalk, JudgesAWindowByTheListsOfItsTurn) {
    ShareApp();
    SetStack({Window(1, SHARED_APP, {0, 0, 50, 50}), Window(2, SHARED_APP, {60, 0, 90, 50})});
    const CWhenTraced moment("oneWindow=1", [this] {
        context.AddUnSharedWindow(1);
        context.AddUnSharedWindow(2);
    });
    Walk();
    EXPECT_EQ(Captured(), (Values{1})) << "the next walk corrects it";
    EXPECT_EQ(Excluded(), (Values{2}));
    Walk();
    EXPECT_EQ(Captured(), Values{});
}

TEST_F(WindowWalk, KeepsToTheShareTypeAndDisplaysThatItBeganWith) {
    ReserveEdges(0, 0, 0, 20);
    ShareApp();
    SetStack({Window(1, SHARED_APP, {0, 0, 50, 120}), Window(2, SHARED_APP, {0, 0, 200, 120}, DockLevel())});
    const CWhenTraced moment("oneWindow=1", [this] {
        context.SetShareType(SHARE_TYPE_DESKTOP);
        context.RemoveSharedDisplay(LEFT);
    });
    Walk();
    EXPECT_EQ(Captured(), (Values{1})) << "the Dock is skipped as before";
    EXPECT_EQ(Overlap(), (Rects{{0, 100, 50, 120}}));
}

TEST_F(WindowWalk, RunsBesideEveryListChange) {
    const int atLeast = 2'000 * TestEffort();
    SetStack({Window(1, SHARED_APP, {0, 0, 50, 50}), Window(2, OTHER_APP, {40, 0, 90, 50}),
              Window(3, SHARED_APP, {0, 0, 200, 120}, DockLevel())});
    std::atomic<bool> isOver{false};
    std::atomic<int> walks{0};
    std::atomic<int> rounds{0};
    std::thread client([&] {
        for (; rounds < atLeast || walks < atLeast; ++rounds) {
            context.AddSharedDisplay(LEFT);
            context.AddSharedDisplay(RIGHT);
            context.AddSharedApp(SHARED_APP);
            context.AddUnSharedWindow(1);
            context.SetShareType(SHARE_TYPE_DESKTOP);
            context.SetCaptureMaxSize({100, 100});
            context.AddSharedWindow(1);
            context.RemoveSharedWindow(1);
            context.RemoveSharedApp(SHARED_APP);
            context.RemoveSharedDisplay(LEFT);
            context.ClearSharedDisplay();
        }
        isOver = true;
    });
    for (; !isOver; ++walks) {
        Walk();
        Values captured;
        Values excluded;
        context.GetCapturedWindows(captured);
        context.GetCapturedExcludedWindows(excluded);
        EXPECT_LE(captured.size() + excluded.size(), 3u);
        context.InitDisplays();
    }
    client.join();
    std::printf("%d rounds of changes beside %d walks\n", rounds.load(), walks.load());
    context.SetShareType(SHARE_TYPE_DESKTOP);
    Walk();
    EXPECT_EQ(Captured(), (Values{3, 2, 1}));
    context.InitDisplays();
    EXPECT_TRUE(RegionGot(context, &ShareCapturerContext::GetDisplayRegion).empty());
}
