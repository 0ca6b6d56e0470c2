// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer_context.h"

#include "src/share_util.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstddef>
#include <optional>

namespace {

using Values = std::vector<unsigned>;
using Guard = std::lock_guard<std::recursive_mutex>;

/// What a list holds, as traces call it.
struct ValueKind {
    const char* name;
    unsigned invalid;
};
constexpr ValueKind WINDOW{" windowHandle=", SHARE_INVALID_WINDOW};
constexpr ValueKind PROCESS{" processId=", SHARE_INVALID_PROCESS};
constexpr ValueKind DISPLAY{" displayId=", SHARE_INVALID_DISPLAY};

/// A change of one list, with the name of the operation that makes it.
struct Change {
    const char* operation;
    Values& list;
};

bool IsValid(const char* operation, const ValueKind& kind, unsigned value) {
    if (value != kind.invalid)
        return true;
    CmTraceWarning("ShareCapturerContext::", operation, " invalidate params", kind.name, value);
    return false;
}

void TraceChange(const char* operation, const ValueKind& kind, unsigned value, std::size_t countBefore) {
    CmTraceInfo("ShareCapturerContext::", operation, kind.name, value, ",current total count=", countBefore);
}

/// How many there were before; nothing when it is there already.
std::optional<std::size_t> Append(Values& list, unsigned value) {
    if (std::find(list.begin(), list.end(), value) != list.end())
        return std::nullopt;
    const std::size_t before = list.size();
    list.push_back(value);
    return before;
}

/// How many there were before; nothing when it is not there.
std::optional<std::size_t> Erase(Values& list, unsigned value) {
    const auto place = std::find(list.begin(), list.end(), value);
    if (place == list.end())
        return std::nullopt;
    const std::size_t before = list.size();
    list.erase(place);
    return before;
}

constexpr auto NOTHING_MORE = [] {};

/// Both lists change in one step: if the lock were given up in between, two threads that add the same value
/// to one list each would take it off both. Traces come afterwards, since a receiver is not ours to lock out.
template <class AlsoWhenAdded = decltype(NOTHING_MORE)>
int Add(std::recursive_mutex& mutex, const ValueKind& kind, unsigned value, const Change& onto,
        const Change& off, AlsoWhenAdded alsoWhenAdded = NOTHING_MORE) {
    if (!IsValid(onto.operation, kind, value))
        return SHARE_RESULT_INVALID_PARAM;
    std::optional<std::size_t> added;
    std::optional<std::size_t> removed;
    {
        const Guard lock(mutex);
        added = Append(onto.list, value);
        if (!added)
            return SHARE_RESULT_OK;
        alsoWhenAdded();
        removed = Erase(off.list, value);
    }
    TraceChange(onto.operation, kind, value, *added);
    if (removed)
        TraceChange(off.operation, kind, value, *removed);
    return SHARE_RESULT_OK;
}

template <class AlsoWhenRemoved = decltype(NOTHING_MORE)>
int Remove(std::recursive_mutex& mutex, const ValueKind& kind, unsigned value, const Change& off,
           AlsoWhenRemoved alsoWhenRemoved = NOTHING_MORE) {
    if (!IsValid(off.operation, kind, value))
        return SHARE_RESULT_INVALID_PARAM;
    std::optional<std::size_t> removed;
    {
        const Guard lock(mutex);
        removed = Erase(off.list, value);
        if (removed)
            alsoWhenRemoved();
    }
    if (!removed)
        return SHARE_RESULT_FAILED;
    TraceChange(off.operation, kind, value, *removed);
    return SHARE_RESULT_OK;
}

int CountOf(std::recursive_mutex& mutex, const Values& list) {
    const Guard lock(mutex);
    return static_cast<int>(list.size());
}

template <class Value>
int CopyOut(std::recursive_mutex& mutex, const Value& from, Value& to) {
    const Guard lock(mutex);
    to = from;
    return SHARE_RESULT_OK;
}

int BoxOf(std::recursive_mutex& mutex, const TVLRegion& region, TVLRect& rect) {
    rect = {};
    const Guard lock(mutex);
    if (region.IsEmpty())
        return SHARE_RESULT_FAILED;
    region.GetRgnBox(rect);
    return SHARE_RESULT_OK;
}

} // namespace

ShareCapturerContext::ShareCapturerContext() {
    m_sizeCaptureMax = TVLSize{2880, 1800};
    // What a client was told is kept out is kept out also when there is no memory left by then.
    constexpr std::size_t ROOM_FOR_KEPT_OUT = 256;
    m_vUnSharedWindows.reserve(ROOM_FOR_KEPT_OUT);
    m_vUnSharedApps.reserve(ROOM_FOR_KEPT_OUT);
}

ShareCapturerContext::~ShareCapturerContext() = default;

