// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_handshake.h"
#include "platform/x11/x11_memory.h"
#include "tests/x11/x11_rig.h"
#include "util/cm_clock.h"

#include <gtest/gtest.h>
#include <xcb/xcb.h>

#include <chrono>
#include <cstdint>
#include <functional>
#include <stdexcept>
#include <string>
#include <vector>

/// A server and a connection to it, for the parts that an X11 session is made of. The test is the X thread.
class ComponentBench {
public:
    explicit ComponentBench(const XServerOptions& options)
        : server(options),
          link(server.Display()),
          connection(Connect(), -1) {
        connection.Introduce();
    }

    /// Gives everything that has come by now to `take`.
    void Drain(const std::function<void(const xcb_generic_event_t& event)>& take) {
        link.RoundTrip();
        connection.RoundTrip();
        while (const platform::x11::Event event = connection.NextEvent())
            take(*event);
    }

    void Fill(std::uint32_t rgb, const xcb_rectangle_t& rect) { Fill(link.Root(), rgb, rect); }
    /// A drawable of depth 24 or 30; root and its windows' parts that are covered stay as they are.
    void Fill(xcb_drawable_t drawable, std::uint32_t pixel, const xcb_rectangle_t& rect) {
        const xcb_gcontext_t context = xcb_generate_id(link.Get());
        const std::uint32_t values[] = {pixel, XCB_SUBWINDOW_MODE_INCLUDE_INFERIORS};
        xcb_create_gc(link.Get(), context, drawable, XCB_GC_FOREGROUND | XCB_GC_SUBWINDOW_MODE, values);
        xcb_poly_fill_rectangle(link.Get(), drawable, context, 1, &rect);
        xcb_free_gc(link.Get(), context);
    }

    void MovePointer(int x, int y) {
        xcb_warp_pointer(link.Get(), XCB_NONE, link.Root(), 0, 0, 0, 0, static_cast<std::int16_t>(x),
                         static_cast<std::int16_t>(y));
        link.RoundTrip();
    }

    XServer server;
    XLink link; ///< The other clients.
    platform::x11::X11Connection connection;
    platform::x11::Memory memory;

private:
    platform::x11::Link Connect() const {
        platform::x11::Link made =
            platform::x11::ConnectToDisplay(server.Display(), CmSteadyNow() + std::chrono::seconds(30), -1);
        if (made.connection == nullptr)
            throw std::runtime_error("no connection to " + server.Display());
        return made;
    }
};

/// Small, so that every pixel can be looked at. A real driver knows no smaller mode.
inline XServerOptions SmallServer(XServerOptions::Kind kind, int depth = 24) {
    XServerOptions options;
    options.kind = kind;
    options.width = kind == XServerOptions::Kind::Xorg ? 640 : 320;
    options.height = kind == XServerOptions::Kind::Xorg ? 480 : 240;
    options.depth = depth;
    return options;
}
