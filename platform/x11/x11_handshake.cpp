// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/x11_handshake.h"

#include "platform/x11/display_address.h"
#include "platform/x11/owned_descriptor.h"
#include "platform/x11/x11_greeting.h"
#include "platform/x11/x11_patience.h"
#include "util/cm_thread.h"

#include <fcntl.h>
#include <netinet/in.h>
#include <netinet/tcp.h>
#include <poll.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstddef>
#include <optional>
#include <span>
#include <utility>

namespace platform::x11 {

namespace {

/// How long is waited before a server whose queue is full is called again.
constexpr std::chrono::milliseconds FULL_QUEUE_PAUSE{10};

bool HasConnected(int socket, Patience& patience) {
    if (patience.WaitFor(socket, POLLOUT) != Patience::Outcome::Ready)
        return false;
    int error = 0;
    socklen_t size = sizeof error;
    return getsockopt(socket, SOL_SOCKET, SO_ERROR, &error, &size) == 0 && error == 0;
}

OwnedDescriptor ConnectTo(const DisplayAddress& address, Patience& patience) {
    OwnedDescriptor server(socket(address.bytes.ss_family, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
    if (!server)
        return {};
    const int yes = 1;
    if (address.bytes.ss_family != AF_UNIX)
        setsockopt(server.Get(), IPPROTO_TCP, TCP_NODELAY, &yes, sizeof yes);
    for (;;) {
        if (connect(server.Get(), reinterpret_cast<const sockaddr*>(&address.bytes), address.size) == 0)
            return server;
        if (errno == EINPROGRESS)
            return HasConnected(server.Get(), patience) ? std::move(server) : OwnedDescriptor();
        if (errno != EAGAIN && errno != EINTR)
            return {};
        if (patience.Pause(FULL_QUEUE_PAUSE) != Patience::Outcome::Ready)
            return {};
    }
}

OwnedDescriptor ConnectToAny(const DisplayName& name, Patience& patience) {
    for (const DisplayAddress& address : AddressesOf(name)) {
        if (OwnedDescriptor server = ConnectTo(address, patience))
            return server;
    }
    return {};
}

bool WouldWait() {
    return errno == EAGAIN || errno == EWOULDBLOCK || errno == EINTR;
}

bool SendAll(int socket, std::span<const std::uint8_t> bytes, Patience& patience) {
    while (!bytes.empty()) {
        const ssize_t sent = send(socket, bytes.data(), bytes.size(), MSG_NOSIGNAL | MSG_DONTWAIT);
        if (sent > 0)
            bytes = bytes.subspan(static_cast<std::size_t>(sent));
        else if (!WouldWait() || patience.WaitFor(socket, POLLOUT) != Patience::Outcome::Ready)
            return false;
    }
    return true;
}

bool ReceiveAll(int socket, std::span<std::uint8_t> bytes, Patience& patience) {
    while (!bytes.empty()) {
        const ssize_t got = recv(socket, bytes.data(), bytes.size(), MSG_DONTWAIT);
        if (got > 0)
            bytes = bytes.subspan(static_cast<std::size_t>(got));
        else if (got == 0 || !WouldWait() || patience.WaitFor(socket, POLLIN) != Patience::Outcome::Ready)
            return false;
    }
    return true;
}

/// What the server answers to our greeting; empty when it doesn't, or doesn't let us in.
Bytes ExchangeGreetings(int server, const Bytes& cookie, Patience& patience) {
    if (!SendAll(server, MakeGreeting(cookie), patience))
        return {};
    Bytes answer(ANSWER_HEAD);
    if (!ReceiveAll(server, answer, patience))
        return {};
    answer.resize(AnswerLength(std::span(answer).first<ANSWER_HEAD>()));
    if (!ReceiveAll(server, std::span(answer).subspan(ANSWER_HEAD), patience) || !IsSoundWelcome(answer))
        return {};
    return answer;
}

/// Plays the server for xcb, which takes the answer for a packet of another kind if it comes before xcb has
/// written its own greeting. It ends when that is answered or xcb has closed its end.
class GreetingThread final : public ACmThread {
public:
    GreetingThread(OwnedDescriptor end, const Bytes& answer) : m_end(std::move(end)), m_answer(answer) {}

    int OnThreadRun() override {
        Bytes greeting(MakeGreeting({}).size());
        Patience endless(std::chrono::nanoseconds::max(), -1);
        if (ReceiveAll(m_end.Get(), greeting, endless))
            SendAll(m_end.Get(), m_answer, endless);
        return 0;
    }

private:
    const OwnedDescriptor m_end;
    const Bytes& m_answer;
};

/// Has xcb read the answer that has been received, and go on with the server under the same descriptor.
XcbConnection HandOver(const OwnedDescriptor& server, const Bytes& answer) {
    int ends[2] = {-1, -1};
    if (socketpair(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0, ends) != 0)
        return nullptr;
    OwnedDescriptor xcbEnd(ends[0]);
    const auto thread = std::make_shared<GreetingThread>(OwnedDescriptor(ends[1]), answer);
    if (thread->Create("scn-x11-greet", 0, 0, 0) != 0)
        return nullptr;
    const int descriptor = xcbEnd.Release(); // xcb closes it also when it fails
    XcbConnection connection(xcb_connect_to_fd(descriptor, nullptr));
    thread->Join();
    if (connection == nullptr || xcb_connection_has_error(connection.get()) != 0)
        return nullptr;
    if (dup3(server.Get(), descriptor, O_CLOEXEC) != descriptor)
        return nullptr;
    return connection;
}

bool HasScreen(xcb_connection_t& connection, int screen) {
    return screen >= 0 && screen < xcb_setup_roots_length(xcb_get_setup(&connection));
}

} // namespace

Link ConnectToDisplay(const std::string& name, std::chrono::nanoseconds deadline, int wakes) {
    const std::optional<DisplayName> parsed = ParseDisplayName(name);
    if (!parsed)
        return {};
    Patience patience(deadline, wakes);
    const OwnedDescriptor server = ConnectToAny(*parsed, patience);
    if (!server)
        return {};
    const Bytes answer = ExchangeGreetings(server.Get(), CookieOf(parsed->display), patience);
    if (answer.empty())
        return {};
    Link link{HandOver(server, answer), parsed->screen};
    if (link.connection != nullptr && !HasScreen(*link.connection, link.screen))
        link.connection.reset();
    return link;
}

} // namespace platform::x11
