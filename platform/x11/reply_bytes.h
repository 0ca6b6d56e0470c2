// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>

namespace platform::x11 {

/// What has come behind the fixed part of a reply. The counts inside a reply are the server's word and may
/// name more than that; libxcb's iterators believe them.
/// Lifetime: that of the reply.
template <class Reply>
std::span<const std::uint8_t> BytesBehind(const Reply& reply) {
    constexpr std::size_t SHORTEST = 32; // of any reply
    const std::size_t size = SHORTEST + std::size_t{reply.length} * 4;
    if (size <= sizeof(Reply))
        return {};
    return {reinterpret_cast<const std::uint8_t*>(&reply) + sizeof(Reply), size - sizeof(Reply)};
}

/// Up to `size` bytes from `offset`; fewer, or none, where there are no more.
inline std::span<const std::uint8_t> Part(std::span<const std::uint8_t> bytes, std::size_t offset,
                                          std::size_t size) {
    if (offset >= bytes.size())
        return {};
    const std::size_t rest = bytes.size() - offset;
    return bytes.subspan(offset, size < rest ? size : rest);
}

inline std::string_view TextOf(std::span<const std::uint8_t> bytes) {
    return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

} // namespace platform::x11
