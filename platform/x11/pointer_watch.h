// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"

#include <xcb/xcb.h>
#include <xcb/xfixes.h>

#include <memory>
#include <optional>

namespace platform::x11 {

/// Null when there is no image, or none that makes sense.
std::shared_ptr<CursorImage> CursorFrom(const xcb_xfixes_get_cursor_image_reply_t* reply);

/// The pointer and its image, by XFixes.
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
    /// Where the pointer is in the root, in pixels: asks the server.
    std::optional<CGPoint> Position();

private:
    X11Connection& m_connection;
    Memory& m_memory;
    std::shared_ptr<const CursorImage> m_cursor;
    bool m_changed = true;
};

} // namespace platform::x11
