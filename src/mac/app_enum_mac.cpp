// SPDX-License-Identifier: Apache-2.0
#include "src/mac/app_enum_mac.h"

#include "platform/core_graphics.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_source_mac.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer_types.h>

#include <algorithm>
#include <cstddef>
#include <iterator>
#include <mutex>

namespace {

using Lock = std::lock_guard<std::recursive_mutex>;

/// Whether people can share a process, by what it is.
bool IsShareable(const platform::ProcessInfoRec& process) {
    static constexpr platform::OSType INTERACTIVE[] = {
        platform::FourCharCode("APPC"), platform::FourCharCode("APPD"), platform::FourCharCode("APPL"),
        platform::FourCharCode("BNDL"), platform::FourCharCode("cdev"), platform::FourCharCode("dfil"),
    };
    if ((process.processMode & platform::modeOnlyBackground) != 0)
        return false;
    // A Java program shows windows, but the system sees no more than its interpreter.
    return std::find(std::begin(INTERACTIVE), std::end(INTERACTIVE), process.processType) !=
               std::end(INTERACTIVE) ||
           process.processAppSpec == "java";
}

const char* NameOf(platform::NSNotificationName name) {
    switch (name) {
        case platform::NSWorkspaceDidLaunchApplicationNotification:
            return "NSWorkspaceDidLaunchApplicationNotification";
        case platform::NSWorkspaceDidTerminateApplicationNotification:
            return "NSWorkspaceDidTerminateApplicationNotification";
    }
    return "unknown";
}

void TraceNotification(const platform::NSNotification& notification) {
    CmTraceDebug(NameOf(notification.name),
                 " {NSApplicationProcessIdentifier=", notification.userInfo.NSApplicationProcessIdentifier,
                 "}");
}

} // namespace

// ---- Notices

void AppNotificationWapper::initWithAppEnum(CAppEnumMac* appEnum) {
    m_pAppEnum = appEnum;
    platform::NSNotificationCenter* const center =
        platform::NSWorkspace::sharedWorkspace()->notificationCenter();
    center->addObserver(
        this, [this](const platform::NSNotification& notification) { appStarted(notification); },
        platform::NSWorkspaceDidLaunchApplicationNotification);
    center->addObserver(
        this, [this](const platform::NSNotification& notification) { appTerminated(notification); },
        platform::NSWorkspaceDidTerminateApplicationNotification);
}

AppNotificationWapper::~AppNotificationWapper() {
    platform::NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(this);
}

void AppNotificationWapper::appStarted(const platform::NSNotification& notification) {
    TraceNotification(notification);
    if (m_pAppEnum == nullptr)
        return;
    // Held during the event: another thread may refresh the list meanwhile.
    const ShareRef<IShareSource> source =
        m_pAppEnum->AddApp(notification.userInfo.NSApplicationProcessIdentifier);
    m_pAppEnum->OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, source.Get());
}

void AppNotificationWapper::appTerminated(const platform::NSNotification& notification) {
    TraceNotification(notification);
    if (m_pAppEnum == nullptr)
        return;
    IShareSource* const source =
        m_pAppEnum->RemoveOneApp(notification.userInfo.NSApplicationProcessIdentifier);
    m_pAppEnum->OnShareSourceEvent(SHARE_SOURCE_EVENT_REMOVED, source);
    if (source != nullptr)
        source->Release();
}

// ---- The list

CAppEnumMac::CAppEnumMac(bool bWatchChanges) : m_bWatchChanges(bWatchChanges) {
    m_nEnumeratorType = SHARE_SOURCE_ENUMERATOR_TYPE_APP;
    if (!m_bWatchChanges)
        return;
    m_pAppNotification = std::make_unique<AppNotificationWapper>();
    m_pAppNotification->initWithAppEnum(this);
}

CAppEnumMac::~CAppEnumMac() {
    m_pAppNotification.reset();
}

void CAppEnumMac::Refresh() {
    CmTraceDebug("[CAppEnumMac::Refresh]");
    CmCallGuarded("[CAppEnumMac::Refresh] fail ", [this] {
        // Held all along: an application that ends meanwhile is taken off when the list is there, and two
        // that refresh don't list it twice.
        const Lock lock(m_sourceLock);
        CleanShareSource();
        EnumRunningApplications();
    });
}

int CAppEnumMac::OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) {
    CmTraceInfo("[CAppEnumMac::OnShareSourceEvent] event=", static_cast<int>(event));
    return CShareSourceEnumerator::OnShareSourceEvent(event, source);
}

int CAppEnumMac::EnumRunningApplications() {
    GetPrimaryMonitorRect();
    platform::ProcessSerialNumber process;
    while (platform::GetNextProcess(&process) == platform::noErr) {
        platform::ProcessInfoRec information;
        pid_t pid = 0;
        if (platform::GetProcessInformation(&process, &information) == platform::noErr &&
            IsShareable(information) && platform::GetProcessPID(&process, &pid) == platform::noErr)
            AddApp(pid);
    }
    const Lock lock(m_sourceLock);
    CmTraceInfo("[CAppEnumMac::EnumRunningApplications] count=", m_vShareSources.size());
    return SHARE_RESULT_OK;
}

IShareSource* CAppEnumMac::AddOneApp(int pid) {
    return AddApp(pid).Get();
}

ShareRef<IShareSource> CAppEnumMac::AddApp(int pid) {
    CmTraceDebug("[CAppEnumMac::AddOneApp] pid=", pid);
    ShareSourceInfo info;
    info.sourceId = static_cast<unsigned long>(pid);
    info.eType = SHARE_SOURCE_TYPE_APP;
    info.rect = m_rectPrimaryMonitor;
    info.fScale = CMonitorEnumMac::screenScaleFactorForDisplayID(platform::CGMainDisplayID());
    ShareRef<IShareSource> source(new CShareSourceMac);
    source.Get()->SetInfo(&info);
    AppendSource(source.Get());
    return source;
}

IShareSource* CAppEnumMac::RemoveOneApp(int pid) {
    IShareSource* source = nullptr;
    RemoveSourceById(static_cast<unsigned long>(pid), &source);
    return source;
}

TVLRect CAppEnumMac::GetPrimaryMonitorRect() {
    const TVLRect rect = CMonitorEnumMac::primaryScreenUIRectForDisplayID();
    m_rectPrimaryMonitor = rect;
    return rect;
}
