// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"

#include <xcb/xcb.h>
#include <xcb/xfixes.h>

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>

namespace platform::x11 {

/// Null when there is no image, or none that makes sense.
std::shared_ptr<CursorImage> CursorFrom(const xcb_xfixes_get_cursor_image_reply_t* reply);

/// The pointer and its image, by XFixes; and whether it has moved, by XInput.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class PointerWatch {
public:
    PointerWatch(X11Connection& connection, Memory& memory);

    void Select();
    void Read();
    /// True for an event that tells of another image; Settle fetches it.
    bool OnEvent(const xcb_generic_event_t& event);
    /// True when the image is another one now.
    bool Settle();

    /// Null when the server can't tell. The same object as long as the serial is the same.
    std::shared_ptr<const CursorImage> Cursor() const { return m_cursor; }
    /// Bytes of pixels that other answers bring ahead of that to a question; nothing where none come.
    using BytesAhead = std::optional<std::size_t>;

    /// Where the pointer is in the root, in pixels: asks the server.
    std::optional<CGPoint> Position(BytesAhead ahead = std::nullopt);
    /// The same, and is told from then on when it moves, once: a mouse in motion isn't listened to.
    std::optional<CGPoint> WatchedPosition(BytesAhead ahead);
    /// Where it was at the last WatchedPosition, unless it has been moved since as far as is told; a client
    /// that warps it isn't.
    std::optional<CGPoint> PositionSoFar() const { return m_isWatched ? m_position : std::nullopt; }

private:
    bool IsMotion(const xcb_generic_event_t& event) const;
    void SelectMotion(std::uint32_t kinds);

    X11Connection& m_connection;
    Memory& m_memory;
    std::shared_ptr<const CursorImage> m_cursor;
    bool m_changed = true;
    bool m_isWatched = false; // it hasn't moved since that was asked to be told
    std::optional<CGPoint> m_position;
};

} // namespace platform::x11
