// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/app_kit.h"
#include "src/share_ref.h"
#include "src/share_source_enum.h"

#include <screenshare/share_types.h>

#include <optional>
#include <string>
#include <vector>

/// The online displays, and what the rest of the library asks about a display.
///
/// A display has two rectangles: the user-interface one in global points, and the image one in the pixels of
/// a picture of that display alone, from 0,0. Threads: those of the base; a watching one hears of changes on
/// the notice thread.
class CMonitorEnumMac : public CShareSourceEnumerator {
public:
    /// Starts empty; Refresh fills it. Watching lasts from here to the destructor.
    explicit CMonitorEnumMac(bool bWatchChanges);
    ~CMonitorEnumMac() override;

    void Refresh() override;

    /// Appends every display. -1 when there is none.
    int EnumMonitors();
    /// The source belongs to the list: good for as long as nobody else changes it.
    IShareSource* AddOneMonitor(unsigned display, const char* name);
    void OnDisplayPlugin(unsigned display);
    void OnDisplayPlugout(unsigned display);
    void OnDisplayUpdated(unsigned display);

    static std::optional<platform::NSScreen> screenForDisplayID(unsigned display);
    /// UTF-8; empty when unknown.
    static std::string screenNameForDisplayID(unsigned display);
    /// 1 when unknown.
    static float screenScaleFactorForDisplayID(unsigned display);
    static TVLRect screenImageRectForDisplayID(unsigned display);
    static TVLRect screenUIRectForDisplayID(unsigned display);
    static TVLRect primaryScreenImageRectForDisplayID();
    static TVLRect primaryScreenUIRectForDisplayID();

private:
    ShareRef<IShareSource> AddMonitor(unsigned display, const char* name);

    const bool m_bWatchChanges;
    /// What sinks were shown as updated. They may count on it until the enumerator ends.
    std::vector<ShareRef<IShareSource>> m_vUpdatedSources; // guarded by m_sourceLock
};

/// "|Add|Moved" and so on, a word for each known flag.
std::string DisplayReconfigCallBackFlagsToString(unsigned flags);

/// What a watching enumerator registers; `userData` is the CMonitorEnumMac.
void CMonitorEnumMac_DisplayReconfigCallBack(unsigned display, unsigned flags, void* userData);
