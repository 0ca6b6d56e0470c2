// SPDX-License-Identifier: Apache-2.0
#include "bench/meter/watching_loop.h"

#include <algorithm>
#include <cstddef>
#include <cstdlib>
#include <stdexcept>
#include <utility>

WatchingLoop::WatchingLoop(const std::string& display, Look look)
    : m_link(display),
      m_width(m_link.Screen().width_in_pixels),
      m_height(m_link.Screen().height_in_pixels),
      m_fetched(m_link.Get(), m_width, m_height),
      m_pixels(static_cast<std::size_t>(m_width) * static_cast<std::size_t>(m_height)),
      m_look(std::move(look)) {
    const xcb_query_extension_reply_t* const extension = xcb_get_extension_data(m_link.Get(), &xcb_damage_id);
    if (extension == nullptr || extension->present == 0)
        throw std::runtime_error("the X server tells of no damage");
    m_damageEvent = extension->first_event;
    m_damage = xcb_generate_id(m_link.Get());
    xcb_damage_query_version(m_link.Get(), 1, 1);
    // Its area grows with what is damaged, and is told each time: no question for it is needed.
    xcb_damage_create(m_link.Get(), m_damage, m_link.Root(), XCB_DAMAGE_REPORT_LEVEL_BOUNDING_BOX);
    m_link.RoundTrip();
    if (!Fetch({0, 0, m_width, m_height}))
        throw std::runtime_error("the screen can't be fetched");
    m_thread.emplace([this] { return Tick(); });
}

bool WatchingLoop::Tick() {
    const Area damaged = TakeDamage();
    if (damaged.left < damaged.right && !Fetch(damaged))
        return false;
    m_look(m_pixels.data(), m_width);
    return true;
}

/// What lies around all that the server has told since the last time.
WatchingLoop::Area WatchingLoop::TakeDamage() {
    Area all;
    while (xcb_generic_event_t* const event = xcb_poll_for_event(m_link.Get())) {
        if ((event->response_type & 0x7F) == m_damageEvent + XCB_DAMAGE_NOTIFY) {
            const xcb_rectangle_t& area = reinterpret_cast<xcb_damage_notify_event_t*>(event)->area;
            const Area told{area.x, area.y, area.x + area.width, area.y + area.height};
            all = all.left == all.right
                      ? told
                      : Area{std::min(all.left, told.left), std::min(all.top, told.top),
                             std::max(all.right, told.right), std::max(all.bottom, told.bottom)};
        }
        std::free(event);
    }
    return all;
}

/// In the order that clients get.
bool WatchingLoop::Fetch(const Area& area) {
    const int width = area.right - area.left;
    const int height = area.bottom - area.top;
    xcb_damage_subtract(m_link.Get(), m_damage, 0, 0);
    if (!m_fetched.FetchPart(m_link.Root(), area.left, area.top, width, height))
        return false;
    const std::uint32_t* source = m_fetched.Pixels();
    for (int y = area.top; y < area.bottom; ++y) {
        std::uint32_t* target = m_pixels.data() + std::ptrdiff_t{y} * m_width + area.left;
        for (int x = 0; x < width; ++x, ++source, ++target)
            *target = (*source & 0xFF00FF00U) | (*source >> 16 & 0xFFU) | (*source & 0xFFU) << 16;
    }
    return true;
}
