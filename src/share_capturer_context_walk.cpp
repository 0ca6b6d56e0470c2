// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "platform/window_services.h"
#include "src/app_share_config.h"
#include "src/mac/share_util_mac.h"
#include "src/share_capturer_context.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstdint>
#include <optional>
#include <string>
#include <utility>

/// The side of the context that the window walk works with: verdicts, and what one walk finds.

namespace {

using Guard = std::lock_guard<std::recursive_mutex>;

bool Contains(const std::vector<unsigned>& values, unsigned value) {
    return std::find(values.begin(), values.end(), value) != values.end();
}

/// The display that has most of the share, by the box around what it has of it.
class BestDisplay {
public:
    void Consider(unsigned display, const TVLRect& box) {
        if (ShareUtil::Area(box) <= ShareUtil::Area(m_box))
            return;
        m_display = display;
        m_box = box;
    }
    unsigned Id() const { return m_display; }

private:
    unsigned m_display = SHARE_INVALID_DISPLAY;
    TVLRect m_box{};
};

/// Whether a list of displays has all of them, each with a place.
bool AreAllDisplays(const std::vector<ShareDisplayPlace>& displays) {
    std::uint32_t count = 0;
    return platform::CGGetOnlineDisplayList(0, nullptr, &count) == platform::kCGErrorSuccess &&
           count == displays.size() &&
           std::none_of(displays.begin(), displays.end(), [](const ShareDisplayPlace& display) {
               return display.rect.left == display.rect.right || display.rect.top == display.rect.bottom;
           });
}

/// Regions that were to be copied without memory have none.
bool HasShape(const TVLRegion& region) {
    TVLRect box{};
    return region.GetRgnBox(box);
}

void PutFirst(std::vector<unsigned>& displays, unsigned display) {
    const auto place = std::find(displays.begin(), displays.end(), display);
    if (place != displays.end())
        std::iter_swap(displays.begin(), place);
}

} // namespace

void ShareCapturerContext::ParamSet::reset() {
    for (TVLRegion* region : {&rgnOverlap, &rgnVisible, &rgnSharedWindow, &rgnApplications, &rgnExposed})
        region->SetRectRgn(0, 0, 0, 0);
    vCapturedWindows.clear();
    vCapturedExcludedWindows.clear();
    vAppDisplays.clear();
}

// ---- Verdicts

bool ShareCapturerContext::MayBeKeptOut(unsigned window) const {
    platform::CGSConnectionID owner = 0;
    pid_t pid = 0;
    const platform::CGSConnectionID connection = platform::CGSDefaultConnection();
    const platform::CGError error = platform::CGSGetWindowOwner(connection, window, &owner);
    if (error == platform::kCGErrorFailure)
        return false; // really nobody's
    if (error == platform::kCGErrorSuccess &&
        platform::CGSConnectionGetPID(owner, &pid) == platform::kCGErrorSuccess &&
        !IsAppUnShared(static_cast<unsigned>(pid)))
        return false;
    const Guard lock(m_paramLock);
    return !Contains(m_vSharedWindows, window);
}

void ShareCapturerContext::KeepShared(std::vector<int>& windows) const {
    const platform::CGSWindowOwners owners(platform::CGSDefaultConnection());
    const auto isKeptOut = [&](int id) {
        const auto window = static_cast<unsigned>(id);
        if (_IsWindowUnShared(window) || _IsWindowShared(window))
            return _IsWindowUnShared(window);
        platform::CGSConnectionID owner = 0;
        pid_t pid = 0;
        const platform::CGError error = owners.Get(window, &owner);
        if (error == platform::kCGErrorFailure)
            return !_IsAppShared(SHARE_INVALID_PROCESS); // really nobody's
        // Whose a window is that nothing is known of can't be told, so it may be somebody's who is kept out.
        return error != platform::kCGErrorSuccess ||
               platform::CGSConnectionGetPID(owner, &pid) != platform::kCGErrorSuccess ||
               !_IsAppShared(static_cast<unsigned>(pid)) || _IsAppUnShared(static_cast<unsigned>(pid));
    };
    const Guard lock(m_paramLock);
    windows.erase(std::remove_if(windows.begin(), windows.end(), isKeptOut), windows.end());
}

