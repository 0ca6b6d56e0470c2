// SPDX-License-Identifier: Apache-2.0
#include "src/mac/monitor_enum_mac.h"

#include "platform/core_graphics.h"
#include "src/mac/share_source_mac.h"
#include "src/mac/share_util_mac.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer_types.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <utility>

namespace {

constexpr std::uint32_t MOST_DISPLAYS = 64;

constexpr unsigned UPDATE_FLAGS = platform::kCGDisplayMovedFlag | platform::kCGDisplaySetMainFlag |
                                  platform::kCGDisplayDesktopShapeChangedFlag;

using Lock = std::lock_guard<std::recursive_mutex>;

/// Takes over a reference that was handed out.
ShareRef<IShareSource> Adopt(IShareSource* source) {
    ShareRef<IShareSource> adopted(source);
    if (source != nullptr)
        source->Release();
    return adopted;
}

const char* ActionOf(unsigned flags) {
    if ((flags & platform::kCGDisplayAddFlag) != 0)
        return "add";
    return (flags & platform::kCGDisplayRemoveFlag) != 0 ? "remove" : "update";
}

void TraceReconfiguration(unsigned display, unsigned flags) {
    std::array<char, 2 * sizeof flags + 1> hex{};
    std::to_chars(hex.data(), hex.data() + hex.size() - 1, flags, 16);
    CmTraceInfo("[ShareCapturerTovel_DisplayReconfigCallBack] displayid=", display,
                " action=", ActionOf(flags), " flags=", "0x", static_cast<const char*>(hex.data()),
                " details=", DisplayReconfigCallBackFlagsToString(flags));
}

} // namespace

CMonitorEnumMac::CMonitorEnumMac(bool bWatchChanges) : m_bWatchChanges(bWatchChanges) {
    m_nEnumeratorType = SHARE_SOURCE_ENUMERATOR_TYPE_MONITOR;
    if (m_bWatchChanges)
        platform::CGDisplayRegisterReconfigurationCallback(CMonitorEnumMac_DisplayReconfigCallBack, this);
}

CMonitorEnumMac::~CMonitorEnumMac() {
    if (m_bWatchChanges)
        platform::CGDisplayRemoveReconfigurationCallback(CMonitorEnumMac_DisplayReconfigCallBack, this);
}

// ---- The list

void CMonitorEnumMac::Refresh() {
    CmTraceDebug("[CMonitorEnumMac::Refresh]");
    CmCallGuarded("[CMonitorEnumMac::Refresh] fail ", [this] {
        // Held all along: a display that goes meanwhile is taken off when the list is there, and two that
        // refresh don't list it twice.
        const Lock lock(m_sourceLock);
        CleanShareSource();
        EnumMonitors();
    });
}

