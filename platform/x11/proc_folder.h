// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

namespace platform::x11 {

enum class Presence {
    There,
    Gone,
    Unknown, ///< Nothing can be opened at the moment, or kept.
};

/// A process as it was found.
struct ProcessLook {
    Presence presence = Presence::Unknown;
    std::uint64_t start = 0; ///< Of one that is there.
};

/// What the system tells of processes.
/// Threads: any.
class ProcFolder {
public:
    explicit ProcFolder(std::string path) : m_path(std::move(path)) {}

    /// With the time when it was started, in ticks since the system was; two processes that had the same id
    /// never have the same. Gone is one that has ended, even if nobody has waited for it, and one that isn't
    /// seen from here.
    ProcessLook LookAt(pid_t pid) const;
    /// Of the one that was started then.
    Presence PresenceOf(pid_t pid, std::uint64_t start) const;
    /// As the kernel names it; empty when it doesn't.
    std::string CommandOf(pid_t pid) const;
    /// Its program's file, without the folder; empty when others may not know.
    std::string ProgramOf(pid_t pid) const;

private:
    std::string File(pid_t pid, const char* name) const;

    std::string m_path;
};

/// The same for the text of a "stat" file.
std::optional<std::uint64_t> StartFromStat(std::string_view stat);

} // namespace platform::x11
