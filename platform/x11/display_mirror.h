// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/window_properties.h"
#include "platform/x11/x11_connection.h"
#include "platform/x11/x11_memory.h"

#include <xcb/randr.h>
#include <xcb/xcb.h>

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <string>
#include <vector>

namespace platform::x11 {

/// The monitors of a screen. Layouts change in steps, so a change is read when nothing more has come for a
/// while.
/// Threads: the X thread.
/// Errors:  those of X11Connection.
class DisplayMirror {
public:
    /// After an event, so long is waited for the next one before the layout is read.
    static constexpr std::chrono::nanoseconds SETTLE_TIME = std::chrono::milliseconds(60);
    /// But where events don't end, it is read so long after the first of them.
    static constexpr std::chrono::nanoseconds LONGEST_SETTLE_TIME = std::chrono::milliseconds(600);

    DisplayMirror(X11Connection& connection, Memory& memory);

    void Select();
    /// Reads the layout now.
    void Read();
    bool OnEvent(const xcb_generic_event_t& event);
    /// When the layout is to be read, if it is.
    std::optional<std::chrono::nanoseconds> NextDue() const { return m_due; }
    /// True when the displays, the origin or the root's size have changed.
    bool DoDue();

    /// True when what is visible has changed by it.
    bool SetStruts(std::span<const Strut> struts);

    /// Points with the main display's corner as the origin. Never null; empty when all are off.
    std::shared_ptr<const DisplayList> Displays() const { return m_displays; }
    /// Where that corner is in the root, in pixels.
    CGPoint Origin() const { return m_origin; }
    /// The root's size in pixels.
    int RootWidth() const { return m_rootWidth; }
    int RootHeight() const { return m_rootHeight; }

private:
    struct Monitor;

    void ReadRoot(Pending<xcb_get_geometry_reply_t>& geometry);
    std::vector<Monitor> ReadMonitors(const xcb_randr_get_monitors_reply_t& reply);
    Monitor WholeRoot();
    void Publish();

    X11Connection& m_connection;
    Memory& m_memory;
    std::vector<DisplayInfo> m_monitors; // bounds in pixels of the root; main first
    std::vector<Strut> m_struts;
    std::shared_ptr<const DisplayList> m_displays;
    CGPoint m_origin;
    int m_rootWidth = 0;
    int m_rootHeight = 0;
    std::optional<std::chrono::nanoseconds> m_firstEvent; // of those that m_due is for
    std::optional<std::chrono::nanoseconds> m_due;
};

/// The product's name in an EDID, for people; empty when it has none, or is no EDID.
std::string ProductNameFromEdid(std::span<const std::uint8_t> edid);

} // namespace platform::x11
