// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/application_watch.h"
#include "platform/x11/window_properties.h"
#include "platform/x11/window_tree.h"

#include <algorithm>
#include <cstdint>

namespace platform::x11 {

namespace {

constexpr std::uint32_t FROM_PAGER = 2; // what people have asked for, so nobody holds it back

Property WindowProperty(X11Connection& connection, xcb_window_t window, AtomName name) {
    const auto reply = connection.Fetch<xcb_get_property_reply_t>(xcb_get_property(
        connection.Get(), 0, window, connection.Atom(name), XCB_GET_PROPERTY_TYPE_ANY, 0, 1));
    return Property::From(reply.get());
}

/// The window that it names names itself; one that a dead window manager has left doesn't exist.
bool HasWindowManager(X11Connection& connection) {
    const std::optional<std::uint32_t> window =
        WindowProperty(connection, connection.Root(), AtomName::NET_SUPPORTING_WM_CHECK).FirstWord();
    return window && *window != 0 &&
           WindowProperty(connection, *window, AtomName::NET_SUPPORTING_WM_CHECK).FirstWord() == window;
}

/// A window that people work in, also while it is minimised or on another desktop. One that was never mapped
/// is none of theirs.
bool CanBeActivated(const TopLevel& window) {
    if (window.inputOnly || window.overrideRedirect || window.client == 0)
        return false;
    if (window.type == WindowType::Desktop || window.type == WindowType::Dock)
        return false;
    return window.mapped || window.hidden || !window.onThisDesktop || window.client != window.window;
}

void AskManager(X11Connection& connection, const TopLevel& window) {
    xcb_client_message_event_t message{};
    message.response_type = XCB_CLIENT_MESSAGE;
    message.format = 32;
    message.window = window.client;
    message.type = connection.Atom(AtomName::NET_ACTIVE_WINDOW);
    message.data.data32[0] = FROM_PAGER;
    message.data.data32[1] = XCB_CURRENT_TIME;
    xcb_send_event(connection.Get(), 0, connection.Root(),
                   XCB_EVENT_MASK_SUBSTRUCTURE_NOTIFY | XCB_EVENT_MASK_SUBSTRUCTURE_REDIRECT,
                   reinterpret_cast<const char*>(&message));
}

void Raise(X11Connection& connection, const TopLevel& window) {
    const std::uint32_t above = XCB_STACK_MODE_ABOVE;
    xcb_configure_window(connection.Get(), window.window, XCB_CONFIG_WINDOW_STACK_MODE, &above);
    if (!window.mapped)
        xcb_map_window(connection.Get(), window.window);
}

} // namespace

bool ActivateWindowsOf(X11Connection& connection, const WindowTree& tree, pid_t pid) {
    std::vector<const TopLevel*> windows = tree.FrontFirst();
    std::erase_if(windows,
                  [pid](const TopLevel* window) { return window->owner != pid || !CanBeActivated(*window); });
    if (windows.empty())
        return false;
    const bool managed = HasWindowManager(connection);
    // The rearmost first, so that each comes to lie above those that were behind it.
    std::for_each(windows.rbegin(), windows.rend(), [&](const TopLevel* window) {
        if (managed)
            AskManager(connection, *window);
        else
            Raise(connection, *window);
    });
    connection.Flush();
    return true;
}

} // namespace platform::x11
