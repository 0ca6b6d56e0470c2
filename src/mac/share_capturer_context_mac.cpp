// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_context_mac.h"

#include "platform/core_graphics.h"
#include "platform/window_services.h"
#include "src/app_share_config.h"
#include "src/mac/share_util_mac.h"
#include "src/share_dump_time_usage.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <utility>

/// The walk over the windows. The display tables are in share_capturer_context_mac_displays.cpp.

namespace {

using Guard = std::lock_guard<std::recursive_mutex>;

bool IsFlat(const TVLRect& rect) {
    return rect.left == rect.right || rect.top == rect.bottom;
}

/// Keeps menu bars, and what lies in one, out of shares that are cut out by windows. It only knows the bars
/// that the walk has met so far: a window behind one is judged before.
class MenuBarRule {
public:
    /// Whether a window is kept, given the verdict of the lists.
    bool IsKept(const TVLRect& window, int level, bool isShared,
                const std::map<unsigned, TVLRect>& displays) {
        if (level == platform::CGWindowLevelForKey(platform::kCGMainMenuWindowLevelKey)) {
            if (!StartsADisplay(window, displays))
                return isShared;
            m_menuBars.push_back(window);
            return false;
        }
        return isShared && std::none_of(m_menuBars.begin(), m_menuBars.end(), [&](const TVLRect& bar) {
                   return !IsFlat(bar) && ShareUtil::Intersect(bar, window) == window;
               });
    }

private:
    static bool StartsADisplay(const TVLRect& window, const std::map<unsigned, TVLRect>& displays) {
        return std::any_of(displays.begin(), displays.end(), [&](const auto& display) {
            return display.second.left == window.left && display.second.top == window.top;
        });
    }

    std::vector<TVLRect> m_menuBars;
};

} // namespace

/// What holds for the whole of one walk, whatever a client changes meanwhile.
struct ShareCapturerContextMac::Walk {
    platform::CGSConnectionID connection = 0;
    SHARE_TYPE shareType = SHARE_TYPE_DESKTOP;
    bool excludesMenuBars = false;
    bool findsExposed = false;
    std::vector<unsigned> displays;
    TVLRegion rgnDisplay;
    MenuBarRule menuBars;
    bool isWhole = true; // false once a region could not be changed for want of memory
    bool isSure = true;  // false once a question was not answered

    void Need(bool done) { isWhole = isWhole && done; }
    /// Whether the question that gave `error` was answered.
    bool Told(platform::CGError error) {
        isSure = isSure && error == platform::kCGErrorSuccess;
        return error == platform::kCGErrorSuccess;
    }
    bool IsDesktop() const { return shareType == SHARE_TYPE_DESKTOP; }
    TVLRect DockBar(unsigned display) {
        platform::CGRect bar;
        isSure = ShareUtilMac::FindDockBarRect(display, bar) && isSure;
        return ShareUtilMac::CGRectToTVLRect(bar);
    }
};

struct ShareCapturerContextMac::WalkedWindow {
    unsigned id = SHARE_INVALID_WINDOW;
    bool bShared = false;
    int winLevel = -1;
    TVLRect rcWindow{};

    float Alpha(Walk& walk) const {
        float alpha = 1.0F;
        walk.Told(platform::CGSGetWindowAlpha(walk.connection, id, &alpha));
        return alpha;
    }
    /// Whether anything of it is in a picture of its display.
    bool GivesPixels(Walk& walk) const {
        platform::CGWindowSharingType state = platform::kCGWindowSharingNone;
        return walk.Told(platform::CGSGetSharingState(walk.connection, id, &state)) &&
               state != platform::kCGWindowSharingNone;
    }
    bool IsDock() const { return winLevel == platform::CGWindowLevelForKey(platform::kCGDockWindowLevelKey); }
};

