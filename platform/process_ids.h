// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/app_kit.h"
#include "platform/window_services.h"

#include <sys/types.h>
#include <cstdint>
#include <limits>
#include <optional>

/// How processes are named towards callers: for the upper floor itself.
namespace platform {

/// Nothing for a name that no process has.
inline std::optional<pid_t> ProcessOf(const ProcessSerialNumber& process) {
    constexpr auto LAST = static_cast<std::uint32_t>(std::numeric_limits<pid_t>::max());
    if (process.highLongOfPSN != 0 || process.lowLongOfPSN == 0 || process.lowLongOfPSN > LAST)
        return std::nullopt;
    return static_cast<pid_t>(process.lowLongOfPSN);
}

inline ProcessSerialNumber SerialNumberOf(pid_t pid) {
    return {0, static_cast<std::uint32_t>(pid)};
}

/// Set in every connection, so that none passes for a process id, and a process id for none.
inline constexpr CGSConnectionID CONNECTION_MARK = 0x80000000;

/// `pid` is above 0.
inline CGSConnectionID ConnectionOf(pid_t pid) {
    return CONNECTION_MARK | static_cast<CGSConnectionID>(pid);
}

/// Nothing for what is no connection.
inline std::optional<pid_t> ProcessOfConnection(CGSConnectionID connection) {
    if (connection <= CONNECTION_MARK)
        return std::nullopt;
    return static_cast<pid_t>(connection & ~CONNECTION_MARK);
}

} // namespace platform
