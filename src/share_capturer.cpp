// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer.h"

#include "src/app_share_config.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/share_capturer_context.h"
#include "src/share_common_util.h"
#include "src/share_ref.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <cstddef>
#include <utility>

namespace {

/// Shared windows that lie on several monitors are news once they have stayed so for this long, ms.
constexpr unsigned CROSS_MONITOR_SETTLED_MS = 1001;

using Lock = std::lock_guard<std::recursive_mutex>;

} // namespace

CShareCapturer::CShareCapturer(const std::shared_ptr<ShareCapturerContext>& context)
    : m_shareCapturerContext(context) {}

CShareCapturer::~CShareCapturer() {
    Cleanup();
}

void CShareCapturer::Cleanup() {
    std::vector<IShareSource*> sources;
    {
        const Lock lock(m_mutexLists);
        m_vecSinks.clear();
        sources.swap(m_vecShareSources);
    }
    for (IShareSource* const source : sources) {
        if (source != nullptr)
            source->Release();
    }
}

// ---- Sinks

CShareCapturer::SinkPlace CShareCapturer::FindSink(IShareCapturerSink* sink) {
    return sink != nullptr ? std::find(m_vecSinks.begin(), m_vecSinks.end(), sink) : m_vecSinks.end();
}

int CShareCapturer::AddSink(IShareCapturerSink* sink) {
    if (sink == nullptr)
        return SHARE_RESULT_FAILED;
    const Lock lock(m_mutexLists);
    if (FindSink(sink) != m_vecSinks.end()) {
        CmTraceDebug("[CShareCapturer::AddSink] already exist");
        return SHARE_RESULT_FAILED;
    }
    const bool added =
        CmCallGuarded("[CShareCapturer::AddSink]>>fail>>", [&] { m_vecSinks.push_back(sink); });
    return added ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

int CShareCapturer::RemoveSink(IShareCapturerSink* sink) {
    const Lock lock(m_mutexLists);
    const SinkPlace found = FindSink(sink);
    if (found == m_vecSinks.end())
        return SHARE_RESULT_FAILED;
    m_vecSinks.erase(found);
    return SHARE_RESULT_OK;
}

int CShareCapturer::CleanSink() {
    const Lock lock(m_mutexLists);
    m_vecSinks.clear();
    return SHARE_RESULT_OK;
}

/// Calls `call(sink)` for each sink in the order of adding. The end of the list is looked up after each call:
/// a sink may take itself off inside it, and the one behind it is then passed over.
template <class Call>
void CShareCapturer::TellSinks(Call call) {
    const Lock lock(m_mutexLists);
    for (std::size_t i = 0; i < m_vecSinks.size(); ++i) {
        if (IShareCapturerSink* const sink = m_vecSinks[i])
            CmCallGuarded("[CShareCapturer::TellSinks]>>sink threw ", [&] { call(*sink); });
    }
}

void CShareCapturer::NotifyCaptureDisplaySizedChanged(TVLSize size) {
    TellSinks([size](IShareCapturerSink& sink) { sink.OnCapturedDisplaySizedChanged(size); });
}

void CShareCapturer::NotifyCaptureNoSharedApp() {
    TellSinks([](IShareCapturerSink& sink) { sink.OnCapturedNoSharedApp(); });
}

void CShareCapturer::NotifyCaptureSharedAppDisplayChange(unsigned display, int left, int top, int width,
                                                         int height) {
    TellSinks([=](IShareCapturerSink& sink) {
        sink.OnCapturedAppDisplayChanged(display, left, top, width, height);
    });
}

void CShareCapturer::NotifyCaptureAppsCrossMultiMonitor(bool cross) {
    const auto now = static_cast<unsigned>(TvlCommonUtil::TickNowMS());
    if (cross != m_bCrossMonitorPending) {
        m_bCrossMonitorPending = cross;
        m_tickCrossMonitorChanged = now;
        return;
    }
    if (m_tickCrossMonitorChanged == 0 || now - m_tickCrossMonitorChanged < CROSS_MONITOR_SETTLED_MS)
        return;
    m_tickCrossMonitorChanged = 0;
    const bool before = std::exchange(m_bCrossMonitorReported, m_bCrossMonitorPending);
    if (before == m_bCrossMonitorReported)
        return;
    TellSinks([cross](IShareCapturerSink& sink) { sink.OnCapturedAppsCrossMultiMonitors(cross); });
}

void CShareCapturer::NotifyCaptureDisplayChanged(bool present) {
    TellSinks([present](IShareCapturerSink& sink) { sink.OnCapturedDisplayChanged(present); });
}

void CShareCapturer::NotifyCaptureShareSourceModified(IShareSource* source,
                                                      SHARE_CAPTURER_SOURCE_NOTIFY notify) {
    CmTraceInfo("[CShareCapturer::NotifyCaptureShareSourceModified]>>pIShareSource=",
                static_cast<const void*>(source), " notify type=", static_cast<int>(notify));
    switch (notify) {
        case SHARE_CAPTURER_SOURCE_NOTIFY_ADDED:
            TellSinks([source](IShareCapturerSink& sink) { sink.OnShareSourceAdded(source); });
            break;
        case SHARE_CAPTURER_SOURCE_NOTIFY_REMOVED:
            TellSinks([source](IShareCapturerSink& sink) { sink.OnShareSourceRemoved(source); });
            break;
    }
}

// ---- Sources

CShareCapturer::SourcePlace CShareCapturer::FindShareSource(IShareSource* source) {
    return source != nullptr ? std::find(m_vecShareSources.begin(), m_vecShareSources.end(), source)
                             : m_vecShareSources.end();
}

CShareCapturer::SourcePlace CShareCapturer::FindAppSource(unsigned pid) {
    return std::find_if(m_vecShareSources.begin(), m_vecShareSources.end(), [pid](IShareSource* source) {
        return source != nullptr && source->GetSourceType() == SHARE_SOURCE_TYPE_APP &&
               source->GetSourceUniqueId() == pid;
    });
}

int CShareCapturer::AddCaptureShareSource(IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_FAILED;
    const Lock lock(m_mutexLists);
    if (FindShareSource(source) != m_vecShareSources.end()) {
        CmTraceInfo("[CShareCapturer::AddCaptureShareSource] already exist");
        return SHARE_RESULT_FAILED;
    }
    const bool added = CmCallGuarded("[CShareCapturer::AddCaptureShareSource]>>fail>>",
                                     [&] { m_vecShareSources.push_back(source); });
    if (!added)
        return SHARE_RESULT_FAILED;
    source->AddRef();
    NotifyCaptureShareSourceModified(source, SHARE_CAPTURER_SOURCE_NOTIFY_ADDED);
    return SHARE_RESULT_OK;
}

int CShareCapturer::RemoveCaptureShareSource(IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_FAILED;
    if (m_shareCapturerContext != nullptr) {
        const auto pid = static_cast<unsigned>(source->GetSourceUniqueId());
        if (const int result = m_shareCapturerContext->RemoveSharedApp(pid); result != SHARE_RESULT_OK)
            CmTraceInfo("[CShareCapturer::RemoveCaptureShareSource] RemoveSharedApp result=", result);
    }
    const Lock lock(m_mutexLists);
    if (FindShareSource(source) == m_vecShareSources.end())
        return SHARE_RESULT_FAILED;
    NotifyCaptureShareSourceModified(source, SHARE_CAPTURER_SOURCE_NOTIFY_REMOVED);
    // Looked up anew, as a sink may have taken it off already.
    const SourcePlace found = FindShareSource(source);
    if (found == m_vecShareSources.end())
        return SHARE_RESULT_OK;
    // It keeps its place until it is released, but whoever looks there finds no dead source.
    std::exchange(*found, nullptr)->Release();
    m_vecShareSources.erase(std::find(m_vecShareSources.begin(), m_vecShareSources.end(), nullptr));
    return SHARE_RESULT_OK;
}

int CShareCapturer::RemoveCaptureShareSourceApp(unsigned pid) {
    const Lock lock(m_mutexLists);
    const SourcePlace first = FindAppSource(pid);
    if (first == m_vecShareSources.end())
        return SHARE_RESULT_FAILED;
    IShareSource* const source = *first;
    NotifyCaptureShareSourceModified(source, SHARE_CAPTURER_SOURCE_NOTIFY_REMOVED);
    const SourcePlace found = FindShareSource(source);
    if (found == m_vecShareSources.end())
        return SHARE_RESULT_OK;
    m_vecShareSources.erase(found);
    source->Release();
    return SHARE_RESULT_OK;
}

int CShareCapturer::GetCaptureShareSourceCount() {
    const Lock lock(m_mutexLists);
    return static_cast<int>(m_vecShareSources.size());
}

IShareSource* CShareCapturer::GetCaptureShareSource(int index) {
    const Lock lock(m_mutexLists);
    if (index < 0 || static_cast<std::size_t>(index) >= m_vecShareSources.size())
        return nullptr;
    return m_vecShareSources[static_cast<std::size_t>(index)];
}

// ---- Size and place

int CShareCapturer::GetCurrentCaptureSourceSize(TVLSize& size) {
    if (GetCaptureShareSource(0) == nullptr && m_shareCapturerContext != nullptr &&
        m_shareCapturerContext->GetSharedWindowCount() == 0 &&
        m_shareCapturerContext->GetSharedAppCount() == 0)
        return SHARE_RESULT_FAILED;
    const unsigned display = GetCurrentCaptureDisplayId();
    if (display == SHARE_INVALID_DISPLAY)
        return SHARE_RESULT_FAILED;
    const TVLRect rect = CMonitorEnumMac::screenImageRectForDisplayID(display);
    size = {ShareUtil::Extent(rect.left, rect.right), ShareUtil::Extent(rect.top, rect.bottom)};
    return SHARE_RESULT_OK;
}

int CShareCapturer::GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) {
    ShareRef<IShareSource> first;
    {
        const Lock lock(m_mutexLists);
        first = ShareRef<IShareSource>(GetCaptureShareSource(0));
    }
    if (first.Get() == nullptr)
        return SHARE_RESULT_FAILED;
    const TVLRect rect = first.Get()->GetSourceRect(false);
    x = rect.left;
    y = rect.top;
    width = ShareUtil::Extent(rect.left, rect.right);
    height = ShareUtil::Extent(rect.top, rect.bottom);
    return SHARE_RESULT_OK;
}

