// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"
#include "platform/x11/x11_connection.h"

#include <xcb/xcb.h>
#include <xcb/xfixes.h>

#include <cstdint>

namespace platform::x11 {

/// Where the screen was painted since it was last asked. Without the extensions for it, everywhere at any
/// time.
/// Threads: the X thread.
/// Errors:  those of X11Connection; what was then not learned is learned with the next answer.
class RootDamage {
public:
    /// What was asked and isn't answered yet.
    struct Question {
        Pending<xcb_xfixes_fetch_region_reply_t> region;
        Pending<xcb_get_geometry_reply_t> root;
        bool isWhole = false; ///< The answer is the whole root.
    };

    explicit RootDamage(X11Connection& connection) : m_connection(connection) {}
    ~RootDamage() { Stop(); }
    RootDamage(const RootDamage&) = delete;
    RootDamage& operator=(const RootDamage&) = delete;

    void Start();
    void Stop();

    bool OnEvent(const xcb_generic_event_t& event);
    /// Something may have been painted since the last question.
    bool IsDue() const { return m_due; }

    /// Everything that is painted before the server sees the question is in the answer, or was in one before;
    /// everything after it in a later one.
    Question Ask();
    PixelRegion Await(Question& question);

    /// The root as it was at the last answer.
    const PixelRect& Root() const { return m_root; }

private:
    bool IsWatched() const { return m_damage != 0; }
    static PixelRegion RegionFrom(const xcb_xfixes_fetch_region_reply_t& reply);

    X11Connection& m_connection;
    std::uint32_t m_damage = 0;
    std::uint32_t m_region = 0;
    std::uint32_t m_asked = 0; // the sequence of the last question
    PixelRect m_root;
    bool m_due = false;
    bool m_unanswered = false;
};

} // namespace platform::x11
