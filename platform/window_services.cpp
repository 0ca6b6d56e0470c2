// SPDX-License-Identifier: Apache-2.0
#include "platform/window_services.h"

#include "platform/notices.h"
#include "platform/process_ids.h"
#include "platform/window_pins.h"
#include "platform/window_server.h"

#include <unistd.h>

#include <algorithm>
#include <memory>
#include <utility>

namespace platform {

namespace {

bool IsThere(const WindowServer& server) {
    return server.GetLife().life != Life::Lost;
}

CGError Check(CGSConnectionID connection, const void* out) {
    if (connection == 0)
        return kCGErrorInvalidConnection;
    return out != nullptr ? kCGErrorSuccess : kCGErrorIllegalArgument;
}

/// Asks one thing of a window.
template <class Ask>
CGError LookUp(CGSConnectionID connection, CGWindowID id, const void* out, Ask ask) {
    if (const CGError error = Check(connection, out))
        return error;
    const std::shared_ptr<const WindowSnapshot> windows = WindowsForLookUp();
    const WindowInfo* const window = windows->Find(id);
    return window != nullptr ? ask(*window) : kCGErrorIllegalArgument;
}

CGError OwnerOf(const WindowInfo& window, CGSConnectionID* owner) {
    if (window.owner <= 0)
        return kCGErrorFailure;
    *owner = ConnectionOf(window.owner);
    return kCGErrorSuccess;
}

/// Calls `fn` with each window on screen that `target` has, the front one first, and gives their number.
template <class Fn>
int ForEachOnScreen(const WindowSnapshot& windows, CGSConnectionID target, Fn fn) {
    int count = 0;
    for (const WindowInfo& window : windows.Windows()) {
        const bool isTargets = target == 0 || (window.owner > 0 && ConnectionOf(window.owner) == target);
        if (window.onScreen && isTargets)
            fn(count++, window.id);
    }
    return count;
}

} // namespace

CGSConnectionID CGSDefaultConnection() noexcept {
    return IsThere(*WindowServerInUse()) ? ConnectionOf(getpid()) : 0;
}

CGError CGSGetOnScreenWindowCount(CGSConnectionID connection, CGSConnectionID target, int* count) noexcept {
    if (const CGError error = Check(connection, count))
        return error;
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    if (!IsThere(*server))
        return kCGErrorCannotComplete;
    *count = ForEachOnScreen(*server->GetWindows(), target, [](int, CGWindowID) {});
    return kCGErrorSuccess;
}

CGError CGSGetOnScreenWindowList(CGSConnectionID connection, CGSConnectionID target, int size, int* list,
                                 int* read) noexcept {
    UnpinWindows(); // who gets no list must not go by the one before
    if (const CGError error = Check(connection, read))
        return error;
    if (size < 0 || (size > 0 && list == nullptr))
        return kCGErrorIllegalArgument;
    if (!IsThere(*WindowServerInUse()))
        return kCGErrorCannotComplete;
    *read = ForEachOnScreen(*PinWindows(), target, [size, list](int place, CGWindowID window) {
        if (place < size)
            list[place] = static_cast<int>(window);
    });
    return kCGErrorSuccess;
}

std::uint64_t PinnedWindowGeneration() noexcept {
    const std::shared_ptr<const WindowSnapshot> pinned = PinnedWindows();
    return pinned != nullptr ? pinned->Generation() : 0;
}

CGSMoment CGSPinnedMoment() noexcept {
    return {PinnedWindows(), WindowServerInUse()->GetDisplays()};
}

CGSMoment CGSCurrentMoment() noexcept {
    const std::shared_ptr<WindowServer> server = WindowServerInUse();
    return {server->GetWindows(), server->GetDisplays()};
}

CGError CGSGetWindowLevel(CGSConnectionID connection, CGWindowID window, int* level) noexcept {
    return LookUp(connection, window, level, [level](const WindowInfo& info) {
        *level = info.level;
        return kCGErrorSuccess;
    });
}

CGError CGSGetWindowAlpha(CGSConnectionID connection, CGWindowID window, float* alpha) noexcept {
    return LookUp(connection, window, alpha, [alpha](const WindowInfo& info) {
        *alpha = info.alpha;
        return kCGErrorSuccess;
    });
}

CGError CGSGetScreenRectForWindow(CGSConnectionID connection, CGWindowID window, CGRect* rect) noexcept {
    return LookUp(connection, window, rect, [rect](const WindowInfo& info) {
        *rect = info.frame;
        return kCGErrorSuccess;
    });
}

CGError CGSGetSharingState(CGSConnectionID connection, CGWindowID window,
                           CGWindowSharingType* state) noexcept {
    return LookUp(connection, window, state, [state](const WindowInfo& info) {
        *state = static_cast<CGWindowSharingType>(info.sharing);
        return kCGErrorSuccess;
    });
}

CGError CGSGetWindowOwner(CGSConnectionID connection, CGWindowID window, CGSConnectionID* owner) noexcept {
    return LookUp(connection, window, owner,
                  [owner](const WindowInfo& info) { return OwnerOf(info, owner); });
}

CGSWindowOwners::CGSWindowOwners(CGSConnectionID connection) noexcept
    : m_connection(connection),
      m_windows(WindowsForLookUp()) {}

CGError CGSWindowOwners::Get(CGWindowID window, CGSConnectionID* owner) const noexcept {
    if (const CGError error = Check(m_connection, owner))
        return error;
    const WindowInfo* const info = static_cast<const WindowSnapshot*>(m_windows.get())->Find(window);
    return info != nullptr ? OwnerOf(*info, owner) : kCGErrorIllegalArgument;
}

CGError CGSConnectionGetPID(CGSConnectionID connection, pid_t* pid) noexcept {
    if (const CGError error = Check(connection, pid))
        return error;
    const std::optional<pid_t> process = ProcessOfConnection(connection);
    if (!process)
        return kCGErrorInvalidConnection;
    *pid = *process;
    return kCGErrorSuccess;
}

CGError CGSGetConnectionIDForPSN(CGSConnectionID connection, const ProcessSerialNumber* process,
                                 CGSConnectionID* processConnection) noexcept {
    if (const CGError error = Check(connection, processConnection))
        return error;
    const std::optional<pid_t> pid = process != nullptr ? ProcessOf(*process) : std::nullopt;
    if (!pid)
        return kCGErrorIllegalArgument;
    *processConnection = ConnectionOf(*pid);
    return kCGErrorSuccess;
}

} // namespace platform
