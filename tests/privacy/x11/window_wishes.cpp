// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/x11/window_wishes.h"

#include <algorithm>

namespace {

constexpr std::uint32_t FROM_A_PAGER = 2; // window managers do what these ask without ado

} // namespace

void WindowWishes::Send(std::uint32_t window, const std::string& message,
                        std::initializer_list<std::uint32_t> data) const {
    xcb_client_message_event_t event{};
    event.response_type = XCB_CLIENT_MESSAGE;
    event.format = 32;
    event.window = window;
    event.type = m_link.Atom(message);
    std::copy(data.begin(), data.end(), event.data.data32);
    xcb_send_event(m_link.Get(), 0, m_link.Root(),
                   XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT,
                   reinterpret_cast<const char*>(&event));
    m_link.RoundTrip();
}

void WindowWishes::Put(std::uint32_t window, const Place& place) const {
    std::uint16_t mask = XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y;
    if (place.width > 0)
        mask |= XCB_CONFIG_WINDOW_WIDTH | XCB_CONFIG_WINDOW_HEIGHT;
    const std::uint32_t values[] = {static_cast<std::uint32_t>(place.x), static_cast<std::uint32_t>(place.y),
                                    static_cast<std::uint32_t>(place.width),
                                    static_cast<std::uint32_t>(place.height)};
    xcb_configure_window(m_link.Get(), window, mask, values);
    m_link.RoundTrip();
}

void WindowWishes::Stack(std::uint32_t window, std::uint32_t mode) const {
    xcb_configure_window(m_link.Get(), window, XCB_CONFIG_WINDOW_STACK_MODE, &mode);
    m_link.RoundTrip();
}

void WindowWishes::Raise(std::uint32_t window) const {
    Stack(window, XCB_STACK_MODE_ABOVE);
}

void WindowWishes::Lower(std::uint32_t window) const {
    Stack(window, XCB_STACK_MODE_BELOW);
}

void WindowWishes::Minimise(std::uint32_t window) const {
    constexpr std::uint32_t ICONIC = 3;
    Send(window, "WM_CHANGE_STATE", {ICONIC});
}

void WindowWishes::Restore(std::uint32_t window) const {
    Send(window, "_NET_ACTIVE_WINDOW", {FROM_A_PAGER, XCB_CURRENT_TIME, 0});
}

void WindowWishes::ToggleState(std::uint32_t window, const std::string& first,
                               const std::string& second) const {
    constexpr std::uint32_t TOGGLE = 2;
    const std::uint32_t other = second.empty() ? 0U : m_link.Atom(second);
    Send(window, "_NET_WM_STATE", {TOGGLE, m_link.Atom(first), other, FROM_A_PAGER});
}

void WindowWishes::ToggleMaximised(std::uint32_t window) const {
    ToggleState(window, "_NET_WM_STATE_MAXIMIZED_HORZ", "_NET_WM_STATE_MAXIMIZED_VERT");
}

void WindowWishes::ToggleFullScreen(std::uint32_t window) const {
    ToggleState(window, "_NET_WM_STATE_FULLSCREEN");
}

void WindowWishes::ToggleRolledUp(std::uint32_t window) const {
    ToggleState(window, "_NET_WM_STATE_SHADED");
}

void WindowWishes::Close(std::uint32_t window) const {
    Send(window, "_NET_CLOSE_WINDOW", {XCB_CURRENT_TIME, FROM_A_PAGER});
}

void WindowWishes::ShowWorkspace(std::uint32_t number) const {
    Send(m_link.Root(), "_NET_CURRENT_DESKTOP", {number, XCB_CURRENT_TIME});
}

void WindowWishes::MovePointer(int x, int y) const {
    xcb_warp_pointer(m_link.Get(), XCB_NONE, m_link.Root(), 0, 0, 0, 0, static_cast<std::int16_t>(x),
                     static_cast<std::int16_t>(y));
    m_link.RoundTrip();
}
