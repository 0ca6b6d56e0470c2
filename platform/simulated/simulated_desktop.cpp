// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_desktop.h"

#include <algorithm>
#include <string_view>
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

const DisplayInfo* Find(const DisplayList& displays, CGDirectDisplayID id) {
    const auto found =
        std::find_if(displays.begin(), displays.end(), [id](const auto& each) { return each.id == id; });
    return found != displays.end() ? &*found : nullptr;
}

bool IsMain(const DisplayList& displays, CGDirectDisplayID id) {
    return !displays.empty() && displays.front().id == id;
}

unsigned ChangesOf(const DisplayInfo& before, const DisplayInfo& after) {
    unsigned flags = 0;
    if (before.bounds.origin != after.bounds.origin)
        flags |= DisplayMoved | DisplayDesktopShapeChanged;
    if (before.bounds.size != after.bounds.size)
        flags |= DisplaySetMode | DisplayDesktopShapeChanged;
    if (before.scale != after.scale)
        flags |= DisplaySetMode;
    return flags;
}

Notice DisplayNotice(CGDirectDisplayID display, unsigned flags) {
    Notice notice;
    notice.kind = NoticeKind::DisplayChanged;
    notice.display = display;
    notice.flags = flags;
    return notice;
}

bool Lists(const ApplicationList& applications, pid_t pid) {
    return std::any_of(applications.begin(), applications.end(),
                       [pid](const ApplicationInfo& each) { return each.pid == pid; });
}

/// How many bytes the character at the beginning takes; 0 when there is none that UTF-8 allows.
std::size_t LengthOfCharacter(std::string_view text) {
    const auto byte = [text](std::size_t place) { return static_cast<unsigned char>(text[place]); };
    const unsigned first = byte(0);
    if (first < 0x80)
        return 1;
    const std::size_t length = first >= 0xF0 ? 4 : first >= 0xE0 ? 3 : 2;
    if (first < 0xC2 || first > 0xF4 || text.size() < length)
        return 0;
    for (std::size_t place = 1; place < length; ++place) {
        if ((byte(place) & 0xC0) != 0x80)
            return 0;
    }
    // Overlong forms, surrogates, and what lies beyond the last character.
    const unsigned second = byte(1);
    const bool wrong = (first == 0xE0 && second < 0xA0) || (first == 0xED && second > 0x9F) ||
                       (first == 0xF0 && second < 0x90) || (first == 0xF4 && second > 0x8F);
    return wrong ? 0 : length;
}

/// Each byte that is no part of a character becomes the sign for that.
void MendText(std::string& text) {
    std::string mended;
    for (std::string_view rest = text; !rest.empty();) {
        const std::size_t length = LengthOfCharacter(rest);
        mended += length != 0 ? rest.substr(0, length) : "\xEF\xBF\xBD";
        rest.remove_prefix(std::max<std::size_t>(length, 1));
    }
    text = std::move(mended);
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

/// A notice for each of `some` that isn't among `others`.
void AddNotices(std::vector<Notice>& notices, NoticeKind kind, const ApplicationList& some,
                const ApplicationList& others) {
    for (const ApplicationInfo& application : some) {
        if (Lists(others, application.pid))
            continue;
        Notice notice;
        notice.kind = kind;
        notice.pid = application.pid;
        notices.push_back(notice);
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

std::vector<Notice> DisplayNotices(const DisplayList& before, const DisplayList& after) {
    std::vector<Notice> notices;
    for (const DisplayInfo& display : before) {
        if (Find(after, display.id) == nullptr)
            notices.push_back(DisplayNotice(display.id, DisplayRemoved | DisplayDisabled));
    }
    for (const DisplayInfo& display : after) {
        const DisplayInfo* const former = Find(before, display.id);
        unsigned flags = former != nullptr ? ChangesOf(*former, display) : DisplayAdded | DisplayEnabled;
        if (IsMain(after, display.id) && !IsMain(before, display.id))
            flags |= DisplaySetMain;
        if (flags != 0)
            notices.push_back(DisplayNotice(display.id, flags));
    }
    return notices;
}

std::vector<Notice> ApplicationNotices(const ApplicationList& before, const ApplicationList& after) {
    std::vector<Notice> notices;
    AddNotices(notices, NoticeKind::ApplicationEnded, before, after);
    AddNotices(notices, NoticeKind::ApplicationLaunched, after, before);
    return notices;
}

bool SameStack(const std::vector<WindowInfo>& one, const std::vector<WindowInfo>& other) {
    return std::equal(one.begin(), one.end(), other.begin(), other.end(), SameInStack);
}

} // namespace platform
