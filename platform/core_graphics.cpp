// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"

#include "platform/notices.h"
#include "platform/window_server.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <limits>
#include <memory>

namespace platform {

namespace {

static_assert(static_cast<unsigned>(kCGDisplayMovedFlag) == DisplayMoved &&
                  static_cast<unsigned>(kCGDisplaySetMainFlag) == DisplaySetMain &&
                  static_cast<unsigned>(kCGDisplaySetModeFlag) == DisplaySetMode &&
                  static_cast<unsigned>(kCGDisplayAddFlag) == DisplayAdded &&
                  static_cast<unsigned>(kCGDisplayRemoveFlag) == DisplayRemoved &&
                  static_cast<unsigned>(kCGDisplayEnabledFlag) == DisplayEnabled &&
                  static_cast<unsigned>(kCGDisplayDisabledFlag) == DisplayDisabled &&
                  static_cast<unsigned>(kCGDisplayDesktopShapeChangedFlag) == DisplayDesktopShapeChanged,
              "flags pass from the window server to callbacks as they are");

/// Null for an unknown display. Keeps the list that it is in.
std::shared_ptr<const DisplayInfo> FindDisplay(CGDirectDisplayID id) {
    const std::shared_ptr<const DisplayList> displays = WindowServerInUse()->GetDisplays();
    const auto found = std::find_if(displays->begin(), displays->end(),
                                    [id](const DisplayInfo& display) { return display.id == id; });
    if (found == displays->end())
        return nullptr;
    return {displays, &*found};
}

std::size_t WholePoints(CGFloat length) {
    return static_cast<std::size_t>(std::max(CmTruncate(length), 0));
}

constexpr int LOWEST_LEVEL = std::numeric_limits<int>::min();
constexpr int DESKTOP_LEVEL = LOWEST_LEVEL + 21;
constexpr int HIGHEST_LEVEL = std::numeric_limits<int>::max() - 16;

/// In the order of CGWindowLevelKey.
constexpr int LEVELS[] = {
    LOWEST_LEVEL,       // base
    LOWEST_LEVEL + 1,   // minimum
    DESKTOP_LEVEL,      // desktop
    -20,                // backstop menu
    0,                  // normal
    3,                  // floating
    3,                  // torn-off menu
    20,                 // Dock
    24,                 // main menu
    25,                 // status
    8,                  // modal panel
    101,                // pop-up menu
    500,                // dragging
    1000,               // screen saver
    HIGHEST_LEVEL,      // maximum
    102,                // overlay
    200,                // help
    19,                 // utility
    DESKTOP_LEVEL + 20, // desktop icons
    HIGHEST_LEVEL - 1,  // cursor
};
static_assert(std::size(LEVELS) == kCGCursorWindowLevelKey + 1);

NoticeKey KeyOf(CGDisplayReconfigurationCallBack callback, void* userInfo) {
    return {reinterpret_cast<std::uintptr_t>(callback), reinterpret_cast<std::uintptr_t>(userInfo)};
}

} // namespace

CGDirectDisplayID CGMainDisplayID() noexcept {
    const std::shared_ptr<const DisplayList> displays = WindowServerInUse()->GetDisplays();
    return displays->empty() ? kCGNullDirectDisplay : displays->front().id;
}

CGRect CGDisplayBounds(CGDirectDisplayID display) noexcept {
    const std::shared_ptr<const DisplayInfo> found = FindDisplay(display);
    return found != nullptr ? found->bounds : CGRect{};
}

std::size_t CGDisplayPixelsWide(CGDirectDisplayID display) noexcept {
    return WholePoints(CGDisplayBounds(display).size.width);
}

std::size_t CGDisplayPixelsHigh(CGDirectDisplayID display) noexcept {
    return WholePoints(CGDisplayBounds(display).size.height);
}

CGError CGGetOnlineDisplayList(std::uint32_t maxDisplays, CGDirectDisplayID* onlineDisplays,
                               std::uint32_t* displayCount) noexcept {
    if (displayCount == nullptr)
        return kCGErrorIllegalArgument;
    *displayCount = 0;
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    if (server->GetLife().life == Life::Lost)
        return kCGErrorCannotComplete;
    const std::shared_ptr<const DisplayList> displays = server->GetDisplays();
    const auto all = static_cast<std::uint32_t>(displays->size());
    *displayCount = onlineDisplays != nullptr ? std::min(maxDisplays, all) : all;
    if (onlineDisplays != nullptr) {
        std::transform(displays->begin(), displays->begin() + *displayCount, onlineDisplays,
                       [](const DisplayInfo& display) { return display.id; });
    }
    return kCGErrorSuccess;
}

std::string DisplayProductName(CGDirectDisplayID display) noexcept {
    std::string name;
    CmCallGuarded("[DisplayProductName]>>exception: ", [&] {
        if (const std::shared_ptr<const DisplayInfo> found = FindDisplay(display))
            name = found->productName;
    });
    return name;
}

CGError CGDisplayRegisterReconfigurationCallback(CGDisplayReconfigurationCallBack callback,
                                                 void* userInfo) noexcept {
    if (callback == nullptr)
        return kCGErrorIllegalArgument;
    const bool added = AddNoticeHandler(
        NoticeKindBit(NoticeKind::DisplayChanged), KeyOf(callback, userInfo),
        [callback, userInfo](const Notice& notice) { callback(notice.display, notice.flags, userInfo); });
    return added ? kCGErrorSuccess : kCGErrorCannotComplete;
}

CGError CGDisplayRemoveReconfigurationCallback(CGDisplayReconfigurationCallBack callback,
                                               void* userInfo) noexcept {
    const bool removed =
        RemoveNoticeHandler(NoticeKindBit(NoticeKind::DisplayChanged), KeyOf(callback, userInfo));
    return removed ? kCGErrorSuccess : kCGErrorIllegalArgument;
}

int CGWindowLevelForKey(int key) noexcept {
    const auto place = static_cast<std::size_t>(key); // below 0 it is far beyond the table
    return place < std::size(LEVELS) ? LEVELS[place] : 0;
}

std::optional<CGEvent> CGEventCreate(std::nullptr_t) noexcept {
    CGEvent event;
    if (!WindowServerInUse()->GetPointerPosition(event.location))
        return std::nullopt;
    return event;
}

} // namespace platform
