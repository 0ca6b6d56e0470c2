// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "platform/x11/desktop_entries.h"
#include "platform/x11/owned_descriptor.h"
#include "platform/x11/proc_folder.h"
#include "platform/x11/x11_connection.h"

#include <sys/types.h>
#include <cstddef>
#include <cstdint>
#include <map>
#include <memory>
#include <span>
#include <string>
#include <vector>

namespace platform::x11 {

class WindowTree;

/// What of a window tells about its application.
struct ApplicationWindow {
    pid_t pid = 0;
    std::string windowClass; ///< WM_CLASS, its second text.
    bool ordinary = false;   ///< A managed window of the kinds that people work in.
};

/// The processes that have windows, and processes that we were told to remember. An application is listed
/// from its first window until its process ends, also without a window; it outlives connections. Threads: one
/// at a time; the descriptors that it gives are for the X thread to wait on.
class ApplicationWatch {
public:
    /// So many processes are waited for by descriptor; others are looked at from time to time.
    static constexpr std::size_t MOST_DESCRIPTORS = 1024;

    /// `procDirectory` is "/proc" but in tests; `dataDirectories` are where desktop entries are looked for,
    /// empty for those of XDG_DATA_HOME and XDG_DATA_DIRS.
    explicit ApplicationWatch(const std::string& procDirectory = "/proc",
                              std::vector<std::string> dataDirectories = {});
    ~ApplicationWatch();
    ApplicationWatch(const ApplicationWatch&) = delete;
    ApplicationWatch& operator=(const ApplicationWatch&) = delete;

    /// The windows that there are now. True when the list has changed.
    bool Update(std::span<const ApplicationWindow> windows);
    /// Looks which processes have ended: those whose descriptor is readable, or, where there are no such
    /// descriptors, all. True when the list has changed.
    bool Reap();
    /// What poll is to wait on besides (pidfd); -1 never.
    std::vector<int> Descriptors() const;
    /// Closes them, until the next update.
    void CloseDescriptors();
    /// True when some process has no descriptor, so that Reap has to be called from time to time.
    bool NeedsPolling() const;

    /// Never null, by pid.
    std::shared_ptr<const ApplicationList> Applications() const { return m_applications; }

private:
    struct Process {
        ApplicationInfo info;
        std::uint64_t start = 0;
        OwnedDescriptor descriptor; // readable when it has ended; none where there is no such thing
        std::string windowClass;    // of the first window that had one, ordinary ones going first
        bool classIsOfOrdinary = false;
    };
    /// What the windows of a process tell of it together.
    struct Windows {
        std::string windowClass;
        std::string ordinaryClass;
        bool ordinary = false;
    };
    using WindowsByPid = std::map<pid_t, Windows>;

    bool Meet(pid_t pid);
    bool Watch(Process& process);
    void Describe(Process& process, const Windows* windows);
    bool Apply();
    bool RemoveEnded();
    bool Publish();

    const ProcFolder m_proc;
    const bool m_procIsReal; // so that its processes can be watched by descriptor
    DesktopEntries m_entries;
    std::vector<ApplicationWindow> m_windows; // of the last update
    std::map<pid_t, Process> m_processes;
    std::size_t m_descriptors = 0;
    // A process that has the id of one that has just ended, or that couldn't be looked at.
    bool m_mayHaveMissed = false;
    std::shared_ptr<const ApplicationList> m_applications;
};

/// Brings all windows of a process to the front, in their order, by asking the window manager; without one,
/// by raising them. False when it has none.
bool ActivateWindowsOf(X11Connection& connection, const WindowTree& tree, pid_t pid);

} // namespace platform::x11
