// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/socket.h>

#include <optional>
#include <string>
#include <vector>

namespace platform::x11 {

/// The name of a display in its parts, as in "host:display.screen".
struct DisplayName {
    std::string host;
    int display = 0;
    int screen = 0;

    /// On this machine, and reached without the network.
    bool IsLocal() const;
    /// On this machine, and reached as if it were another.
    bool IsByNetwork() const;
};

/// An empty text means the display that the environment names.
std::optional<DisplayName> ParseDisplayName(const std::string& text);

/// An address of any family.
struct DisplayAddress {
    sockaddr_storage bytes{};
    socklen_t size = 0;
};

/// Where the display may be, best first; nowhere for one of another machine. The file system comes before
/// abstract names, which anybody may take: whoever answers gets our cookie.
std::vector<DisplayAddress> AddressesOf(const DisplayName& name);

} // namespace platform::x11
