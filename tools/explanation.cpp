// SPDX-License-Identifier: Apache-2.0
#include "tools/explanation.h"

#include "src/mac/share_capturer_context_mac.h"

#include <algorithm>
#include <cstddef>
#include <mutex>
#include <optional>

namespace {

bool IsAtLevel(const platform::CGWindowDescription& window, platform::CGWindowLevelKey key) {
    return window.kCGWindowLayer == platform::CGWindowLevelForKey(key);
}

/// The context of a share, with a view of what decided.
class ExplainingContext : public ShareCapturerContextMac {
public:
    void Take(const ShareRequest& request) {
        for (const unsigned monitor : SharedMonitorsOf(request))
            AddSharedDisplay(monitor);
        for (const unsigned pid : request.apps)
            AddSharedApp(pid);
        for (const unsigned window : request.windows)
            AddSharedWindow(window);
        if (!request.windows.empty())
            SetShareType(SHARE_TYPE_WINDOW);
        for (const unsigned pid : request.excludedApps)
            AddUnSharedApp(pid);
        for (const unsigned window : request.excludedWindows)
            AddUnSharedWindow(window);
        m_bNoWindowBaseArea = !request.excludesMenuBars;
        m_bExcludeMenuBar = request.excludesMenuBars;
    }

    ExplainedWindow Judge(const platform::CGWindowDescription& window) const {
        std::vector<unsigned> kept;
        std::vector<unsigned> keptOut;
        {
            // The getter leaves out what lies on other displays than the share's main one.
            const std::lock_guard<std::recursive_mutex> lock(m_paramLock);
            kept = m_vCapturedWindows;
            keptOut = m_vCapturedExcludedWindows;
        }
        if (Contains(kept, window.kCGWindowNumber))
            return {window, WindowVerdict::Kept, WhyKept(window)};
        if (Contains(keptOut, window.kCGWindowNumber))
            return {window, WindowVerdict::KeptOut, WhyKeptOut(window)};
        if (!IsDesktop() && IsAtLevel(window, platform::kCGDockWindowLevelKey))
            return {window, WindowVerdict::Skipped, "Dock level: the Dock's edge is taken out as a whole"};
        if (!IsDesktop() && window.kCGWindowLayer < 0)
            return {window, WindowVerdict::Skipped, "level below 0: part of the desktop itself"};
        return {window, WindowVerdict::Missed, "it came or went while the windows were walked over"};
    }

private:
    /// A share of applications or windows lies on whatever monitor they lie on.
    static std::vector<unsigned> SharedMonitorsOf(const ShareRequest& request) {
        if (request.monitor)
            return {*request.monitor};
        std::vector<unsigned> monitors;
        for (const ListedMonitor& monitor : ListMonitors())
            monitors.push_back(monitor.id);
        return monitors;
    }

    bool IsDesktop() const { return GetShareType() == SHARE_TYPE_DESKTOP; }

    std::string WhyKept(const platform::CGWindowDescription& window) const {
        std::string reason = "shared application";
        if (_WindowListsVerdict(window.kCGWindowNumber) == true)
            reason = "shared window";
        else if (IsDesktop())
            reason = "desktop, not excluded";
        if (IsDesktop() && IsAtLevel(window, platform::kCGDockWindowLevelKey))
            reason += "; as the Dock's edge";
        if (window.kCGWindowSharingState == platform::kCGWindowSharingNone)
            reason += "; gives no pixels out";
        if (window.kCGWindowAlpha < 1)
            reason += "; what is behind shines through";
        return reason;
    }

    std::string WhyKeptOut(const platform::CGWindowDescription& window) const {
        std::string reason = WhatKeepsOut(window);
        if (window.kCGWindowAlpha <= 0)
            reason += "; transparent";
        return reason;
    }

    std::string WhatKeepsOut(const platform::CGWindowDescription& window) const {
        const std::optional<bool> byWindow = _WindowListsVerdict(window.kCGWindowNumber);
        if (byWindow == false)
            return "unshared window";
        const auto pid = static_cast<unsigned>(window.kCGWindowOwnerPID);
        if (byWindow == true || IsAppShared(pid)) {
            return IsAtLevel(window, platform::kCGMainMenuWindowLevelKey)
                       ? "menu bar rule: a menu bar"
                       : "menu bar rule: it lies in a menu bar";
        }
        if (IsAppUnShared(pid))
            return "unshared application";
        return "neither it nor its application is shared";
    }
};

std::string Joined(const char* word, const std::vector<unsigned>& values) {
    std::string text = word;
    text += values.size() == 1 ? " " : "s ";
    for (std::size_t i = 0; i < values.size(); ++i)
        text += (i == 0 ? "" : ", ") + std::to_string(values[i]);
    return text;
}

std::string TitleOf(const ShareRequest& request) {
    if (request.monitor)
        return Joined("Share of monitor", {*request.monitor});
    if (request.windows.empty())
        return Joined("Share of application", request.apps);
    return Joined("Share of window", request.windows);
}

std::string KeptOutBy(const ShareRequest& request) {
    std::string text;
    const auto add = [&text](const std::string& part) { text += (text.empty() ? "" : "; ") + part; };
    if (!request.excludedApps.empty())
        add(Joined("application", request.excludedApps));
    if (!request.excludedWindows.empty())
        add(Joined("window", request.excludedWindows));
    if (request.excludesMenuBars)
        add("menu bars");
    return text;
}

using RegionGetter = int (ShareCapturerContext::*)(TVLRegion&) const;

std::vector<TVLRect> RectsOf(const ShareCapturerContext& context, RegionGetter get) {
    TVLRegion region;
    std::vector<TVLRect> rects;
    (context.*get)(region);
    region.GetRects(rects);
    return rects;
}

} // namespace

Explanation Explain(const ShareRequest& request) {
    ExplainingContext context;
    context.Take(request);
    // A first walk finds the displays by whose corners the second one knows a menu bar.
    context.UpdateShareCapturerContext();
    context.UpdateShareCapturerContext();

    Explanation explanation;
    explanation.title = TitleOf(request);
    explanation.keptOut = KeptOutBy(request);
    explanation.monitors = ListMonitors();
    context.GetSharedMonitors(explanation.sharedMonitors);
    for (const platform::CGWindowDescription& window : ListWindows())
        explanation.windows.push_back(context.Judge(window));
    explanation.visible = RectsOf(context, &ShareCapturerContext::GetVisiableRegion);
    explanation.overlap = RectsOf(context, &ShareCapturerContext::GetOverlapRegion);
    explanation.background = RectsOf(context, &ShareCapturerContext::GetBackgroundInvisiableRegion);
    return explanation;
}

const char* VerdictText(WindowVerdict verdict) {
    switch (verdict) {
        case WindowVerdict::Kept:
            return "kept";
        case WindowVerdict::KeptOut:
            return "kept out";
        case WindowVerdict::Skipped:
            return "passed over";
        case WindowVerdict::Missed:
            break;
    }
    return "not judged";
}