int ShareCapturerContextMac::UpdateShareCapturerContext() {
    const unsigned flags = AppShareConfig::Instance()->m_nShareConfigFlags;
    if ((flags & SHARE_CONFIG_FLAG_NO_WINDOW_WALK) != 0) {
        m_nWalkedGeneration = 0;
        m_lastWalk.reset();
        return SHARE_RESULT_OK;
    }
    ShareDumpTimeUsage total;
    ShareDumpTimeUsage listing;
    WalkInputs inputs = _ReadInputs();
    ShareUtilMac::GetOnScreenWindowList(m_vOnScreen);
    const int listingTime = listing.Stop();
    inputs.moment = platform::CGSPinnedMoment();
    if (!_LastWalkStands(inputs)) {
        m_lastWalk.reset();
        if (_WalkOnScreen(inputs, listingTime))
            m_lastWalk = std::move(inputs);
    }
    if ((flags & SHARE_CONFIG_FLAG_PERFORMANCE_TRACE) != 0)
        CmTraceInfo("[Performance] UpdateShareCapturerContext total usageTime=", total.Stop());
    return SHARE_RESULT_FAILED;
}

bool ShareCapturerContextMac::DoesLastWalkStand() const {
    if (!m_lastWalk)
        return false;
    WalkInputs inputs = _ReadInputs();
    inputs.moment = platform::CGSCurrentMoment();
    return _LastWalkStands(inputs);
}

ShareCapturerContextMac::WalkInputs ShareCapturerContextMac::_ReadInputs() const {
    WalkInputs inputs;
    inputs.revision =
        Revision(); // first: what is read behind it may be newer, and the next walk is made then
    inputs.excludesMenuBars = !m_bNoWindowBaseArea && m_bExcludeMenuBar;
    inputs.findsExposed = m_bFindsExposed;
    inputs.appDisplayRule = AppDisplayRule::InForce();
    if (inputs.excludesMenuBars)
        inputs.menuBarDisplays = m_mapAppDisplayRects;
    return inputs;
}

bool ShareCapturerContextMac::_LastWalkStands(const WalkInputs& inputs) const {
    return m_lastWalk && *m_lastWalk == inputs && !CmTraceOn(CM_TRACE_DEBUG);
}

bool ShareCapturerContextMac::_WalkOnScreen(const WalkInputs& inputs, int listingTime) {
    ShareDumpTimeUsage step;
    Walk walk = _BeginWalk(inputs);
    const std::uint64_t generation = platform::PinnedWindowGeneration();
    CmTraceDetail("ShareCapturerContextMac::UpdateShareCapturerContext begin >> WindowsCount=",
                  m_vOnScreen.size());
    CmTraceDetail("UpdateShareCapturerContext init usageTime=", listingTime);

    CmTraceDetail("check windows: start >> ");
    m_paramSet.reset();
    m_nTopAppWindow = SHARE_INVALID_WINDOW;
    for (auto window = m_vOnScreen.rbegin(); window != m_vOnScreen.rend(); ++window)
        _WalkWindow(walk, static_cast<unsigned>(*window));
    step.Start();

    if (!walk.IsDesktop()) {
        _HideDocks(walk);
        CmTraceDetail("UpdateShareCapturerContext exclude dockbar usageTime=", step.Stop());
    }
    std::reverse(m_paramSet.vCapturedWindows.begin(), m_paramSet.vCapturedWindows.end());
    CmTraceDetail("UpdateShareCapturerContext reverse overlap windows usageTime=", step.Stop());
    _UniteKept(walk);
    _ClipToDisplays(walk);
    // A pin that has run out meanwhile answered for later windows than those that were listed, and without a
    // connection nothing was told of them.
    const bool isOfOneMoment = walk.connection != 0 && platform::PinnedWindowGeneration() == generation;
    m_nWalkedGeneration = walk.isWhole && isOfOneMoment ? generation : 0;
    if (!walk.isWhole)
        _ShowNothing();
    const bool areDisplaysSure = _UpdateAppsDisplay(m_paramSet, inputs.appDisplayRule);
    CmTraceDetail("UpdateShareCapturerContext _UpdateAppsDisplay windows usageTime=", step.Stop());
    const bool isPublished = _CommitParamSet(m_paramSet);
    _TraceFound();
    return walk.isWhole && walk.isSure && isOfOneMoment && areDisplaysSure && isPublished &&
           inputs.moment.windows != nullptr && platform::CGSPinnedMoment() == inputs.moment;
}