bool ShareCapturerContext::KeepsOut() const {
    return m_eShareType != SHARE_TYPE_DESKTOP || GetUnSharedWindowCount() > 0 || GetUnSharedAppCount() > 0;
}

bool ShareCapturerContext::IsFilterOutSystemProcess(unsigned) const {
    return false;
}

bool ShareCapturerContext::_IsWindowShared(unsigned window) const {
    return Contains(m_vSharedWindows, window);
}

bool ShareCapturerContext::_IsWindowUnShared(unsigned window) const {
    return Contains(m_vUnSharedWindows, window);
}

bool ShareCapturerContext::_IsAppShared(unsigned pid) const {
    if (m_eShareType != SHARE_TYPE_DESKTOP)
        return Contains(m_vSharedApps, pid);
    return !_IsAppUnShared(pid);
}

bool ShareCapturerContext::_IsAppUnShared(unsigned pid) const {
    return Contains(m_vUnSharedApps, pid) || IsFilterOutSystemProcess(pid);
}

std::optional<bool> ShareCapturerContext::_WindowListsVerdict(unsigned window) const {
    const Guard lock(m_paramLock);
    if (_IsWindowUnShared(window))
        return false;
    if (_IsWindowShared(window))
        return true;
    return std::nullopt;
}

bool ShareCapturerContext::__IsWindowShared(unsigned window) const {
    bool isSure = true;
    return __IsWindowShared(window, isSure);
}

bool ShareCapturerContext::__IsWindowShared(unsigned window, bool& isSure) const {
    if (const std::optional<bool> verdict = _WindowListsVerdict(window))
        return *verdict;
    unsigned pid = SHARE_INVALID_PROCESS;
    isSure = ShareUtil::FindPIDOfWindowHandle(window, pid) && isSure;
    // The lists may have changed meanwhile. If only the application's were read here, a window that a client
    // has just taken over from an unshared application to the unshared windows would pass between the two.
    const Guard lock(m_paramLock);
    if (const std::optional<bool> verdict = _WindowListsVerdict(window))
        return *verdict;
    return _IsAppShared(pid);
}

bool ShareCapturerContext::IsAppShared(unsigned pid) const {
    const Guard lock(m_paramLock);
    return _IsAppShared(pid);
}

bool ShareCapturerContext::IsAppUnShared(unsigned pid) const {
    const Guard lock(m_paramLock);
    return _IsAppUnShared(pid);
}

bool ShareCapturerContext::IsWindowShared(unsigned window) const {
    return __IsWindowShared(window);
}

bool ShareCapturerContext::IsWindowUnShared(unsigned window) const {
    {
        const Guard lock(m_paramLock);
        if (_IsWindowUnShared(window))
            return true;
    }
    const unsigned pid = ShareUtil::GetPIDOfWindowHandle(window);
    const Guard lock(m_paramLock);
    return _IsWindowUnShared(window) || _IsAppUnShared(pid) || !_IsAppShared(pid);
}

// ---- What a walk finds

int ShareCapturerContext::GetCapturedWindows(std::vector<unsigned>& windows) const {
    std::vector<unsigned> captured;
    unsigned mainDisplay = SHARE_INVALID_DISPLAY;
    {
        const Guard lock(m_paramLock);
        if (m_vAppDisplays.size() < 2) {
            windows = m_vCapturedWindows;
            return SHARE_RESULT_OK;
        }
        captured = m_vCapturedWindows;
        mainDisplay = m_vAppDisplays.front();
    }
    std::copy_if(
        captured.begin(), captured.end(), std::back_inserter(windows),
        [mainDisplay](unsigned window) { return ShareUtil::GetWindowDisplayID(window) == mainDisplay; });
    return SHARE_RESULT_OK;
}

ShareCapturerContext::AppDisplayRule ShareCapturerContext::AppDisplayRule::InForce() {
    const AppShareConfig& config = *AppShareConfig::Instance();
    return {(config.m_nShareConfigFlags & SHARE_CONFIG_FLAG_APP_DISPLAYS_AS_SET) != 0,
            config.m_bAppDisplayByWindow};
}

