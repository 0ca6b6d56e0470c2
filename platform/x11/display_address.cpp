// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/display_address.h"

#include <arpa/inet.h>
#include <netinet/in.h>
#include <sys/un.h>
#include <xcb/xcb.h>

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <iterator>
#include <string_view>

namespace platform::x11 {

namespace {

constexpr int FIRST_PORT = 6000;
constexpr int LAST_PORT = 65535;
constexpr std::string_view HERE[] = {"", "unix"};
constexpr std::string_view HERE_BY_NETWORK[] = {"localhost", "127.0.0.1", "::1", "[::1]"};

template <class Address>
DisplayAddress AddressOf(const Address& specific, std::size_t size = sizeof(Address)) {
    DisplayAddress address;
    std::memcpy(&address.bytes, &specific, sizeof specific);
    address.size = static_cast<socklen_t>(size);
    return address;
}

/// `path` fits: it is made of a number and short words.
DisplayAddress SocketInFileSystem(std::string_view path) {
    sockaddr_un local{};
    local.sun_family = AF_UNIX;
    std::copy(path.begin(), path.end(), local.sun_path);
    return AddressOf(local, offsetof(sockaddr_un, sun_path) + path.size() + 1);
}

DisplayAddress AbstractSocket(std::string_view path) {
    // Its name begins with a null byte and doesn't end with one.
    DisplayAddress address = SocketInFileSystem('\0' + std::string(path));
    --address.size;
    return address;
}

DisplayAddress LoopbackV4(int port) {
    sockaddr_in loopback{};
    loopback.sin_family = AF_INET;
    loopback.sin_port = htons(static_cast<std::uint16_t>(port));
    loopback.sin_addr.s_addr = htonl(INADDR_LOOPBACK);
    return AddressOf(loopback);
}

DisplayAddress LoopbackV6(int port) {
    sockaddr_in6 loopback{};
    loopback.sin6_family = AF_INET6;
    loopback.sin6_port = htons(static_cast<std::uint16_t>(port));
    loopback.sin6_addr = in6addr_loopback;
    return AddressOf(loopback);
}

} // namespace

bool DisplayName::IsLocal() const {
    return std::find(std::begin(HERE), std::end(HERE), host) != std::end(HERE);
}

bool DisplayName::IsByNetwork() const {
    return std::find(std::begin(HERE_BY_NETWORK), std::end(HERE_BY_NETWORK), host) !=
           std::end(HERE_BY_NETWORK);
}

std::optional<DisplayName> ParseDisplayName(const std::string& text) {
    char* host = nullptr;
    DisplayName name;
    if (xcb_parse_display(text.empty() ? nullptr : text.c_str(), &host, &name.display, &name.screen) == 0)
        return std::nullopt;
    if (host != nullptr)
        name.host = host;
    std::free(host);
    return name;
}

std::vector<DisplayAddress> AddressesOf(const DisplayName& name) {
    if (name.IsLocal()) {
        const std::string path = "/tmp/.X11-unix/X" + std::to_string(name.display);
        return {SocketInFileSystem(path), AbstractSocket(path)};
    }
    if (name.display < 0 || name.display > LAST_PORT - FIRST_PORT)
        return {};
    const int port = FIRST_PORT + name.display;
    if (name.host == "localhost")
        return {LoopbackV4(port), LoopbackV6(port)};
    if (name.host == "127.0.0.1")
        return {LoopbackV4(port)};
    if (name.IsByNetwork())
        return {LoopbackV6(port)};
    return {};
}

} // namespace platform::x11