float CShareCapturer::GetScaleFactor() const {
    return AppShareConfig::Instance()->GetCurrentScale();
}

// ---- What the context answers for

template <class Call>
int CShareCapturer::AskContext(Call call) {
    if (m_shareCapturerContext == nullptr)
        return SHARE_RESULT_NO_CAPTURER;
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCapturer::AskContext]>>fail>>", [&] { result = call(*m_shareCapturerContext); });
    return result;
}

int CShareCapturer::SetFilterSelf(bool filter) {
    return AskContext([filter](ShareCapturerContext& context) { return context.SetFilterSelf(filter); });
}

int CShareCapturer::AddSharedWindow(unsigned window) {
    return AskContext([window](ShareCapturerContext& context) { return context.AddSharedWindow(window); });
}

int CShareCapturer::RemoveSharedWindow(unsigned window) {
    return AskContext([window](ShareCapturerContext& context) { return context.RemoveSharedWindow(window); });
}

int CShareCapturer::AddUnSharedWindow(unsigned window) {
    return AskContext([window](ShareCapturerContext& context) { return context.AddUnSharedWindow(window); });
}

int CShareCapturer::RemoveUnSharedWindow(unsigned window) {
    return AskContext(
        [window](ShareCapturerContext& context) { return context.RemoveUnSharedWindow(window); });
}

int CShareCapturer::AddUnSharedProcess(unsigned pid) {
    return AskContext([pid](ShareCapturerContext& context) { return context.AddUnSharedApp(pid); });
}

int CShareCapturer::RemoveUnSharedProcess(unsigned pid) {
    return AskContext([pid](ShareCapturerContext& context) { return context.RemoveUnSharedApp(pid); });
}

bool CShareCapturer::IsAppShared(unsigned pid) {
    return m_shareCapturerContext != nullptr && m_shareCapturerContext->IsAppShared(pid);
}

bool CShareCapturer::IsWindowShared(unsigned window) {
    return m_shareCapturerContext != nullptr && m_shareCapturerContext->IsWindowShared(window);
}
