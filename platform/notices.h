// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <cstdint>
#include <functional>
#include <memory>

/// What a window server tells, delivered on a thread of the platform. For the upper floor itself, which gives
/// it on under the names of its operations.
///
/// Order:   as the server told it, one notice at a time, with no lock held. A handler hears of what is told
///          after its registration; before that, the server's lists had the news already.
/// Thread:  "scn-notice" starts with the first registration and lasts until Rest. While it can't be started,
///          each use of the platform tries again. A server's own thread never runs a handler.
/// Threads: any, also from inside a handler.
namespace platform {

using NoticeHandler = std::function<void(const Notice& notice)>;

/// A set of kinds, a bit each.
using NoticeKinds = unsigned;

constexpr NoticeKinds NoticeKindBit(NoticeKind kind) {
    return 1u << static_cast<unsigned>(kind);
}

/// Names a registration for its removal; several may have the same one.
struct NoticeKey {
    std::uintptr_t who = 0;
    std::uintptr_t what = 0;

    bool operator==(const NoticeKey&) const = default;
};

/// Has `handler` called for notices of those kinds. Each DisplayChanged comes twice: first with
/// DisplayBeginConfiguration alone. What a handler throws is traced and goes no further. False when there is
/// no memory; then nothing was registered.
bool AddNoticeHandler(NoticeKinds kinds, NoticeKey key, NoticeHandler handler) noexcept;

/// Ends the oldest registration with those kinds and that key; false when there is none. After it has
/// returned the handler isn't called any more and is destroyed: it waits for a call of it that runs, and for
/// nothing else. From inside that very call it doesn't wait, and the handler is destroyed behind it.
bool RemoveNoticeHandler(NoticeKinds kinds, NoticeKey key) noexcept;

/// The window server in force, for everything on the upper floor that asks one. Starts the notice thread
/// again if Rest has left registrations without it.
std::shared_ptr<WindowServer> WindowServerInUse() noexcept;

/// Has handlers hear the window server in force, and the former one no more.
void FollowWindowServer() noexcept;

/// See platform/platform_life.h.
void RestNotices() noexcept;
void WakeNotices() noexcept;

/// Ends all registrations.
void ForgetNoticeHandlers() noexcept;

} // namespace platform
