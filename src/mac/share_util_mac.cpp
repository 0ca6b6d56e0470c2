// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_util_mac.h"

#include "platform/app_kit.h"
#include "platform/core_graphics.h"
#include "platform/window_services.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/share_util.h"
#include "util/cm_numeric.h"
#include "util/cm_text_formator.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstddef>
#include <map>
#include <optional>

namespace {

/// Windows may appear between the question for their number and the one for their list.
constexpr int LIST_SLACK = 8;

/// Keeps the display with the largest piece seen so far; of equal ones the first.
class LargestPiece {
public:
    explicit LargestPiece(unsigned displayWhenNone) : m_display(displayWhenNone) {}

    void Consider(unsigned display, const TVLRect& displayRect, const TVLRect& window) {
        const int area = ShareUtil::Area(ShareUtil::Intersect(displayRect, window));
        if (area <= m_area)
            return;
        m_area = area;
        m_display = display;
    }
    unsigned Display() const { return m_display; }

private:
    unsigned m_display;
    int m_area = 0;
};

bool FindWindowRect(unsigned window, TVLRect& rect) {
    platform::CGRect frame;
    if (platform::CGSGetScreenRectForWindow(platform::CGSDefaultConnection(), window, &frame) !=
        platform::kCGErrorSuccess)
        return false;
    rect = ShareUtilMac::CGRectToTVLRect(frame);
    return true;
}

unsigned LargestPieceOf(const TVLRect& rect, const std::vector<ShareDisplayPlace>& displays,
                        unsigned displayWhenNone) {
    LargestPiece largest(displayWhenNone);
    for (const ShareDisplayPlace& display : displays)
        largest.Consider(display.id, display.rect, rect);
    return largest.Display();
}

/// 0 when the process has none.
platform::CGSConnectionID ConnectionOfProcess(int pid) {
    platform::ProcessSerialNumber process;
    platform::CGSConnectionID connection = 0;
    if (platform::GetProcessForPID(pid, &process) == platform::noErr)
        platform::CGSGetConnectionIDForPSN(platform::CGSDefaultConnection(), &process, &connection);
    return connection;
}

bool IsOwnedBy(platform::CGSConnectionID connection, unsigned window) {
    platform::CGSConnectionID owner = 0;
    return platform::CGSGetWindowOwner(platform::CGSDefaultConnection(), window, &owner) ==
               platform::kCGErrorSuccess &&
           owner == connection;
}

int ListInto(platform::CGSConnectionID connection, std::vector<int>& windows, int size) {
    windows.assign(static_cast<std::size_t>(size), 0);
    int read = 0;
    platform::CGSGetOnScreenWindowList(connection, 0, size, windows.data(), &read);
    return read;
}

} // namespace

TVLRect ShareUtilMac::CGRectToTVLRect(const platform::CGRect& rect) {
    const int left = CmTruncate(rect.origin.x);
    const int top = CmTruncate(rect.origin.y);
    return {left, top, CmTruncate(static_cast<float>(left) + rect.size.width),
            CmTruncate(static_cast<float>(top) + rect.size.height)};
}

platform::CGRect ShareUtilMac::TVLRectToCGRect(const TVLRect& rect) {
    return {{static_cast<float>(rect.left), static_cast<float>(rect.top)},
            {static_cast<float>(ShareUtil::Extent(rect.left, rect.right)),
             static_cast<float>(ShareUtil::Extent(rect.top, rect.bottom))}};
}

bool ShareUtilMac::RectIsEqual(const TVLRect& rect, const platform::CGRect& cgRect) {
    return rect == CGRectToTVLRect(cgRect);
}

std::string ShareUtilMac::CGRectToString(const platform::CGRect& rect) {
    char buffer[128];
    CCmTextFormator text(buffer, sizeof buffer);
    text << "{x=" << rect.origin.x << " y=" << rect.origin.y << " w=" << rect.size.width
         << " h=" << rect.size.height << "}";
    return buffer;
}

void ShareUtilMac::GetRGBfromInt(int colour, float& red, float& green, float& blue) {
    const auto channel = [colour](int shift) { return static_cast<float>((colour >> shift & 255) / 255.0); };
    red = channel(16);
    green = channel(8);
    blue = channel(0);
}

int ShareUtilMac::GetOnScreenWindowList(std::vector<int>& windows) {
    const platform::CGSConnectionID connection = platform::CGSDefaultConnection();
    int count = 0;
    platform::CGSGetOnScreenWindowCount(connection, 0, &count);
    int size = count + LIST_SLACK;
    int read = ListInto(connection, windows, size);
    if (read > size) {
        size = read + LIST_SLACK;
        read = ListInto(connection, windows, size);
    }
    if (read > size)
        CmTraceWarning("GetOnScreenWindowList incorrect windows list count", ", windowCount=", size,
                       ", windowCountRead=", read);
    const int listed = std::min(size, read);
    windows.resize(static_cast<std::size_t>(listed));
    return listed;
}

