// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "bench/meter/shared_picture.h"
#include "bench/meter/ticking_thread.h"
#include "tests/x11/x11_rig.h"

#include <xcb/damage.h>

#include <cstdint>
#include <functional>
#include <optional>
#include <string>
#include <vector>

/// Looks thirty times a second whether the screen has changed, and fetches what has, by shared memory, into a
/// picture of its own: the least that a share of a screen takes. It knows no windows, so it hides none, and
/// asks for no pointer. Throws std::runtime_error when it can't.
class WatchingLoop {
public:
    /// The pixels of the whole screen, and how many a row has.
    using Look = std::function<void(const std::uint32_t*, int)>;

    /// `look` is called on the loop's thread at each tick.
    WatchingLoop(const std::string& display, Look look);
    WatchingLoop(const WatchingLoop&) = delete;
    WatchingLoop& operator=(const WatchingLoop&) = delete;

private:
    struct Area {
        int left = 0;
        int top = 0;
        int right = 0;
        int bottom = 0;
    };

    bool Tick();
    Area TakeDamage();
    bool Fetch(const Area& area);

    const XLink m_link;
    const int m_width;
    const int m_height;
    const SharedPicture m_fetched;
    std::vector<std::uint32_t> m_pixels;
    const Look m_look;
    std::uint8_t m_damageEvent = 0;
    xcb_damage_damage_t m_damage = 0;
    std::optional<TickingThread> m_thread; // last: it uses all the others
};
