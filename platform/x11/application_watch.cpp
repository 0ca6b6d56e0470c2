// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/application_watch.h"

#include "platform/utf8.h"

#include <poll.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdint>
#include <optional>
#include <utility>

namespace platform::x11 {

namespace {

const char* const PROC = "/proc";

/// Close-on-exec by itself. The C library has no function for it everywhere.
OwnedDescriptor OpenProcess(pid_t pid) {
    return OwnedDescriptor(static_cast<int>(syscall(SYS_pidfd_open, pid, 0)));
}

bool IsSameApplication(const ApplicationInfo& one, const ApplicationInfo& other) {
    return one.pid == other.pid && one.name == other.name && one.fileName == other.fileName &&
           one.kind == other.kind && one.backgroundOnly == other.backgroundOnly;
}

/// The first that isn't empty.
std::string FirstOf(const std::vector<std::string>& texts) {
    const auto found =
        std::find_if(texts.begin(), texts.end(), [](const std::string& text) { return !text.empty(); });
    return found != texts.end() ? *found : std::string();
}

/// What a client or the system says, fit to be shown.
std::string ForPeople(const std::string& text) {
    return WithoutControls(MendedUtf8(text));
}

} // namespace

ApplicationWatch::ApplicationWatch(const std::string& procDirectory, std::vector<std::string> dataDirectories)
    : m_proc(procDirectory),
      m_procIsReal(procDirectory == PROC),
      m_entries(dataDirectories.empty() ? DesktopEntries::DefaultDirectories() : std::move(dataDirectories)),
      m_applications(std::make_shared<const ApplicationList>()) {}

ApplicationWatch::~ApplicationWatch() = default;

bool ApplicationWatch::Update(std::span<const ApplicationWindow> windows) {
    m_windows.assign(windows.begin(), windows.end());
    return Apply();
}

bool ApplicationWatch::Reap() {
    if (m_mayHaveMissed)
        return Apply();
    return RemoveEnded() && Publish();
}

bool ApplicationWatch::Apply() {
    // Who gets the id of one that has just ended is listed next time: until then the list is without that id,
    // so that the end and the launch are both seen.
    std::vector<pid_t> before;
    for (const auto& [pid, process] : m_processes)
        before.push_back(pid);
    for (auto& [pid, process] : m_processes)
        Watch(process); // one that has ended is found below
    RemoveEnded();
    m_mayHaveMissed = false;

    WindowsByPid byPid;
    for (const ApplicationWindow& window : m_windows) {
        const bool hasJustEnded = m_processes.count(window.pid) == 0 &&
                                  std::binary_search(before.begin(), before.end(), window.pid);
        m_mayHaveMissed = m_mayHaveMissed || hasJustEnded;
        if (hasJustEnded || !Meet(window.pid))
            continue;
        Windows& windowsOf = byPid[window.pid];
        std::string& windowClass = window.ordinary ? windowsOf.ordinaryClass : windowsOf.windowClass;
        if (windowClass.empty())
            windowClass = window.windowClass;
        windowsOf.ordinary = windowsOf.ordinary || window.ordinary;
    }
    for (auto& [pid, process] : m_processes) {
        const auto windowsOf = byPid.find(pid);
        Describe(process, windowsOf != byPid.end() ? &windowsOf->second : nullptr);
    }
    return Publish();
}

/// False for a process that isn't there, as when it lives behind a wall of containers, and for one of which
/// that can't be told yet.
bool ApplicationWatch::Meet(pid_t pid) {
    if (pid <= 0)
        return false;
    if (m_processes.count(pid) != 0)
        return true;
    const ProcessLook look = m_proc.LookAt(pid);
    m_mayHaveMissed = m_mayHaveMissed || look.presence == Presence::Unknown;
    if (look.presence != Presence::There)
        return false;
    Process process;
    process.info.pid = pid;
    process.start = look.start;
    if (!Watch(process))
        return false;
    process.info.fileName = MendedUtf8(FirstOf({m_proc.ProgramOf(pid), m_proc.CommandOf(pid)}));
    m_processes.emplace(pid, std::move(process));
    return true;
}

/// False when it has ended, or is none.
bool ApplicationWatch::Watch(Process& process) {
    if (process.descriptor || !m_procIsReal || m_descriptors >= MOST_DESCRIPTORS)
        return true;
    OwnedDescriptor descriptor = OpenProcess(process.info.pid);
    // The last two are for the id of a thread, by the kernel's age.
    if (!descriptor && (errno == ESRCH || errno == EINVAL || errno == ENOENT))
        return false;
    // Another process may have got the id before it was opened.
    const Presence presence = m_proc.PresenceOf(process.info.pid, process.start);
    if (presence != Presence::There)
        return presence == Presence::Unknown;
    m_descriptors += descriptor ? 1U : 0U;
    process.descriptor = std::move(descriptor);
    return true;
}

/// Null `windows` for none. Class and kind are kept once they are known, so that an application doesn't
/// change its name with the order of its windows.
void ApplicationWatch::Describe(Process& process, const Windows* windows) {
    ApplicationInfo& info = process.info;
    const bool isNew = info.name.empty();
    info.backgroundOnly = windows == nullptr;
    std::string windowClass = process.windowClass;
    if (windows != nullptr && !process.classIsOfOrdinary) {
        windowClass = FirstOf({windows->ordinaryClass, windowClass, windows->windowClass});
        process.classIsOfOrdinary = !windows->ordinaryClass.empty();
    }
    if (isNew)
        info.kind = ApplicationKind::Other;
    if (windows != nullptr && windows->ordinary)
        info.kind = ApplicationKind::Ordinary;
    if (!isNew && windowClass == process.windowClass)
        return;
    process.windowClass = std::move(windowClass);
    const std::string* const entry = m_entries.NameOf(process.windowClass);
    if (entry != nullptr)
        info.kind = ApplicationKind::Ordinary;
    info.name = FirstOf({entry != nullptr ? *entry : std::string(), ForPeople(process.windowClass),
                         ForPeople(m_proc.CommandOf(info.pid)), info.fileName,
                         "Process " + std::to_string(info.pid)});
}

bool ApplicationWatch::RemoveEnded() {
    std::vector<pollfd> polled;
    std::vector<pid_t> ended;
    std::vector<pid_t> polledPids;
    for (const auto& [pid, process] : m_processes) {
        if (process.descriptor) {
            polled.push_back({process.descriptor.Get(), POLLIN, 0});
            polledPids.push_back(pid);
        } else if (m_proc.PresenceOf(pid, process.start) == Presence::Gone) {
            ended.push_back(pid);
        }
    }
    const int ready = !polled.empty() ? poll(polled.data(), polled.size(), 0) : 0;
    for (std::size_t i = 0; ready > 0 && i < polled.size(); ++i) {
        if (polled[i].revents == 0)
            continue;
        ended.push_back(polledPids[i]);
        --m_descriptors;
    }
    for (const pid_t pid : ended)
        m_processes.erase(pid);
    return !ended.empty();
}

bool ApplicationWatch::Publish() {
    ApplicationList list;
    for (const auto& [pid, process] : m_processes)
        list.push_back(process.info);
    if (std::equal(list.begin(), list.end(), m_applications->begin(), m_applications->end(),
                   IsSameApplication))
        return false;
    m_applications = std::make_shared<const ApplicationList>(std::move(list));
    return true;
}

std::vector<int> ApplicationWatch::Descriptors() const {
    std::vector<int> descriptors;
    for (const auto& [pid, process] : m_processes) {
        if (process.descriptor)
            descriptors.push_back(process.descriptor.Get());
    }
    return descriptors;
}

void ApplicationWatch::CloseDescriptors() {
    for (auto& [pid, process] : m_processes)
        process.descriptor = OwnedDescriptor();
    m_descriptors = 0;
}

bool ApplicationWatch::NeedsPolling() const {
    return m_mayHaveMissed || m_descriptors < m_processes.size();
}

} // namespace platform::x11