ShareCapturerContextMac::Walk ShareCapturerContextMac::_BeginWalk(const WalkInputs& inputs) const {
    Walk walk;
    walk.connection = platform::CGSDefaultConnection();
    walk.shareType = m_eShareType;
    walk.excludesMenuBars = !walk.IsDesktop() && inputs.excludesMenuBars;
    walk.findsExposed = inputs.findsExposed;
    const Guard lock(m_displayLock);
    walk.displays = m_vSharedDisplays;
    walk.rgnDisplay.CopyRgn(m_rgnDisplay);
    return walk;
}

void ShareCapturerContextMac::_WalkWindow(Walk& walk, unsigned id) {
    WalkedWindow window;
    window.id = id;
    window.bShared = __IsWindowShared(id, walk.isSure);
    walk.Told(platform::CGSGetWindowLevel(walk.connection, id, &window.winLevel));
    platform::CGRect frame;
    if (!walk.IsDesktop() && (window.IsDock() || ShareUtilMac::need_skip_window(id, window.winLevel))) {
        CmTraceDetail("check windows:", ",bShared=", window.bShared, ",oneWindow=", id,
                      ",winLevel=", window.winLevel, ",Skip");
        if (walk.findsExposed &&
            walk.Told(platform::CGSGetScreenRectForWindow(walk.connection, id, &frame))) {
            window.rcWindow = ShareUtilMac::CGRectToTVLRect(frame);
            _Expose(walk, window);
        }
        return;
    }
    walk.Told(platform::CGSGetScreenRectForWindow(walk.connection, id, &frame));
    window.rcWindow = ShareUtilMac::CGRectToTVLRect(frame);

    bool isKept = window.bShared;
    if (walk.excludesMenuBars)
        isKept = walk.menuBars.IsKept(window.rcWindow, window.winLevel, isKept, m_mapAppDisplayRects);
    if (isKept)
        _KeepWindow(walk, window);
    else
        _KeepOutWindow(walk, window);
    _TraceWindow(window);
}

void ShareCapturerContextMac::_KeepWindow(Walk& walk, WalkedWindow& window) {
    if (window.winLevel == 0)
        m_nTopAppWindow = window.id;
    m_paramSet.vCapturedWindows.push_back(window.id);
    // The Dock's window is larger than what it draws.
    if (walk.IsDesktop() && window.IsDock() && !walk.displays.empty())
        window.rcWindow = walk.DockBar(walk.displays.front());
    walk.Need(m_paramSet.rgnVisible.AddRect(window.rcWindow));
    walk.Need(m_paramSet.rgnOverlap.ExcludeRect(window.rcWindow));
    _CoverExposed(walk, window);
}

void ShareCapturerContextMac::_KeepOutWindow(Walk& walk, const WalkedWindow& window) {
    m_paramSet.vCapturedExcludedWindows.push_back(window.id);
    _Expose(walk, window);
    TVLRegion hidden;
    walk.Need(hidden.AddRect(window.rcWindow));
    walk.Need(hidden.CombineRgn(m_paramSet.rgnVisible, REGION_COMBINE_AND));
    if (hidden.IsEmpty())
        return;
    if (window.Alpha(walk) > 0)
        _HideVisible(walk, hidden);
}

void ShareCapturerContextMac::_Expose(Walk& walk, const WalkedWindow& window) {
    if (walk.findsExposed && window.Alpha(walk) > 0)
        walk.Need(m_paramSet.rgnExposed.AddRect(window.rcWindow));
}

