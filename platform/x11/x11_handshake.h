// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/xcb.h>

#include <chrono>
#include <memory>
#include <string>

namespace platform::x11 {

struct DisconnectXcb {
    void operator()(xcb_connection_t* connection) const noexcept { xcb_disconnect(connection); }
};
using XcbConnection = std::unique_ptr<xcb_connection_t, DisconnectXcb>;

struct Link {
    XcbConnection connection; ///< Null when there is no such display, or it refuses, or it is too slow.
    int screen = 0;
};

/// Connects to the display that is named so, such as ":0" or ":0.1"; an empty name means the variable
/// DISPLAY. Local displays only: by socket in the file system, by abstract socket, or over the loopback
/// network ("localhost:10.0", as a secure shell forwards it).
///
/// xcb's own connecting waits without end for a server that has been stopped. So the greeting is exchanged
/// here, with a deadline, and xcb is then handed the finished conversation.
/// `wakes` is readable when the wait is to be given up; -1 for none.
Link ConnectToDisplay(const std::string& name, std::chrono::nanoseconds deadline, int wakes);

} // namespace platform::x11