bool ShareUtilMac::need_skip_window(unsigned, int level) {
    return level < 0;
}

bool ShareUtilMac::need_skip_window(unsigned window) {
    int level = -1;
    platform::CGSGetWindowLevel(platform::CGSDefaultConnection(), window, &level);
    return need_skip_window(window, level);
}

platform::CGRect ShareUtilMac::GetMenuBarRect(unsigned display) {
    const std::optional<platform::NSScreen> screen = CMonitorEnumMac::screenForDisplayID(display);
    if (!screen)
        return {};
    const platform::CGRect visible = screen->visibleFrame();
    platform::CGRect bar = platform::CGDisplayBounds(display);
    bar.size.height = bar.size.height - visible.size.height - visible.origin.y;
    return bar;
}

platform::CGRect ShareUtilMac::GetDockBarRect(unsigned display) {
    platform::CGRect bar;
    FindDockBarRect(display, bar);
    return bar;
}

bool ShareUtilMac::FindDockBarRect(unsigned display, platform::CGRect& bar) {
    bar = {};
    const std::optional<platform::NSScreen> screen = CMonitorEnumMac::screenForDisplayID(display);
    if (!screen)
        return false;
    const platform::CGRect visible = screen->visibleFrame();
    const platform::CGRect bounds = platform::CGDisplayBounds(display);
    const float mainHeight = platform::CGDisplayBounds(platform::CGMainDisplayID()).size.height;
    // A screen counts from the bottom of the main display, the window server from its top.
    const float top = mainHeight - visible.origin.y - visible.size.height;
    if (visible.size.width != bounds.size.width) {
        const bool isAtTheRight = visible.origin.x == bounds.origin.x;
        bar = {{isAtTheRight ? visible.origin.x + visible.size.width : bounds.origin.x, top},
               {bounds.size.width - visible.size.width, visible.size.height}};
    } else {
        const float y = top + visible.size.height;
        bar = {{bounds.origin.x, y}, {bounds.size.width, bounds.origin.y + bounds.size.height - y}};
    }
    return bounds.size.width > 0 && mainHeight > 0;
}

std::vector<ShareDisplayPlace> ListDisplayPlaces() {
    CMonitorEnumMac monitors(true);
    monitors.Refresh();
    int count = 0;
    monitors.GetNumber(count);
    std::vector<ShareDisplayPlace> displays;
    // With the room made here nothing throws while a source is held.
    displays.reserve(static_cast<std::size_t>(count));
    for (int i = 0; i < count; ++i) {
        IShareSource* source = nullptr;
        if (monitors.GetSource(i, &source) != SHARE_RESULT_OK || source == nullptr)
            continue;
        displays.push_back(
            {static_cast<unsigned>(source->GetSourceUniqueId()), source->GetSourceRect(false)});
        source->Release();
    }
    return displays;
}

unsigned GetAppDisplayID(int pid) {
    const unsigned mainDisplay = platform::CGMainDisplayID();
    std::map<unsigned, TVLRect> displays;
    for (const ShareDisplayPlace& display : ListDisplayPlaces())
        displays.emplace(display.id, display.rect);
    if (displays.size() < 2)
        return mainDisplay;
    const platform::CGSConnectionID connection = ConnectionOfProcess(pid);
    if (connection == 0)
        return mainDisplay;
    std::vector<int> windows;
    ShareUtilMac::GetOnScreenWindowList(windows);
    LargestPiece largest(mainDisplay);
    for (const int listed : windows) {
        const auto window = static_cast<unsigned>(listed);
        if (!IsOwnedBy(connection, window))
            continue;
        TVLRect rect{};
        ShareUtil::GetWindowRect(window, rect);
        for (const auto& display : displays)
            largest.Consider(display.first, display.second, rect);
    }
    return largest.Display();
}

unsigned GetWindowDisplayID(unsigned window) {
    const unsigned mainDisplay = platform::CGMainDisplayID();
    TVLRect rect{};
    return FindWindowRect(window, rect) ? LargestPieceOf(rect, ListDisplayPlaces(), mainDisplay)
                                        : mainDisplay;
}

std::optional<unsigned> FindWindowDisplay(unsigned window, const std::vector<ShareDisplayPlace>& displays) {
    TVLRect rect{};
    if (displays.empty() || !FindWindowRect(window, rect))
        return std::nullopt;
    return LargestPieceOf(rect, displays, displays.front().id);
}
