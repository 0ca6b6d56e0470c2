// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"

#include "platform/notices.h"
#include "platform/process_ids.h"
#include "platform/window_pins.h"
#include "platform/window_server.h"
#include "util/cm_guarded_call.h"

#include <algorithm>
#include <memory>
#include <utility>

namespace platform {

namespace {

/// Null for a process that is no running application. Keeps the list that it is in.
std::shared_ptr<const ApplicationInfo> FindApplication(pid_t pid) {
    const std::shared_ptr<const ApplicationList> applications = WindowServerInUse()->GetApplications();
    const auto found = std::find_if(applications->begin(), applications->end(),
                                    [pid](const ApplicationInfo& each) { return each.pid == pid; });
    if (found == applications->end())
        return nullptr;
    return {applications, &*found};
}

bool OwnsWindow(pid_t pid) {
    const std::shared_ptr<const WindowSnapshot> windows = WindowsForLookUp();
    return std::any_of(windows->Windows().begin(), windows->Windows().end(),
                       [pid](const WindowInfo& window) { return window.owner == pid; });
}

bool IsKnown(pid_t pid) {
    return pid > 0 && (FindApplication(pid) != nullptr || OwnsWindow(pid));
}

ProcessInfoRec InformationOf(const ApplicationInfo& application) {
    ProcessInfoRec information;
    information.processName = application.name;
    information.processType =
        application.kind == ApplicationKind::Ordinary ? FourCharCode("APPL") : FourCharCode("????");
    information.processMode = application.backgroundOnly ? modeOnlyBackground : 0;
    information.processAppSpec = application.fileName;
    return information;
}

} // namespace

OSStatus GetNextProcess(ProcessSerialNumber* process) noexcept {
    if (process == nullptr)
        return paramErr;
    const pid_t after = ProcessOf(*process).value_or(0);
    const std::shared_ptr<const ApplicationList> applications = WindowServerInUse()->GetApplications();
    // By number and not by place, which changes as others come and go.
    pid_t next = 0;
    for (const ApplicationInfo& application : *applications) {
        if (application.pid > after && (next == 0 || application.pid < next))
            next = application.pid;
    }
    *process = next != 0 ? SerialNumberOf(next) : ProcessSerialNumber{};
    return next != 0 ? noErr : procNotFound;
}

OSStatus GetProcessInformation(const ProcessSerialNumber* process, ProcessInfoRec* information) noexcept {
    if (process == nullptr || information == nullptr)
        return paramErr;
    OSStatus status = memFullErr;
    CmCallGuarded("[GetProcessInformation]>>exception: ", [&] {
        const std::shared_ptr<const ApplicationInfo> found = FindApplication(ProcessOf(*process).value_or(0));
        if (found != nullptr)
            *information = InformationOf(*found);
        status = found != nullptr ? noErr : procNotFound;
    });
    return status;
}

OSStatus GetProcessPID(const ProcessSerialNumber* process, pid_t* pid) noexcept {
    if (process == nullptr || pid == nullptr)
        return paramErr;
    const std::optional<pid_t> found = ProcessOf(*process);
    if (!found || !IsKnown(*found))
        return procNotFound;
    *pid = *found;
    return noErr;
}

OSStatus GetProcessForPID(pid_t pid, ProcessSerialNumber* process) noexcept {
    if (process == nullptr)
        return paramErr;
    if (!IsKnown(pid))
        return procNotFound;
    *process = SerialNumberOf(pid);
    return noErr;
}

} // namespace platform
