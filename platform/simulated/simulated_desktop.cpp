// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_desktop.h"

#include "platform/utf8.h"

#include <algorithm>
#include <utility>

namespace platform {

namespace {

using Windows = std::vector<SimulatedWindow>;

Windows::iterator PlaceOf(Windows& windows, CGWindowID id) {
    return std::find_if(windows.begin(), windows.end(),
                        [id](const SimulatedWindow& each) { return each.info.id == id; });
}

std::optional<SimulatedWindow> TakeOut(SimulatedDesktop& desktop, CGWindowID id) {
    const auto place = PlaceOf(desktop.windows, id);
    if (place == desktop.windows.end())
        return std::nullopt;
    SimulatedWindow window = std::move(*place);
    desktop.windows.erase(place);
    return window;
}

CGRect Inside(const CGRect& rect, const SimulatedEdges& edges) {
    return {{rect.origin.x + edges.left, rect.origin.y + edges.top},
            {std::max(0.0F, rect.size.width - edges.left - edges.right),
             std::max(0.0F, rect.size.height - edges.top - edges.bottom)}};
}

void Move(CGPoint& point, float x, float y) {
    point.x += x;
    point.y += y;
}

void MendText(std::string& text) {
    text = MendedUtf8(text);
}

void MendName(std::string& name, const char* other) {
    MendText(name);
    if (name.empty())
        name = other;
}

void MendIds(std::vector<SimulatedDisplay>& displays) {
    constexpr CGDirectDisplayID ALL_BITS = ~CGDirectDisplayID{0};
    CGDirectDisplayID last = 0;
    for (const SimulatedDisplay& display : displays)
        last = display.id != ALL_BITS ? std::max(last, display.id) : last;
    for (SimulatedDisplay& display : displays) {
        if (display.id == 0 || display.id == ALL_BITS)
            display.id = ++last;
    }
}

bool SameInStack(const WindowInfo& one, const WindowInfo& other) {
    return one.id == other.id && one.owner == other.owner && one.level == other.level &&
           one.alpha == other.alpha && one.frame == other.frame && one.sharing == other.sharing &&
           one.onScreen == other.onScreen;
}

} // namespace

SimulatedDisplay* FindDisplay(SimulatedDesktop& desktop, CGDirectDisplayID id) {
    const auto found = std::find_if(desktop.displays.begin(), desktop.displays.end(),
                                    [id](const SimulatedDisplay& each) { return each.id == id; });
    return found != desktop.displays.end() ? &*found : nullptr;
}

SimulatedWindow* FindWindow(SimulatedDesktop& desktop, CGWindowID id) {
    const auto place = PlaceOf(desktop.windows, id);
    return place != desktop.windows.end() ? &*place : nullptr;
}

void PutAtFrontOfItsLevel(SimulatedDesktop& desktop, SimulatedWindow window) {
    const int level = window.info.level;
    const auto place =
        std::find_if(desktop.windows.begin(), desktop.windows.end(),
                     [level](const SimulatedWindow& each) { return each.info.level <= level; });
    desktop.windows.insert(place, std::move(window));
}

bool RaiseInItsLevel(SimulatedDesktop& desktop, CGWindowID id) {
    std::optional<SimulatedWindow> window = TakeOut(desktop, id);
    if (!window)
        return false;
    PutAtFrontOfItsLevel(desktop, std::move(*window));
    return true;
}

bool LowerInItsLevel(SimulatedDesktop& desktop, CGWindowID id) {
    std::optional<SimulatedWindow> window = TakeOut(desktop, id);
    if (!window)
        return false;
    const int level = window->info.level;
    const auto place = std::find_if(desktop.windows.begin(), desktop.windows.end(),
                                    [level](const SimulatedWindow& each) { return each.info.level < level; });
    desktop.windows.insert(place, std::move(*window));
    return true;
}

bool PutAbove(SimulatedDesktop& desktop, CGWindowID id, CGWindowID below) {
    if (id == below || FindWindow(desktop, below) == nullptr)
        return false;
    std::optional<SimulatedWindow> window = TakeOut(desktop, id);
    if (!window)
        return false;
    desktop.windows.insert(PlaceOf(desktop.windows, below), std::move(*window));
    return true;
}

bool RaiseWindowsOf(SimulatedDesktop& desktop, pid_t pid) {
    std::vector<CGWindowID> backFirst;
    std::for_each(desktop.windows.rbegin(), desktop.windows.rend(), [&](const SimulatedWindow& each) {
        if (each.info.owner == pid)
            backFirst.push_back(each.info.id);
    });
    for (const CGWindowID id : backFirst)
        RaiseInItsLevel(desktop, id);
    return !backFirst.empty();
}

void Mend(SimulatedDesktop& desktop) {
    MendIds(desktop.displays);
    for (SimulatedDisplay& display : desktop.displays) {
        MendName(display.name, "Simulated Display");
        display.scale = display.scale > 0 ? display.scale : 1.0F;
    }
    for (SimulatedWindow& window : desktop.windows) {
        MendText(window.info.title);
        window.info.alpha = window.info.alpha > 0 ? std::min(window.info.alpha, 1.0F) : 0.0F;
    }
    for (ApplicationInfo& application : desktop.applications) {
        MendName(application.name, "Simulated Application");
        MendText(application.fileName);
    }
}

void MoveOriginToMainDisplay(SimulatedDesktop& desktop) {
    const auto first = std::find_if(desktop.displays.begin(), desktop.displays.end(),
                                    [](const SimulatedDisplay& each) { return each.mirrors == 0; });
    if (first == desktop.displays.end() || first->bounds.origin == CGPoint{})
        return;
    const CGPoint main = first->bounds.origin;
    for (SimulatedDisplay& display : desktop.displays)
        Move(display.bounds.origin, -main.x, -main.y);
    for (SimulatedWindow& window : desktop.windows)
        Move(window.info.frame.origin, -main.x, -main.y);
    if (desktop.pointer)
        Move(*desktop.pointer, -main.x, -main.y);
}

DisplayList ListDisplays(const SimulatedDesktop& desktop) {
    DisplayList list;
    for (const SimulatedDisplay& display : desktop.displays) {
        if (display.mirrors != 0)
            continue;
        list.push_back({display.id, display.bounds, Inside(display.bounds, display.reserved), display.scale,
                        display.name});
    }
    return list;
}

bool SameStack(const std::vector<WindowInfo>& one, const std::vector<WindowInfo>& other) {
    return std::equal(one.begin(), one.end(), other.begin(), other.end(), SameInStack);
}

} // namespace platform