void ShareCapturerContextMac::_CoverExposed(Walk& walk, const WalkedWindow& window) {
    if (!walk.findsExposed || m_paramSet.rgnExposed.IsEmpty())
        return;
    const bool isOpaque = !walk.IsDesktop() || window.Alpha(walk) >= 1.0F;
    if (isOpaque && window.GivesPixels(walk))
        walk.Need(m_paramSet.rgnExposed.ExcludeRect(window.rcWindow));
}

void ShareCapturerContextMac::_HideVisible(Walk& walk, const TVLRegion& hidden) {
    walk.Need(m_paramSet.rgnOverlap.CombineRgn(hidden, REGION_COMBINE_OR));
    walk.Need(m_paramSet.rgnVisible.CombineRgn(hidden, REGION_COMBINE_DIFF));
}

void ShareCapturerContextMac::_HideDocks(Walk& walk) {
    for (const unsigned display : walk.displays) {
        TVLRegion hidden;
        walk.Need(hidden.AddRect(walk.DockBar(display)));
        walk.Need(hidden.CombineRgn(m_paramSet.rgnVisible, REGION_COMBINE_AND));
        _HideVisible(walk, hidden);
    }
}

void ShareCapturerContextMac::_UniteKept(Walk& walk) {
    TVLRegion& kept = m_paramSet.rgnApplications;
    kept.CopyRgn(m_paramSet.rgnVisible);
    walk.Need(kept.CombineRgn(m_paramSet.rgnOverlap, REGION_COMBINE_OR));
    m_paramSet.rgnSharedWindow.CopyRgn(kept);
}

void ShareCapturerContextMac::_ClipToDisplays(Walk& walk) {
    for (TVLRegion* region : {&m_paramSet.rgnVisible, &m_paramSet.rgnSharedWindow, &m_paramSet.rgnOverlap,
                              &m_paramSet.rgnExposed})
        walk.Need(region->CombineRgn(walk.rgnDisplay, REGION_COMBINE_AND));
}

void ShareCapturerContextMac::_ShowNothing() {
    CmTraceError("ShareCapturerContextMac::UpdateShareCapturerContext fail no memory for the regions");
    m_paramSet.reset();
}

// ---- Traces: a region's text costs more than the region, so it is made only for who reads it.

void ShareCapturerContextMac::_TraceWindow(const WalkedWindow& window) const {
    if (!CmTraceOn(CM_TRACE_DETAIL))
        return;
    CmTraceDetail("check windows:", ",bShared=", window.bShared, ",oneWindow=", window.id,
                  ",winLevel=", window.winLevel, ",rcWindow=", ShareUtil::TVLRectToString(window.rcWindow));
    CmTraceDetail("check windows:m_rgnOverlap=", m_paramSet.rgnOverlap.ToString());
    CmTraceDetail("UpdateShareCapturerContext check one window's region, share=", window.bShared);
}

void ShareCapturerContextMac::_TraceFound() const {
    if (!CmTraceOn(CM_TRACE_DETAIL))
        return;
    // The lists have changed places with the published ones, the regions have been copied.
    std::vector<unsigned> captured;
    std::vector<unsigned> excluded;
    {
        const Guard lock(m_paramLock);
        captured = m_vCapturedWindows;
        excluded = m_vCapturedExcludedWindows;
    }
    constexpr const char* WALK = "ShareCapturerContextMac::UpdateShareCapturerContext";
    CmTraceDetail(WALK, ",m_rgnVisible=", m_paramSet.rgnVisible.ToString());
    CmTraceDetail(WALK, ",m_rgnApplications=", m_paramSet.rgnApplications.ToString());
    CmTraceDetail(WALK, ",m_rgnOverlap=", m_paramSet.rgnOverlap.ToString());
    CmTraceDetail(WALK, ",m_rgnSharedWindow=", m_paramSet.rgnSharedWindow.ToString());
    CmTraceDetail(WALK, ",m_vCapturedWindows.count=", captured.size(),
                  ",m_vCapturedExcludedWindows=", excluded.size());
    CmTraceDetail("ShareCapturerContextMac::UpdateShareCapturerContext end <<");
}
