// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <xcb/xcb.h>

#include <cstdint>

namespace platform::x11 {

/// Sent by a client, so it is no word of the server's and may be a lie.
inline bool IsSentByClient(const xcb_generic_event_t& event) {
    constexpr std::uint8_t SENT = 0x80;
    return (event.response_type & SENT) != 0;
}

/// The event as that of its type.
template <class Specific>
const Specific& As(const xcb_generic_event_t& event) {
    return reinterpret_cast<const Specific&>(event);
}

} // namespace platform::x11
