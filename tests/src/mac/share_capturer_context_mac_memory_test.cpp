// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/memory_failure.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <new>
#include <string>
#include <vector>

/// A walk that can't keep its regions must not leave anything shown that was hidden.

namespace {

class CContextWithoutShape : public CMacContextProbe {
public:
    /// As after a change of displays for which there was no memory.
    void LoseDisplayRegion() {
        const TVLRegion empty;
        isMemoryGone = true;
        m_rgnDisplay.CopyRgn(empty);
        isMemoryGone = false;
        _NoteChange();
    }
};

} // namespace

TEST_F(WindowWalk, ShowsNothingWhenItRunsOutOfMemory) {
    CContextWithoutShape own;
    own.AddSharedDisplay(LEFT);
    own.AddSharedApp(SHARED_APP);
    SetStack({Window(1, SHARED_APP, {10, 10, 60, 60}), Window(2, OTHER_APP, {30, 30, 80, 80})});
    EXPECT_EQ(own.UpdateShareCapturerContext(), -1);
    EXPECT_EQ(own.m_vCapturedWindows, Values{1});
    EXPECT_FALSE(RegionGot(own, &ShareCapturerContext::GetVisiableRegion).empty());

    own.LoseDisplayRegion();
    const CTraceLog log(CM_TRACE_ERROR);
    EXPECT_EQ(own.UpdateShareCapturerContext(), -1);
    EXPECT_EQ(own.m_vCapturedWindows, Values());
    EXPECT_TRUE(RegionGot(own, &ShareCapturerContext::GetVisiableRegion).empty());
    EXPECT_TRUE(RegionGot(own, &ShareCapturerContext::GetSharedWindowRegion).empty());
    EXPECT_TRUE(log.Contains("fail no memory for the regions"));
}

TEST_F(WindowWalk, NeedsNoMemoryWhileItsLastWalkStands) {
    const CManualClockScope clock;
    ShareApp();
    WalkOver({Window(1, SHARED_APP, {10, 10, 60, 60}), Window(2, OTHER_APP, {30, 30, 80, 80})});
    Walk();
    const std::uint64_t published = context.Publications();
    const CTraceLog log(CM_TRACE_ERROR);
    isMemoryGone = true;
    const int result = context.UpdateShareCapturerContext();
    isMemoryGone = false;
    EXPECT_EQ(result, -1);
    EXPECT_EQ(context.Publications(), published) << "it stands";
    EXPECT_EQ(Captured(), Values{1});
    EXPECT_FALSE(Visible().empty());
    EXPECT_EQ(log.Lines(), std::vector<std::string>());
}

TEST_F(WindowWalk, IsMadeAgainWhenItLackedMemory) {
    const CManualClockScope clock; // no pin runs out because the machine is busy
    ReserveEdges(0, 0, 0, 20);
    SetStack({Window(1, SHARED_APP, {10, 10, 160, 120}), Window(2, OTHER_APP, {30, 30, 80, 80}),
              Window(3, SHARED_APP, {60, 60, 260, 90})});
    CMacContextProbe expected;
    for (CMacContextProbe* const each : {&context, &expected}) {
        each->AddSharedDisplay(LEFT);
        each->AddSharedDisplay(RIGHT);
        each->AddSharedApp(SHARED_APP);
        each->m_bFindsExposed = true;
    }
    int incomplete = 0;
    for (int turn = 0; turn < 500; ++turn) {
        const int allowed = turn / 5;
        int questions = turn % 5; // about displays or windows, after which there is memory again; 0 for never
        settings->m_bAppDisplayByWindow = !settings->m_bAppDisplayByWindow; // so that a walk is made
        desktop->SetHook([&questions] {
            if (isMemoryGone && --questions == 0)
                isMemoryGone = false;
        });
        allocationsLeft = allowed;
        try {
            context.UpdateShareCapturerContext();
        } catch (const std::bad_alloc&) { // NOLINT(bugprone-empty-catch): as a pass lets it
        }
        incomplete += allocationsLeft < 0 ? 1 : 0;
        isMemoryGone = false;
        allocationsLeft = -1;
        Walk();
        expected.UpdateShareCapturerContext();
        for (const Getter<TVLRegion> get :
             {&ShareCapturerContext::GetVisiableRegion, &ShareCapturerContext::GetOverlapRegion,
              &ShareCapturerContext::GetSharedWindowRegion, &ShareCapturerContext::GetExposedRegion})
            ASSERT_EQ(RegionGot(context, get), RegionGot(expected, get)) << turn;
        ASSERT_EQ(Captured(), expected.m_vCapturedWindows) << turn;
        ASSERT_EQ(Got(context, &ShareCapturerContext::GetAppMonitors),
                  Got(expected, &ShareCapturerContext::GetAppMonitors))
            << turn;
        ASSERT_EQ(context.m_mapAppDisplayRects, expected.m_mapAppDisplayRects) << turn;
        ASSERT_EQ(context.WalkedGeneration(), expected.WalkedGeneration()) << turn;
    }
    EXPECT_GT(incomplete, 100);
}
