// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

/// Displays, their reconfiguration callback, window lists and the pointer's position, answered from the
/// window server in force.
///
/// Threads: any. Nothing here waits for the desktop but CGEventCreate, which may for 100 ms.
/// Errors:  nothing throws. Without a window server, with one that is lost, and for ids that it doesn't know
///          (any more), each operation gives its failure value: kCGNullDirectDisplay, zeros, empty lists, an
///          error code. Out parameters are written on success only, unless told otherwise.
namespace platform {

using CGError = std::int32_t;

constexpr CGError kCGErrorSuccess = 0;
constexpr CGError kCGErrorFailure = 1000;
constexpr CGError kCGErrorIllegalArgument = 1001;
constexpr CGError kCGErrorInvalidConnection = 1002;
constexpr CGError kCGErrorCannotComplete = 1004;

/// Half-open: the right and bottom edges are outside, so an empty rectangle contains nothing.
constexpr bool CGRectContainsPoint(const CGRect& rect, const CGPoint& point) {
    return point.x >= rect.origin.x && point.x < rect.origin.x + rect.size.width &&
           point.y >= rect.origin.y && point.y < rect.origin.y + rect.size.height;
}

constexpr bool CGRectEqualToRect(const CGRect& rect1, const CGRect& rect2) {
    return rect1 == rect2;
}

// ---- Displays

constexpr CGDirectDisplayID kCGNullDirectDisplay = 0;

/// kCGNullDirectDisplay when there is no display.
CGDirectDisplayID CGMainDisplayID() noexcept;

/// In global points, all zeros for an unknown display.
CGRect CGDisplayBounds(CGDirectDisplayID display) noexcept;

/// Size in whole points, cut; 0 for an unknown display.
std::size_t CGDisplayPixelsWide(CGDirectDisplayID display) noexcept;
std::size_t CGDisplayPixelsHigh(CGDirectDisplayID display) noexcept;

/// Writes the first `maxDisplays` displays, the main one first, and their number to `displayCount`. With null
/// `onlineDisplays` it only counts them all. kCGErrorCannotComplete with a count of 0 when there is no window
/// server; a window server without a display is a success.
CGError CGGetOnlineDisplayList(std::uint32_t maxDisplays, CGDirectDisplayID* onlineDisplays,
                               std::uint32_t* displayCount) noexcept;

/// The name that people know a display by: the product name that its info dictionary holds. UTF-8, empty for
/// an unknown display.
std::string DisplayProductName(CGDirectDisplayID display) noexcept;

/// What happened to a display. A call tells one kind of moment: kCGDisplayBeginConfigurationFlag alone comes
/// before the call that tells the change.
enum CGDisplayChangeSummaryFlags : unsigned {
    kCGDisplayBeginConfigurationFlag = 1u << 0,
    kCGDisplayMovedFlag = 1u << 1,
    kCGDisplaySetMainFlag = 1u << 2,
    kCGDisplaySetModeFlag = 1u << 3,
    kCGDisplayAddFlag = 1u << 4,
    kCGDisplayRemoveFlag = 1u << 5,
    kCGDisplayEnabledFlag = 1u << 8,
    kCGDisplayDisabledFlag = 1u << 9,
    kCGDisplayMirrorFlag = 1u << 10,
    kCGDisplayUnMirrorFlag = 1u << 11,
    kCGDisplayDesktopShapeChangedFlag = 1u << 12,
};

/// Runs on the notice thread with no lock of the platform held; it may call anything, removal included. What
/// it throws is traced and goes no further.
using CGDisplayReconfigurationCallBack = void (*)(CGDirectDisplayID display, unsigned flags, void* userInfo);

/// From now on the callback hears of each change of a display that comes after this call: once with
/// kCGDisplayBeginConfigurationFlag, then with what changed. Displays already stand as changed in both calls.
/// A pair registered twice is called twice. Registrations outlive the window server that they were made under
/// and go on with the next one. Null is kCGErrorIllegalArgument.
CGError CGDisplayRegisterReconfigurationCallback(CGDisplayReconfigurationCallBack callback,
                                                 void* userInfo) noexcept;

/// Ends one registration of that pair, the oldest. After it has returned the callback isn't called for it any
/// more: it waits for a call that runs, except from inside that very call. kCGErrorIllegalArgument for a pair
/// that isn't registered.
CGError CGDisplayRemoveReconfigurationCallback(CGDisplayReconfigurationCallBack callback,
                                               void* userInfo) noexcept;

// ---- Windows

/// The stack's storeys.
enum CGWindowLevelKey : int {
    kCGBaseWindowLevelKey = 0,
    kCGMinimumWindowLevelKey = 1,
    kCGDesktopWindowLevelKey = 2,
    kCGBackstopMenuLevelKey = 3,
    kCGNormalWindowLevelKey = 4,
    kCGFloatingWindowLevelKey = 5,
    kCGTornOffMenuWindowLevelKey = 6,
    kCGDockWindowLevelKey = 7,
    kCGMainMenuWindowLevelKey = 8,
    kCGStatusWindowLevelKey = 9,
    kCGModalPanelWindowLevelKey = 10,
    kCGPopUpMenuWindowLevelKey = 11,
    kCGDraggingWindowLevelKey = 12,
    kCGScreenSaverWindowLevelKey = 13,
    kCGMaximumWindowLevelKey = 14,
    kCGOverlayWindowLevelKey = 15,
    kCGHelpWindowLevelKey = 16,
    kCGUtilityWindowLevelKey = 17,
    kCGDesktopIconWindowLevelKey = 18,
    kCGCursorWindowLevelKey = 19,
};

/// The level of a storey, the same on every window server; the normal level for any other number.
int CGWindowLevelForKey(int key) noexcept;

enum CGWindowListOption : unsigned {
    kCGWindowListOptionAll = 0,
    kCGWindowListOptionOnScreenOnly = 1u << 0,
    /// Without the desktop's own windows, which lie below the normal level.
    kCGWindowListExcludeDesktopElements = 1u << 4,
};

enum CGWindowSharingType : int {
    kCGWindowSharingNone = 0, ///< Its pixels are never given out.
    kCGWindowSharingReadOnly = 1,
    kCGWindowSharingReadWrite = 2,
};

/// One window, as it was in one moment. The members bear the names of the description's keys.
struct CGWindowDescription {
    CGWindowID kCGWindowNumber = 0;
    int kCGWindowLayer = 0;
    CGRect kCGWindowBounds;
    CGWindowSharingType kCGWindowSharingState = kCGWindowSharingNone;
    float kCGWindowAlpha = 1.0F;
    pid_t kCGWindowOwnerPID = 0;    ///< 0 when it can't be told.
    std::string kCGWindowOwnerName; ///< UTF-8, empty when it can't be told.
    std::string kCGWindowName;      ///< The title, UTF-8, perhaps empty.
    bool kCGWindowIsOnscreen = false;
};

/// Descriptions of the windows of this moment, the front one first. `option` joins bits of
/// CGWindowListOption.
std::vector<CGWindowDescription> CGWindowListCopyWindowInfo(unsigned option) noexcept;

/// Descriptions of those windows in their order, unknown ones left out. Answers from the list that the thread
/// walks, see platform/window_services.h.
std::vector<CGWindowDescription> CGWindowListCreateDescriptionFromArray(
    std::span<const CGWindowID> windows) noexcept;

// ---- Events

/// The state of the pointer in one moment.
struct CGEvent {
    CGPoint location; ///< Global points.
};

/// The present moment; nothing when the pointer's position isn't known.
std::optional<CGEvent> CGEventCreate(std::nullptr_t source) noexcept;

/// Where the pointer was. Without an event a place far outside every display, so that nothing is drawn there.
constexpr CGPoint CGEventGetLocation(const std::optional<CGEvent>& event) {
    constexpr CGFloat FAR_OUTSIDE = -16777216.0F;
    return event ? event->location : CGPoint{FAR_OUTSIDE, FAR_OUTSIDE};
}

} // namespace platform
