// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/memory_failure.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

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