int ShareCapturerContext::UpdateShareCapturerContext() {
    return SHARE_RESULT_NOT_AVAILABLE;
}

bool ShareCapturerContext::shouldPauseCapturing() {
    return false;
}

int ShareCapturerContext::InitDisplays() {
    return SHARE_RESULT_NOT_AVAILABLE;
}

// ---- Windows and applications

int ShareCapturerContext::AddSharedWindow(unsigned window) {
    return Add(m_paramLock, WINDOW, window, {"AddSharedWindow", m_vSharedWindows},
               {"RemoveUnSharedWindow", m_vUnSharedWindows}, [this] {
                   ++m_nAdmissions;
                   _NoteChange();
               });
}

int ShareCapturerContext::RemoveSharedWindow(unsigned window) {
    return Remove(m_paramLock, WINDOW, window, {"RemoveSharedWindow", m_vSharedWindows}, [this] {
        ++m_nWithdrawals;
        _NoteChange();
    });
}

int ShareCapturerContext::AddUnSharedWindow(unsigned window) {
    return Add(m_paramLock, WINDOW, window, {"AddUnSharedWindow", m_vUnSharedWindows},
               {"RemoveSharedWindow", m_vSharedWindows}, [this] {
                   ++m_nWithdrawals;
                   _NoteChange();
               });
}

int ShareCapturerContext::RemoveUnSharedWindow(unsigned window) {
    return Remove(m_paramLock, WINDOW, window, {"RemoveUnSharedWindow", m_vUnSharedWindows}, [this] {
        ++m_nAdmissions;
        _NoteChange();
    });
}

int ShareCapturerContext::AddSharedApp(unsigned pid) {
    return Add(m_paramLock, PROCESS, pid, {"AddSharedApp", m_vSharedApps},
               {"RemoveUnSharedApp", m_vUnSharedApps}, [this] {
                   m_eShareType = SHARE_TYPE_APP;
                   ++m_nAdmissions;
                   _NoteChange();
               });
}

int ShareCapturerContext::RemoveSharedApp(unsigned pid) {
    return Remove(m_paramLock, PROCESS, pid, {"RemoveSharedApp", m_vSharedApps}, [this] {
        ++m_nWithdrawals;
        _NoteChange();
    });
}

int ShareCapturerContext::AddUnSharedApp(unsigned pid) {
    return Add(m_paramLock, PROCESS, pid, {"AddUnSharedApp", m_vUnSharedApps},
               {"RemoveSharedApp", m_vSharedApps}, [this] {
                   ++m_nWithdrawals;
                   _NoteChange();
               });
}

int ShareCapturerContext::RemoveUnSharedApp(unsigned pid) {
    return Remove(m_paramLock, PROCESS, pid, {"RemoveUnSharedApp", m_vUnSharedApps}, [this] {
        ++m_nAdmissions;
        _NoteChange();
    });
}

// ---- Displays: the list and the tables made from it change under one hold of the lock.

