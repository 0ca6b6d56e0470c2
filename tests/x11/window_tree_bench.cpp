// SPDX-License-Identifier: Apache-2.0
#include "tests/x11/window_tree_bench.h"

#include <sys/socket.h>
#include <sys/un.h>
#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdlib>
#include <cstring>
#include <stdexcept>

namespace {

/// In the child: only what is safe after a fork.
int ConnectTo(const std::string& path) {
    const int descriptor = socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::memcpy(address.sun_path, path.c_str(), std::min(path.size(), sizeof address.sun_path - 1));
    const bool connected = connect(descriptor, reinterpret_cast<sockaddr*>(&address), sizeof address) == 0;
    return connected ? descriptor : -1;
}

union ControlSpace {
    cmsghdr head;
    std::array<char, CMSG_SPACE(sizeof(int))> bytes;
};

bool Send(int channel, int descriptor) {
    char byte = 0;
    iovec data{&byte, 1};
    ControlSpace control{};
    msghdr message{};
    message.msg_iov = &data;
    message.msg_iovlen = 1;
    message.msg_control = control.bytes.data();
    message.msg_controllen = control.bytes.size();
    cmsghdr* const head = CMSG_FIRSTHDR(&message);
    head->cmsg_level = SOL_SOCKET;
    head->cmsg_type = SCM_RIGHTS;
    head->cmsg_len = CMSG_LEN(sizeof descriptor);
    std::memcpy(CMSG_DATA(head), &descriptor, sizeof descriptor);
    return sendmsg(channel, &message, 0) == 1;
}

int Receive(int channel) {
    char byte = 0;
    iovec data{&byte, 1};
    ControlSpace control{};
    msghdr message{};
    message.msg_iov = &data;
    message.msg_iovlen = 1;
    message.msg_control = control.bytes.data();
    message.msg_controllen = control.bytes.size();
    int descriptor = -1;
    const bool received = recvmsg(channel, &message, MSG_CMSG_CLOEXEC) == 1;
    const cmsghdr* const head = received ? CMSG_FIRSTHDR(&message) : nullptr;
    if (head != nullptr)
        std::memcpy(&descriptor, CMSG_DATA(head), sizeof descriptor);
    return descriptor;
}

} // namespace

ForeignClient::ForeignClient(const XServer& server) {
    const std::string path = "/tmp/.X11-unix/X" + std::to_string(server.Number());
    std::array<int, 2> channel{};
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC, 0, channel.data()) != 0)
        throw std::runtime_error("no channel to a child");
    m_pid = fork();
    if (m_pid == 0) {
        const int descriptor = ConnectTo(path);
        _exit(descriptor >= 0 && Send(channel[1], descriptor) ? 0 : 1);
    }
    close(channel[1]);
    const int descriptor = Receive(channel[0]);
    close(channel[0]);
    waitpid(m_pid, nullptr, 0);
    m_connection = descriptor >= 0 ? xcb_connect_to_fd(descriptor, nullptr) : nullptr;
    if (m_connection == nullptr || xcb_connection_has_error(m_connection) != 0)
        throw std::runtime_error("a child can't connect to " + path);
    m_screen = xcb_setup_roots_iterator(xcb_get_setup(m_connection)).data;
}

ForeignClient::~ForeignClient() {
    xcb_disconnect(m_connection);
}

xcb_atom_t ForeignClient::Atom(const std::string& name) const {
    xcb_intern_atom_reply_t* const reply = xcb_intern_atom_reply(
        m_connection, xcb_intern_atom(m_connection, 0, static_cast<std::uint16_t>(name.size()), name.c_str()),
        nullptr);
    const xcb_atom_t atom = reply != nullptr ? reply->atom : xcb_atom_t{0};
    std::free(reply);
    return atom;
}

void ForeignClient::RoundTrip() const {
    std::free(xcb_get_input_focus_reply(m_connection, xcb_get_input_focus(m_connection), nullptr));
}

xcb_window_t ForeignClient::Create(const Look& look, xcb_window_t id, xcb_window_t parent) const {
    const xcb_window_t window = id != 0 ? id : xcb_generate_id(m_connection);
    const std::uint32_t override = look.overrideRedirect ? 1 : 0;
    const auto kind = look.inputOnly ? XCB_WINDOW_CLASS_INPUT_ONLY : XCB_WINDOW_CLASS_INPUT_OUTPUT;
    xcb_create_window(m_connection, XCB_COPY_FROM_PARENT, window, parent != 0 ? parent : Root(),
                      static_cast<std::int16_t>(look.x), static_cast<std::int16_t>(look.y),
                      static_cast<std::uint16_t>(look.width), static_cast<std::uint16_t>(look.height),
                      static_cast<std::uint16_t>(look.border), static_cast<std::uint16_t>(kind),
                      XCB_COPY_FROM_PARENT, XCB_CW_OVERRIDE_REDIRECT, &override);
    RoundTrip();
    return window;
}

xcb_window_t ForeignClient::CreateMapped(const Look& look, xcb_window_t id) const {
    const xcb_window_t window = Create(look, id);
    xcb_map_window(m_connection, window);
    RoundTrip();
    return window;
}

void ForeignClient::Words(xcb_window_t window, const std::string& property, const std::string& type,
                          const std::vector<std::uint32_t>& words) const {
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window, Atom(property), Atom(type), 32,
                        static_cast<std::uint32_t>(words.size()), words.data());
    RoundTrip();
}

void ForeignClient::Text(xcb_window_t window, const std::string& property, const std::string& type,
                         const std::string& text) const {
    xcb_change_property(m_connection, XCB_PROP_MODE_REPLACE, window, Atom(property), Atom(type), 8,
                        static_cast<std::uint32_t>(text.size()), text.data());
    RoundTrip();
}

void ForeignClient::Place(xcb_window_t window, int x, int y, unsigned width, unsigned height) const {
    const std::uint32_t values[] = {static_cast<std::uint32_t>(x), static_cast<std::uint32_t>(y), width,
                                    height};
    xcb_configure_window(
        m_connection, window,
        XCB_CONFIG_WINDOW_X | XCB_CONFIG_WINDOW_Y | XCB_CONFIG_WINDOW_WIDTH | XCB_CONFIG_WINDOW_HEIGHT,
        values);
    RoundTrip();
}

void ForeignClient::Stack(xcb_window_t window, xcb_stack_mode_t mode, xcb_window_t sibling) const {
    const std::uint32_t values[] = {sibling, static_cast<std::uint32_t>(mode)};
    if (sibling != 0)
        xcb_configure_window(m_connection, window, XCB_CONFIG_WINDOW_SIBLING | XCB_CONFIG_WINDOW_STACK_MODE,
                             values);
    else
        xcb_configure_window(m_connection, window, XCB_CONFIG_WINDOW_STACK_MODE, values + 1);
    RoundTrip();
}
