// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

/// The bytes that a client and an X server exchange first, and what proves that the client may come in.
/// Nothing here talks to the server.
namespace platform::x11 {

using Bytes = std::vector<std::uint8_t>;

/// The MIT-MAGIC-COOKIE-1 for a display of a host, as in an authority file: the first entry that fits; empty
/// when there is none. The file may hold anything.
Bytes FindCookie(std::span<const std::uint8_t> authorityFile, std::string_view host,
                 std::string_view displayNumber);

/// The same from the user's own file: that of XAUTHORITY, else .Xauthority at home. `displayNumber` is one of
/// this host. Never waits for whoever might write the file.
Bytes CookieOf(int displayNumber);

/// Of this machine; empty when it can't be told.
std::string HostName();

/// What the client says first. Without a cookie it says so.
Bytes MakeGreeting(const Bytes& cookie);

/// What the server answers begins with so many bytes,
inline constexpr std::size_t ANSWER_HEAD = 8;
/// which tell how many there are in all.
std::size_t AnswerLength(std::span<const std::uint8_t, ANSWER_HEAD> head);

/// Whether an answer lets the client in and every part of it lies within it, so that it can be walked through
/// without looking.
bool IsSoundWelcome(std::span<const std::uint8_t> answer);

} // namespace platform::x11
