// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/xcb.h>

#include <cstdlib>
#include <memory>
#include <string>

struct FreeMemory {
    void operator()(void* memory) const { std::free(memory); }
};

/// What XCB hands out and expects to be freed.
template <class T>
using XcbPointer = std::unique_ptr<T, FreeMemory>;

/// A connection to an X server and the screen that it was opened for.
///
/// Threads: one at a time.
/// Errors:  a server that goes away or stands still makes requests fail; it never ends the process and
///          never holds a caller for longer than a second a request.
class X11Connection {
public:
    /// Null when the display can't be opened; `problem` then says why. An empty name means what DISPLAY says.
    static std::unique_ptr<X11Connection> Open(const std::string& display, std::string& problem);
    ~X11Connection();
    X11Connection(const X11Connection&) = delete;
    X11Connection& operator=(const X11Connection&) = delete;

    xcb_connection_t* Get() const { return m_connection; }
    const xcb_screen_t* GetScreen() const { return m_screen; }
    /// The name of the display, for messages.
    const std::string& GetName() const { return m_name; }
    /// False for good once the server has gone.
    bool IsAlive() const { return xcb_connection_has_error(m_connection) == 0; }

    /// The reply that belongs to a cookie; null when the request was refused or not answered in time.
    template <class Reply, class Cookie>
    XcbPointer<Reply> Await(Cookie cookie) {
        return XcbPointer<Reply>(static_cast<Reply*>(AwaitReply(cookie.sequence)));
    }

    bool HasExtension(const std::string& name);

    /// Throws away events: some come to every client, asked for or not, and would pile up for ever.
    void DropEvents();

private:
    X11Connection(xcb_connection_t* connection, const xcb_screen_t* screen, std::string name);
    void* AwaitReply(unsigned sequence);

    xcb_connection_t* const m_connection;
    const xcb_screen_t* const m_screen;
    const std::string m_name;
};