int CMonitorEnumMac::EnumMonitors() {
    std::array<platform::CGDirectDisplayID, MOST_DISPLAYS> displays{};
    std::uint32_t count = 0;
    const platform::CGError error = platform::CGGetOnlineDisplayList(MOST_DISPLAYS, displays.data(), &count);
    const bool found = error == platform::kCGErrorSuccess && count != 0;
    if (found) {
        for (std::size_t i = 0; i < std::min(count, MOST_DISPLAYS); ++i)
            AddMonitor(displays[i], "");
    }
    CmTraceDebug("[CMonitorEnumMac::EnumMonitors] count=", count);
    return found ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

IShareSource* CMonitorEnumMac::AddOneMonitor(unsigned display, const char* name) {
    return AddMonitor(display, name).Get();
}

ShareRef<IShareSource> CMonitorEnumMac::AddMonitor(unsigned display, const char* name) {
    CmTraceDebug("[CMonitorEnumMac::AddOneMonitor] displayid=", display);
    ShareSourceInfo info;
    info.sourceId = display;
    info.eType = SHARE_SOURCE_TYPE_MONITOR;
    info.rect = screenUIRectForDisplayID(display);
    info.fScale = screenScaleFactorForDisplayID(display);
    if (name != nullptr)
        info.SetSourceName(name, static_cast<int>(strnlen(name, SHARE_SOURCE_TEXT_SIZE - 1)));
    ShareRef<IShareSource> source(new CShareSourceMac);
    source.Get()->SetInfo(&info);
    AppendSource(source.Get());
    return source;
}

// ---- Changes

void CMonitorEnumMac::OnDisplayPlugin(unsigned display) {
    // Held during the event: another thread may refresh the list meanwhile.
    const ShareRef<IShareSource> source = AddMonitor(display, "");
    OnShareSourceEvent(SHARE_SOURCE_EVENT_ADDED, source.Get());
}

void CMonitorEnumMac::OnDisplayPlugout(unsigned display) {
    IShareSource* removed = nullptr;
    if (!RemoveSourceById(display, &removed))
        return;
    const ShareRef<IShareSource> source = Adopt(removed);
    OnShareSourceEvent(SHARE_SOURCE_EVENT_REMOVED, source.Get());
}

void CMonitorEnumMac::OnDisplayUpdated(unsigned display) {
    Refresh();
    IShareSource* source = nullptr;
    if (GetSourceBySourceId(display, &source) == SHARE_RESULT_OK) {
        ShareRef<IShareSource> updated = Adopt(source);
        const Lock lock(m_sourceLock);
        m_vUpdatedSources.push_back(std::move(updated));
    }
    OnShareSourceEvent(SHARE_SOURCE_EVENT_UPDATED, source);
}

void CMonitorEnumMac_DisplayReconfigCallBack(unsigned display, unsigned flags, void* userData) {
    if (userData == nullptr)
        return;
    TraceReconfiguration(display, flags);
    auto* const monitors = static_cast<CMonitorEnumMac*>(userData);
    if ((flags & platform::kCGDisplayAddFlag) != 0)
        monitors->OnDisplayPlugin(display);
    if ((flags & platform::kCGDisplayRemoveFlag) != 0)
        monitors->OnDisplayPlugout(display);
    if ((flags & UPDATE_FLAGS) != 0)
        monitors->OnDisplayUpdated(display);
}

std::string DisplayReconfigCallBackFlagsToString(unsigned flags) {
    static constexpr std::pair<unsigned, const char*> WORDS[] = {
        {platform::kCGDisplayAddFlag, "|Add"},
        {platform::kCGDisplayRemoveFlag, "|Remove"},
        {platform::kCGDisplayBeginConfigurationFlag, "|Begin"},
        {platform::kCGDisplayMovedFlag, "|Moved"},
        {platform::kCGDisplaySetMainFlag, "|SetMain"},
        {platform::kCGDisplaySetModeFlag, "|SetMode"},
        {platform::kCGDisplayEnabledFlag, "|Enabled"},
        {platform::kCGDisplayDisabledFlag, "|Disabled"},
        {platform::kCGDisplayMirrorFlag, "|Mirror"},
        {platform::kCGDisplayUnMirrorFlag, "|UnMirror"},
        {platform::kCGDisplayDesktopShapeChangedFlag, "|ShapeChanged"},
    };
    std::string text;
    for (const auto& [flag, word] : WORDS) {
        if ((flags & flag) != 0)
            text += word;
    }
    return text;
}

// ---- Displays

std::optional<platform::NSScreen> CMonitorEnumMac::screenForDisplayID(unsigned display) {
    for (const platform::NSScreen& screen : platform::NSScreen::screens()) {
        if (screen.deviceDescription().NSScreenNumber == display)
            return screen;
    }
    return std::nullopt;
}

std::string CMonitorEnumMac::screenNameForDisplayID(unsigned display) {
    return platform::DisplayProductName(display);
}

float CMonitorEnumMac::screenScaleFactorForDisplayID(unsigned display) {
    const auto screen = screenForDisplayID(display);
    return screen ? screen->backingScaleFactor() : 1.0F;
}

TVLRect CMonitorEnumMac::screenImageRectForDisplayID(unsigned display) {
    const platform::CGSize size = platform::CGDisplayBounds(display).size;
    const float scale = screenScaleFactorForDisplayID(display);
    return {0, 0, CmTruncate(size.width * scale), CmTruncate(size.height * scale)};
}

TVLRect CMonitorEnumMac::screenUIRectForDisplayID(unsigned display) {
    return ShareUtilMac::CGRectToTVLRect(platform::CGDisplayBounds(display));
}

TVLRect CMonitorEnumMac::primaryScreenImageRectForDisplayID() {
    return screenImageRectForDisplayID(platform::CGMainDisplayID());
}

TVLRect CMonitorEnumMac::primaryScreenUIRectForDisplayID() {
    return screenUIRectForDisplayID(platform::CGMainDisplayID());
}
