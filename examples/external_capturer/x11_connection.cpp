// SPDX-License-Identifier: Apache-2.0
#include "x11_connection.h"

#include <poll.h>
#include <xcb/xcbext.h>

#include <chrono>
#include <cstdint>
#include <utility>

namespace {

constexpr std::chrono::milliseconds replyLimit(1000);

const xcb_screen_t* FindScreen(xcb_connection_t* connection, int number) {
    xcb_screen_iterator_t screens = xcb_setup_roots_iterator(xcb_get_setup(connection));
    for (; screens.rem > 0 && number > 0; --number) {
        xcb_screen_next(&screens);
    }
    return screens.rem > 0 ? screens.data : nullptr;
}

} // namespace

std::unique_ptr<X11Connection> X11Connection::Open(const std::string& display, std::string& problem) {
    const char* fromEnvironment = std::getenv("DISPLAY");
    const std::string name = !display.empty() ? display : fromEnvironment != nullptr ? fromEnvironment : "";
    if (name.empty()) {
        problem = "no display: DISPLAY is not set and --display is not given";
        return nullptr;
    }

    int screenNumber = 0;
    xcb_connection_t* connection = xcb_connect(name.c_str(), &screenNumber);
    const bool connected = xcb_connection_has_error(connection) == 0;
    const xcb_screen_t* screen = connected ? FindScreen(connection, screenNumber) : nullptr;
    if (screen == nullptr) {
        xcb_disconnect(connection);
        problem = "cannot open display \"" + name + "\"";
        return nullptr;
    }
    return std::unique_ptr<X11Connection>(new X11Connection(connection, screen, name));
}

X11Connection::X11Connection(xcb_connection_t* connection, const xcb_screen_t* screen, std::string name)
    : m_connection(connection),
      m_screen(screen),
      m_name(std::move(name)) {}

X11Connection::~X11Connection() {
    xcb_disconnect(m_connection);
}

bool X11Connection::HasExtension(const std::string& name) {
    const auto cookie =
        xcb_query_extension(m_connection, static_cast<std::uint16_t>(name.size()), name.c_str());
    const auto reply = Await<xcb_query_extension_reply_t>(cookie);
    return reply && reply->present != 0;
}

void X11Connection::DropEvents() {
    while (XcbPointer<xcb_generic_event_t>(xcb_poll_for_event(m_connection))) {
    }
}

void* X11Connection::AwaitReply(unsigned sequence) {
    using Clock = std::chrono::steady_clock;
    const auto deadline = Clock::now() + replyLimit;
    xcb_flush(m_connection);
    while (true) {
        void* reply = nullptr;
        xcb_generic_error_t* error = nullptr;
        if (xcb_poll_for_reply(m_connection, sequence, &reply, &error) != 0) {
            std::free(error);
            return reply;
        }
        const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - Clock::now());
        if (left.count() <= 0) {
            xcb_discard_reply(m_connection, sequence);
            return nullptr;
        }
        pollfd readable{xcb_get_file_descriptor(m_connection), POLLIN, 0};
        poll(&readable, 1, static_cast<int>(left.count()));
    }
}
