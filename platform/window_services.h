// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_graphics.h"
#include "platform/core_types.h"

#include <sys/types.h>
#include <cstdint>
#include <memory>

/// The window server's connection calls: who owns a window, where it lies in the stack and on the desktop.
///
/// One moment: a walk over the windows asks several things of each. So the windows that
///             CGSGetOnScreenWindowList has listed are pinned for the calling thread, for 100 ms at most or
///             until it lists anew: what it asks of a window meanwhile is answered as of that list, however
///             the desktop goes on. Counting and listing themselves always tell of now.
/// Threads:    any; each has its own pin.
/// Errors:     kCGErrorSuccess, and only then an out parameter is written; kCGErrorInvalidConnection for
///             connection 0, kCGErrorIllegalArgument for a null out parameter and for a window that isn't
///             there, kCGErrorFailure for what the server can't tell of one. Counts and lists give
///             kCGErrorCannotComplete when there is no window server. Nothing throws.
namespace platform {

struct ProcessSerialNumber;

/// A process's connection to the window server: one for each process, the same for as long as it lives.
/// Never 0.
using CGSConnectionID = std::uint32_t;

/// The connection of this process, 0 when there is no window server. Elsewhere this call has a leading
/// underscore, which C++ keeps for its implementations.
CGSConnectionID CGSDefaultConnection() noexcept;

/// The number of windows on screen: those of `target`, or of all processes for 0.
CGError CGSGetOnScreenWindowCount(CGSConnectionID connection, CGSConnectionID target, int* count) noexcept;

/// Writes the first `size` windows on screen, the front one first, and tells in `read` how many there are,
/// which may be more than `size`. Null `list` is allowed for size 0.
CGError CGSGetOnScreenWindowList(CGSConnectionID connection, CGSConnectionID target, int size, int* list,
                                 int* read) noexcept;

/// The generation of the windows that the calling thread's last list has pinned. 0 when it has pinned none,
/// when they hold no more, and when another window server is in force.
std::uint64_t PinnedWindowGeneration() noexcept;

/// What questions of the calling thread are answered from: about windows from the list that it has pinned,
/// about displays from that of the window server in force. Both never change, and are kept from being made
/// anew in the same place; so where two moments are equal, with windows, every such question has the same
/// answer in both.
struct CGSMoment {
    std::shared_ptr<const void> windows; ///< Null when the thread has pinned none, or they hold no more.
    std::shared_ptr<const void> displays;

    bool operator==(const CGSMoment&) const = default;
};

CGSMoment CGSPinnedMoment() noexcept;
/// What a thread that pins now would get.
CGSMoment CGSCurrentMoment() noexcept;

CGError CGSGetWindowLevel(CGSConnectionID connection, CGWindowID window, int* level) noexcept;

/// From 0, fully transparent, to 1.
CGError CGSGetWindowAlpha(CGSConnectionID connection, CGWindowID window, float* alpha) noexcept;

/// The visible frame, in global points.
CGError CGSGetScreenRectForWindow(CGSConnectionID connection, CGWindowID window, CGRect* rect) noexcept;

/// Whether anything of it may be in a picture.
CGError CGSGetSharingState(CGSConnectionID connection, CGWindowID window,
                           CGWindowSharingType* state) noexcept;

/// The connection of the process that owns a window; kCGErrorFailure when its owner can't be told.
CGError CGSGetWindowOwner(CGSConnectionID connection, CGWindowID window, CGSConnectionID* owner) noexcept;

/// CGSGetWindowOwner for many windows at once: all answers are of one moment, that of the making, and nobody
/// is asked for them.
class CGSWindowOwners {
public:
    explicit CGSWindowOwners(CGSConnectionID connection) noexcept;

    CGError Get(CGWindowID window, CGSConnectionID* owner) const noexcept;

private:
    const CGSConnectionID m_connection;
    const std::shared_ptr<const void> m_windows;
};

/// The process behind a connection; kCGErrorInvalidConnection for what is none.
CGError CGSConnectionGetPID(CGSConnectionID connection, pid_t* pid) noexcept;

/// The connection of a process that GetProcessForPID or GetNextProcess has given; kCGErrorIllegalArgument for
/// all zeros.
CGError CGSGetConnectionIDForPSN(CGSConnectionID connection, const ProcessSerialNumber* process,
                                 CGSConnectionID* processConnection) noexcept;

} // namespace platform
