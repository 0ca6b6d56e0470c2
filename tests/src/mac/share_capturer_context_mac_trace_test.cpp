// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/share_capturer_context_mac_tools.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <chrono>
#include <string>
#include <vector>

/// What a walk says.

namespace {

using Lines = std::vector<std::string>;
using std::chrono::milliseconds;

/// The lines of the walk itself, without those of the look for the application's displays.
Lines OwnLines(const CTraceLog& trace) {
    Lines own;
    for (const std::string& line : trace.LinesContaining("DETAIL: ")) {
        if (line.find("ShareCapturerContext::") == std::string::npos)
            own.push_back(line);
    }
    return own;
}

std::string RegionText(const std::vector<std::string>& rects) {
    std::string text = "{ region:{size:" + std::to_string(rects.size()) + ",rects:[";
    for (const std::string& rect : rects)
        text += "{" + rect + "},\n";
    return text + "]}}";
}

const std::string KEPT = "{left:10,top:10,right:50,bottom:50,width:40,height:40}";
const std::string COVERED = "{left:40,top:10,right:50,bottom:50,width:10,height:40}";
const std::string SEEN = "{left:10,top:10,right:40,bottom:50,width:30,height:40}";
const std::string OTHER = "{left:40,top:0,right:90,bottom:90,width:50,height:90}";

class WindowWalkTraces : public WindowWalk {
protected:
    void SetThreeWindows() {
        SetStack({Window(1, OTHER_APP, {0, 0, 200, 120}, -1), Window(2, SHARED_APP, {10, 10, 50, 50}),
                  Window(3, OTHER_APP, {40, 0, 90, 90})});
    }

    CManualClockScope clock;
};

} // namespace

TEST_F(WindowWalkTraces, TellEachStepAndEachWindow) {
    ShareApp();
    SetThreeWindows();
    const CTraceLog trace;
    Walk();
    const std::string walk = "ShareCapturerContextMac::UpdateShareCapturerContext";
    EXPECT_EQ(
        OwnLines(trace),
        (Lines{Detail(walk + " begin >> WindowsCount=3"),
               Detail("UpdateShareCapturerContext init usageTime=0"), Detail("check windows: start >> "),
               Detail("check windows:,bShared=0,oneWindow=1,winLevel=-1,Skip"),
               Detail("check windows:,bShared=1,oneWindow=2,winLevel=0,rcWindow=" + KEPT),
               Detail("check windows:m_rgnOverlap=" + RegionText({})),
               Detail("UpdateShareCapturerContext check one window's region, share=1"),
               Detail("check windows:,bShared=0,oneWindow=3,winLevel=0,rcWindow=" + OTHER),
               Detail("check windows:m_rgnOverlap=" + RegionText({COVERED})),
               Detail("UpdateShareCapturerContext check one window's region, share=0"),
               Detail("UpdateShareCapturerContext exclude dockbar usageTime=0"),
               Detail("UpdateShareCapturerContext reverse overlap windows usageTime=0"),
               Detail("UpdateShareCapturerContext _UpdateAppsDisplay windows usageTime=0"),
               Detail(walk + ",m_rgnVisible=" + RegionText({SEEN})),
               Detail(walk + ",m_rgnApplications=" + RegionText({KEPT})),
               Detail(walk + ",m_rgnOverlap=" + RegionText({COVERED})),
               Detail(walk + ",m_rgnSharedWindow=" + RegionText({KEPT})),
               Detail(walk + ",m_vCapturedWindows.count=1,m_vCapturedExcludedWindows=1"),
               Detail(walk + " end <<")}));
}

TEST_F(WindowWalkTraces, SayNothingOfDocksInADesktopShare) {
    ShareDesktop();
    SetThreeWindows();
    const CTraceLog trace;
    Walk();
    EXPECT_FALSE(trace.Contains("exclude dockbar"));
    EXPECT_FALSE(trace.Contains(",Skip"));
    EXPECT_TRUE(trace.Contains("oneWindow=1,winLevel=-1,rcWindow="));
}

TEST_F(WindowWalkTraces, TellTheTimeOfEachStepForItself) {
    ShareApp();
    ReserveEdges(0, 0, 0, 20);
    SetThreeWindows();
    // The list takes 2 x 7 ms, each of several looks at the displays 7 ms.
    desktop->SetHook([this] { clock->Advance(milliseconds(7)); });
    const CTraceLog trace;
    Walk();
    EXPECT_TRUE(trace.Contains("UpdateShareCapturerContext init usageTime=14"));
    EXPECT_FALSE(trace.Contains("exclude dockbar usageTime=0"));
    EXPECT_TRUE(trace.Contains("UpdateShareCapturerContext reverse overlap windows usageTime=0"));
    EXPECT_FALSE(trace.Contains("_UpdateAppsDisplay windows usageTime=0"));
}

TEST_F(WindowWalkTraces, TellTheWholeTimeWhenThatIsAskedFor) {
    ShareApp();
    SetThreeWindows();
    desktop->SetHook([this] { clock->Advance(milliseconds(7)); });
    const CTraceLog trace(CM_TRACE_INFO);
    Walk();
    EXPECT_EQ(trace.Lines(), Lines());
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    const int looksBefore = desktop->calls.windows + desktop->calls.displays;
    Walk();
    const int looks = desktop->calls.windows + desktop->calls.displays - looksBefore;
    EXPECT_EQ(trace.Lines(), (Lines{Info("[Performance] UpdateShareCapturerContext total usageTime=" +
                                         std::to_string(looks * 7))}));
}

TEST_F(WindowWalkTraces, AreSilentWhenTheWalkIsSwitchedOff) {
    settings->m_nShareConfigFlags = SHARE_CONFIG_FLAG_NO_WINDOW_WALK | SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    const CTraceLog trace;
    context.UpdateShareCapturerContext();
    EXPECT_EQ(trace.Lines(), Lines());
}
