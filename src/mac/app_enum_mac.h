// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/app_kit.h"
#include "src/share_atomic.h"
#include "src/share_ref.h"
#include "src/share_source_enum.h"

#include <screenshare/share_types.h>

#include <memory>

class CAppEnumMac;

/// Hands the workspace's notices on to an enumerator. Its end waits for a notice that is being handed on.
class AppNotificationWapper {
public:
    AppNotificationWapper() = default;
    ~AppNotificationWapper();
    AppNotificationWapper(const AppNotificationWapper&) = delete;
    AppNotificationWapper& operator=(const AppNotificationWapper&) = delete;

    /// From now on there are notices. Once; `appEnum` must live longer.
    void initWithAppEnum(CAppEnumMac* appEnum);
    void appStarted(const platform::NSNotification& notification);
    void appTerminated(const platform::NSNotification& notification);

private:
    CAppEnumMac* m_pAppEnum = nullptr;
};

/// The running applications that can be shared.
///
/// Each has the rectangle and the scale of the primary monitor, wherever its windows are, and tells its name
/// on demand. Threads: those of the base; a watching one hears of starts and ends on the notice thread.
class CAppEnumMac : public CShareSourceEnumerator {
public:
    /// Starts empty; Refresh fills it. Watching lasts from here to the destructor.
    explicit CAppEnumMac(bool bWatchChanges);
    ~CAppEnumMac() override;

    void Refresh() override;
    int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) override;

    /// Appends what people start and what is a Java program, background-only processes left out.
    int EnumRunningApplications();
    /// The source belongs to the list: good for as long as nobody else changes it.
    IShareSource* AddOneApp(int pid);
    /// With a reference for the caller; null for an unknown process.
    IShareSource* RemoveOneApp(int pid);
    /// Looks it up anew, for the applications that come.
    TVLRect GetPrimaryMonitorRect();

private:
    friend class AppNotificationWapper;

    ShareRef<IShareSource> AddApp(int pid);

    const bool m_bWatchChanges;
    ShareRelaxedRect m_rectPrimaryMonitor;
    std::unique_ptr<AppNotificationWapper> m_pAppNotification;
};