bool ShareCapturerContext::_UpdateAppsDisplay(ParamSet& found, const AppDisplayRule& rule) {
    if (m_eShareType == SHARE_TYPE_DESKTOP || rule.areAsSet) {
        const Guard lock(m_displayLock);
        found.vAppDisplays = m_vSharedDisplays;
        m_mapAppDisplayRects = m_mapDisplayRects;
        return true;
    }
    const std::vector<ShareDisplayPlace> displays = ListDisplayPlaces();
    if (displays.empty())
        return false;
    bool isSure = AreAllDisplays(displays);
    std::map<unsigned, TVLRect> rects;
    std::vector<unsigned> covered;
    BestDisplay best;
    for (const ShareDisplayPlace& display : displays) {
        rects[display.id] = display.rect;
        const TVLRect box = _AppBoxOnDisplay(display.rect, found.rgnApplications, isSure);
        best.Consider(display.id, box);
        if (box.right > box.left && box.bottom > box.top)
            covered.push_back(display.id);
    }
    m_mapAppDisplayRects.swap(rects);
    found.vAppDisplays.swap(covered);
    if (!rule.isByTopWindow) {
        PutFirst(found.vAppDisplays, best.Id());
    } else if (const unsigned top = m_nTopAppWindow; top != SHARE_INVALID_WINDOW) {
        const std::optional<unsigned> display = FindWindowDisplay(top, displays);
        isSure = isSure && display;
        PutFirst(found.vAppDisplays, display.value_or(displays.front().id));
    }
    return isSure;
}

TVLRect ShareCapturerContext::_AppBoxOnDisplay(const TVLRect& display, const TVLRegion& applications,
                                               bool& isSure) const {
    TVLRegion onDisplay;
    isSure = onDisplay.AddRect(display) && isSure;
    if (CmTraceOn(CM_TRACE_DETAIL)) {
        TVLRegion published;
        {
            const Guard lock(m_paramLock);
            published.CopyRgn(m_rgnApplications);
        }
        CmTraceDetail("ShareCapturerContext::_UpdateAppsDisplay",
                      ",rcDisplay=", ShareUtil::TVLRectToString(display),
                      ",rgnOneDisplay=", onDisplay.ToString(), ",m_rgnApplications=", published.ToString());
    }
    isSure = onDisplay.CombineRgn(applications, REGION_COMBINE_AND) && isSure;
    if (CmTraceOn(CM_TRACE_DETAIL))
        CmTraceDetail("ShareCapturerContext::_UpdateAppsDisplay after AND",
                      ",rgnOneDisplay=", onDisplay.ToString());
    TVLRect box{};
    onDisplay.GetRgnBox(box);
    return box;
}

bool ShareCapturerContext::_CommitParamSet(ParamSet& found) {
    bool isOnOtherDisplays = false;
    bool isWhole = true;
    {
        const Guard lock(m_paramLock);
        m_rgnOverlap.CopyRgn(found.rgnOverlap);
        m_rgnVisible.CopyRgn(found.rgnVisible);
        m_rgnSharedWindow.CopyRgn(found.rgnSharedWindow);
        m_rgnApplications.CopyRgn(found.rgnApplications);
        m_rgnExposed.CopyRgn(found.rgnExposed);
        for (const TVLRegion* region :
             {&m_rgnOverlap, &m_rgnVisible, &m_rgnSharedWindow, &m_rgnApplications, &m_rgnExposed})
            isWhole = HasShape(*region) && isWhole;
        m_vCapturedWindows.swap(found.vCapturedWindows);
        m_vCapturedExcludedWindows.swap(found.vCapturedExcludedWindows);
        isOnOtherDisplays = m_vAppDisplays != found.vAppDisplays;
        m_vAppDisplays.swap(found.vAppDisplays);
        ++m_nPublications;
    }
    if (!isOnOtherDisplays)
        return isWhole;
    std::vector<unsigned> displays;
    GetAppMonitors(displays);
    std::string text;
    for (const unsigned display : displays)
        text += std::to_string(display) + ",";
    CmTraceDetail("ShareCapturerContext::_CommitParamSet, shared display:", text);
    return isWhole;
}
