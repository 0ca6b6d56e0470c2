// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "src/mac/share_capturer_context_mac.h"
#include "tests/src/share_capturer_context_tools.h"
#include "tests/support/settings_scope.h"
#include "util/cm_clock.h"

#include <atomic>
#include <chrono>
#include <string>
#include <vector>

/// What tests of the window walk say often.

class CMacContextProbe : public ShareCapturerContextMac {
public:
    using ShareCapturerContextMac::m_mapAppDisplayRects;
    using ShareCapturerContextMac::m_mapDisplayRects;
    using ShareCapturerContextMac::m_mapDisplaySizes;
    using ShareCapturerContextMac::m_nTopAppWindow;
    using ShareCapturerContextMac::m_rgnApplications;
    using ShareCapturerContextMac::m_vCapturedExcludedWindows;
    using ShareCapturerContextMac::m_vCapturedWindows;
};

inline int DockLevel() {
    return platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey);
}
inline int MenuLevel() {
    return platform::CGWindowLevelForKey(platform::kCGMainMenuWindowLevelKey);
}
inline int DesktopLevel() {
    return platform::CGWindowLevelForKey(platform::kCGDesktopWindowLevelKey);
}

/// A clock that jumps at every reading: what was pinned for a while is past at once.
class CJumpingClockScope {
public:
    CJumpingClockScope() : m_former(CmReplaceClock(&m_clock)) {}
    ~CJumpingClockScope() { CmReplaceClock(m_former); }
    CJumpingClockScope(const CJumpingClockScope&) = delete;
    CJumpingClockScope& operator=(const CJumpingClockScope&) = delete;

private:
    class Clock final : public ICmClock {
    public:
        std::chrono::nanoseconds SteadyNow() const override { return std::chrono::seconds(++m_readings); }
        std::chrono::nanoseconds WallNow() const override { return SteadyNow(); }
        bool RunsByItself() const override { return true; }

    private:
        mutable std::atomic<long long> m_readings{0};
    };

    Clock m_clock;
    ICmClock* const m_former;
};

/// A left display with the origin, a right one beside it, and a context with tracing off.
class WindowWalk : public testing::Test {
protected:
    static constexpr unsigned LEFT = CDesktopScope::LEFT;
    static constexpr unsigned RIGHT = CDesktopScope::RIGHT;
    static constexpr pid_t SHARED_APP = 500;
    static constexpr pid_t OTHER_APP = 600;

    /// An application share on the left display.
    void ShareApp() {
        EXPECT_EQ(context.AddSharedDisplay(LEFT), 0);
        EXPECT_EQ(context.AddSharedApp(SHARED_APP), 0);
    }
    void ShareDesktop() { EXPECT_EQ(context.AddSharedDisplay(LEFT), 0); }

    void SetStack(std::vector<platform::WindowInfo> backToFront) {
        desktop->SetWindows({backToFront.rbegin(), backToFront.rend()});
    }
    void Walk() { EXPECT_EQ(context.UpdateShareCapturerContext(), -1); }
    void WalkOver(std::vector<platform::WindowInfo> backToFront) {
        SetStack(std::move(backToFront));
        Walk();
    }

    static platform::WindowInfo Window(unsigned id, pid_t owner, const TVLRect& rect, int level = 0,
                                       float alpha = 1.0F) {
        platform::WindowInfo window = FakeWindow(
            id, owner,
            {{static_cast<float>(rect.left), static_cast<float>(rect.top)},
             {static_cast<float>(rect.right - rect.left), static_cast<float>(rect.bottom - rect.top)}},
            level);
        window.alpha = alpha;
        return window;
    }

    /// Both displays, the left one with that much kept free at its edges.
    void ReserveEdges(float left, float top, float right, float bottom) {
        platform::DisplayInfo main = FakeDisplay(LEFT, {{0, 0}, {200, 120}});
        main.visibleBounds = {{left, top}, {200 - left - right, 120 - top - bottom}};
        desktop->SetDisplays({main, FakeDisplay(RIGHT, {{200, 0}, {200, 120}})});
    }

    Rects Visible() { return RegionGot(context, &ShareCapturerContext::GetVisiableRegion); }
    Rects Overlap() { return RegionGot(context, &ShareCapturerContext::GetOverlapRegion); }
    Rects SharedWindows() { return RegionGot(context, &ShareCapturerContext::GetSharedWindowRegion); }
    Rects Applications() { return RectsOf(context.m_rgnApplications); }
    Values Captured() { return context.m_vCapturedWindows; }
    Values Excluded() { return context.m_vCapturedExcludedWindows; }

    CSettingsScope settings;
    CDesktopScope desktop;
    CMacContextProbe context;
};
