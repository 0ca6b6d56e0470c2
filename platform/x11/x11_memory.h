// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <sys/types.h>
#include <array>
#include <cstdint>
#include <functional>
#include <string>
#include <unordered_map>

namespace platform::x11 {

/// Turns the names of X windows, which the server gives to others after a window is gone, into ids that never
/// mean another window. An X name has 29 bits; the three above count how often the name was used before. The
/// first use, and every window of our own process, has the plain name as its id. A server gives whoever
/// connects next the names of who left last, so programs that come and go use the same few names over and
/// over: after the eighth use a name has ids that would be others' eighth, from the far end, where hardly a
/// name is.
///
/// A name is in use from its claim to its release, over connections as well: whoever connects again to the
/// same server finds the windows that he knew under the ids that they had.
/// Threads: one at a time.
class WindowIds {
public:
    static constexpr std::uint32_t NAME_BITS = 29;
    static constexpr std::uint32_t LAST_INCARNATION = 7;

    /// The id of a window; the same one until its name is released. 0 for what is no name, and when there
    /// have been 500 million windows whose name was used too often.
    CGWindowID Claim(std::uint32_t name, pid_t owner, bool ours);
    /// The window of that name is gone; the next one of that name is another. Nothing for a name that nobody
    /// has claimed.
    void Release(std::uint32_t name);
    bool IsClaimed(std::uint32_t name) const { return m_claims.count(name) != 0; }
    /// The owner with whom it was claimed last; 0 for a name that isn't.
    pid_t OwnerOf(std::uint32_t name) const;
    /// Releases every name for which `isGone` says so.
    void ReleaseIf(const std::function<bool(std::uint32_t name)>& isGone);
    /// Of an id of the first eight uses.
    static std::uint32_t NameOf(CGWindowID id) { return id & ((1U << NAME_BITS) - 1); }

private:
    struct ClaimedName {
        CGWindowID id = 0;
        pid_t owner = 0;
    };
    /// How often each of so many neighbouring names was released, four bits each. A client's names lie close
    /// together, and it may use up millions.
    static constexpr std::uint32_t PAGE_NAMES = 1024;
    using Page = std::array<std::uint8_t, PAGE_NAMES / 2>;

    std::uint32_t UsesOf(std::uint32_t name) const;
    CGWindowID NewIdOf(std::uint32_t name);
    CGWindowID SpareId();

    std::unordered_map<std::uint32_t, ClaimedName> m_claims;
    std::unordered_map<std::uint32_t, Page> m_uses;
    CGWindowID m_lowestSpare =
        ~CGWindowID{0}; // from it on there is none left, but the last, which nobody gets
};

/// Gives a monitor the same id for ever, by what it says of itself: connector and EDID.
/// Threads: one at a time.
class DisplayIds {
public:
    /// Never 0, never all bits set.
    CGDirectDisplayID IdOf(const std::string& connector, const std::string& edid);

private:
    bool IsGiven(CGDirectDisplayID id) const;

    std::unordered_map<std::string, CGDirectDisplayID> m_ids;
};

/// What outlives a connection. The X thread's own.
struct Memory {
    WindowIds windowIds;
    DisplayIds displayIds;
    /// An atom that nobody else makes, so that a server that has it is the one that was there before. Empty
    /// until the first connection.
    std::string serverMark;
    /// Grows with each change of the stack, over all connections.
    std::uint64_t generation = 0;
    std::uint64_t lastCursorSerial = 0;
};

} // namespace platform::x11