int ShareCapturerContext::AddSharedDisplay(unsigned display) {
    if (!IsValid("AddSharedDisplay", DISPLAY, display))
        return SHARE_RESULT_INVALID_PARAM;
    const Guard lock(m_displayLock);
    if (const std::optional<std::size_t> before = Append(m_vSharedDisplays, display)) {
        _NoteChange();
        TraceChange("AddSharedDisplay", DISPLAY, display, *before);
        InitDisplays();
    }
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::RemoveSharedDisplay(unsigned display) {
    if (!IsValid("RemoveSharedDisplay", DISPLAY, display))
        return SHARE_RESULT_INVALID_PARAM;
    const Guard lock(m_displayLock);
    if (const std::optional<std::size_t> before = Erase(m_vSharedDisplays, display)) {
        ++m_nWithdrawals;
        _NoteChange();
        TraceChange("RemoveSharedDisplay", DISPLAY, display, *before);
        InitDisplays();
    }
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::ClearSharedDisplay() {
    const Guard lock(m_displayLock);
    m_vSharedDisplays.clear();
    ++m_nWithdrawals;
    _NoteChange();
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::UpdateSharedDisplay(unsigned) {
    InitDisplays();
    return SHARE_RESULT_OK;
}

// ---- Settings

int ShareCapturerContext::SetFilterSelf(bool filter) {
    m_bFilterSelf = filter;
    if (m_eShareType != SHARE_TYPE_DESKTOP)
        return SHARE_RESULT_OK;
    if (filter)
        AddUnSharedApp(ShareUtil::GetCurrentPID());
    else
        RemoveUnSharedApp(ShareUtil::GetCurrentPID());
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::SetShareType(SHARE_TYPE type) {
    if (type == m_eShareType)
        return SHARE_RESULT_OK;
    m_eShareType = type;
    _NoteChange();
    CmTraceInfo("ShareCapturerContext::SetShareType eShareType=", static_cast<int>(type));
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::SetCaptureMaxSize(TVLSize size) {
    m_sizeCaptureMax = size;
    InitDisplays();
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetCaptureMaxSize(TVLSize& size) const {
    size = m_sizeCaptureMax;
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::SetCaptureFps(int fps) {
    if (fps < 1)
        return SHARE_RESULT_INVALID_PARAM;
    if (fps != m_nCaptureFps)
        CmTraceInfo("ShareCapturerContext::SetCaptureFps fps=", fps);
    m_nCaptureFps = fps;
    return SHARE_RESULT_OK;
}

// ---- Copies of the lists

int ShareCapturerContext::GetSharedWindowCount() const {
    return CountOf(m_paramLock, m_vSharedWindows);
}

int ShareCapturerContext::GetUnSharedWindowCount() const {
    return CountOf(m_paramLock, m_vUnSharedWindows);
}

int ShareCapturerContext::GetSharedAppCount() const {
    return CountOf(m_paramLock, m_vSharedApps);
}

int ShareCapturerContext::GetUnSharedAppCount() const {
    return CountOf(m_paramLock, m_vUnSharedApps);
}

int ShareCapturerContext::GetSharedMonitorCount() const {
    return CountOf(m_displayLock, m_vSharedDisplays);
}

int ShareCapturerContext::GetSharedWindows(std::vector<unsigned>& windows) const {
    return CopyOut(m_paramLock, m_vSharedWindows, windows);
}

int ShareCapturerContext::GetUnSharedWindows(std::vector<unsigned>& windows) const {
    return CopyOut(m_paramLock, m_vUnSharedWindows, windows);
}

int ShareCapturerContext::GetSharedProcesses(std::vector<unsigned>& pids) const {
    return CopyOut(m_paramLock, m_vSharedApps, pids);
}

int ShareCapturerContext::GetUnSharedProcesses(std::vector<unsigned>& pids) const {
    return CopyOut(m_paramLock, m_vUnSharedApps, pids);
}

int ShareCapturerContext::GetSharedMonitors(std::vector<unsigned>& displays) const {
    return CopyOut(m_displayLock, m_vSharedDisplays, displays);
}

// ---- Copies of what the walk and the displays gave

int ShareCapturerContext::GetCapturedExcludedWindows(std::vector<unsigned>& windows) const {
    return CopyOut(m_paramLock, m_vCapturedExcludedWindows, windows);
}

int ShareCapturerContext::GetAppMonitors(std::vector<unsigned>& displays) const {
    return CopyOut(m_paramLock, m_vAppDisplays, displays);
}

int ShareCapturerContext::GetDisplayRects(std::map<unsigned, TVLRect>& rects) const {
    return CopyOut(m_displayLock, m_mapDisplayRects, rects);
}

int ShareCapturerContext::GetOverlapRegion(TVLRegion& region) const {
    return CopyOut(m_paramLock, m_rgnOverlap, region);
}

int ShareCapturerContext::GetVisiableRegion(TVLRegion& region) const {
    return CopyOut(m_paramLock, m_rgnVisible, region);
}

int ShareCapturerContext::GetExposedRegion(TVLRegion& region) const {
    return CopyOut(m_paramLock, m_rgnExposed, region);
}

int ShareCapturerContext::GetSharedWindowRegion(TVLRegion& region) const {
    return CopyOut(m_paramLock, m_rgnSharedWindow, region);
}

int ShareCapturerContext::GetDisplayRegion(TVLRegion& region) const {
    const Guard lock(m_displayLock);
    region.CombineRgn(m_rgnDisplay, REGION_COMBINE_COPY);
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetInvisiableRegion(TVLRegion& region) const {
    CopyOut(m_displayLock, m_rgnDisplay, region);
    const Guard lock(m_paramLock);
    region.CombineRgn(m_rgnVisible, REGION_COMBINE_DIFF);
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetBackgroundInvisiableRegion(TVLRegion& region) const {
    CopyOut(m_displayLock, m_rgnDisplay, region);
    // One hold for both: a pixel that a walk moves from one to the other belongs to the background in
    // neither.
    const Guard lock(m_paramLock);
    region.CombineRgn(m_rgnVisible, REGION_COMBINE_DIFF);
    region.CombineRgn(m_rgnOverlap, REGION_COMBINE_DIFF);
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetSharedWindowBoxRect(TVLRect& rect) const {
    return BoxOf(m_paramLock, m_rgnSharedWindow, rect);
}

int ShareCapturerContext::GetDisplayBoxRect(TVLRect& rect) const {
    return BoxOf(m_displayLock, m_rgnDisplay, rect);
}
