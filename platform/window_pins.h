// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <chrono>
#include <memory>

/// Which moment's windows a thread is told of: for the upper floor itself.
/// Threads: any; each has its own pin.
namespace platform {

/// How long a pin holds, on CmSteadyNow. A walk takes far less; a thread that lists once and never again must
/// not see the past for ever.
inline constexpr std::chrono::nanoseconds LONGEST_PIN = std::chrono::milliseconds(100);

/// The windows of now, pinned for the calling thread until it pins others. Never null. Without memory
/// nothing is pinned.
std::shared_ptr<const WindowSnapshot> PinWindows() noexcept;

/// The calling thread has pinned nothing any more.
void UnpinWindows() noexcept;

/// The windows that the calling thread has pinned. Null when it has pinned none, when they hold no more, and
/// when they were pinned under another window server.
std::shared_ptr<const WindowSnapshot> PinnedWindows() noexcept;

/// The windows that the calling thread has pinned, else those of now. Never null. What was pinned under
/// another window server counts no more.
std::shared_ptr<const WindowSnapshot> WindowsForLookUp() noexcept;

/// Lets go of every thread's pin.
void ForgetPins() noexcept;

} // namespace platform
