// SPDX-License-Identifier: Apache-2.0
#include "src/share_source_enum.h"

#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <utility>

namespace {

using Lock = std::lock_guard<std::recursive_mutex>;

/// The place of a source in a list; the end when it is not there.
auto FindSource(std::vector<IShareSource*>& sources, unsigned long id) {
    return std::find_if(sources.begin(), sources.end(), [id](IShareSource* source) {
        return source != nullptr && source->GetSourceUniqueId() == id;
    });
}

void HandOut(IShareSource* source, IShareSource** out) {
    *out = source;
    if (source != nullptr)
        source->AddRef();
}

} // namespace

CShareSourceEnumerator::~CShareSourceEnumerator() {
    CShareSourceEnumerator::Cleanup();
}

// ---- Sinks

CShareSourceEnumerator::SinkPlace CShareSourceEnumerator::FindSink(IShareSourceEnumSink* sink) {
    CmTraceDebug("[CShareSourceEnumerator::FindSink]>>lpSink=", static_cast<const void*>(sink));
    const SinkPlace found = std::find(m_vSinks.begin(), m_vSinks.end(), sink);
    if (found != m_vSinks.end())
        CmTraceDebug("[CShareSourceEnumerator::FindSink] get it");
    return found;
}

int CShareSourceEnumerator::AddSink(IShareSourceEnumSink* sink) {
    CmTraceInfo("[CShareSourceEnumerator::AddSink]>>pIShareSourceEnumSink=", static_cast<const void*>(sink),
                ",this=", static_cast<const void*>(this));
    if (sink == nullptr)
        return SHARE_RESULT_FAILED;
    const Lock lock(m_sinkLock);
    if (FindSink(sink) != m_vSinks.end()) {
        CmTraceWarning("[CShareSourceEnumerator::AddSink] fail already exist");
        return SHARE_RESULT_FAILED;
    }
    const bool added =
        CmCallGuarded("[CShareSourceEnumerator::AddSink] fail ", [&] { m_vSinks.push_back(sink); });
    return added ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

int CShareSourceEnumerator::RemoveSink(IShareSourceEnumSink* sink) {
    CmTraceInfo("[CShareSourceEnumerator::RemoveSink]>>pIShareSourceEnumSink=",
                static_cast<const void*>(sink));
    if (sink == nullptr)
        return SHARE_RESULT_FAILED;
    const Lock lock(m_sinkLock);
    const SinkPlace found = FindSink(sink);
    if (found == m_vSinks.end())
        return SHARE_RESULT_FAILED;
    m_vSinks.erase(found);
    CmTraceInfo("[CShareSourceEnumerator::RemoveSink] success");
    return SHARE_RESULT_OK;
}

int CShareSourceEnumerator::CleanSink() {
    CmTraceDebug("[CShareSourceEnumerator::CleanSink]");
    const Lock lock(m_sinkLock);
    m_vSinks.clear();
    return SHARE_RESULT_OK;
}

bool CShareSourceEnumerator::HasSourceObserver() const {
    const Lock lock(m_sinkLock);
    return !m_vSinks.empty();
}

int CShareSourceEnumerator::OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) {
    if (source == nullptr)
        return SHARE_RESULT_FAILED;
    CmTraceInfo("[CShareSourceEnumerator::OnShareSourceEvent] event=", static_cast<int>(event),
                source->GetSourceUniqueId());
    const Lock lock(m_sinkLock);
    // A sink may add and remove sinks inside its call, so the list is looked at anew for each one.
    for (std::size_t i = 0; i < m_vSinks.size(); ++i) {
        CmCallGuarded("[CShareSourceEnumerator::OnShareSourceEvent] sink threw ",
                      [&] { m_vSinks[i]->OnShareSourceEvent(event, source); });
    }
    return SHARE_RESULT_OK;
}

// ---- Sources

void CShareSourceEnumerator::AppendSource(IShareSource* source) {
    const Lock lock(m_sourceLock);
    m_vShareSources.push_back(source);
    if (source != nullptr)
        source->AddRef();
    m_sourceCount = m_vShareSources.size();
}

void CShareSourceEnumerator::CleanShareSource() {
    CmTraceDebug("[CShareSourceEnumerator::CleanShareSource]");
    const Lock lock(m_sourceLock);
    std::vector<IShareSource*> sources;
    sources.swap(m_vShareSources);
    m_sourceCount = 0;
    for (IShareSource* const source : sources) {
        if (source != nullptr)
            source->Release();
    }
}

int CShareSourceEnumerator::GetNumber(int& number) {
    number = static_cast<int>(m_sourceCount.load());
    CmTraceDebug("[CShareSourceEnumerator::GetNumber]>>number=", number);
    return SHARE_RESULT_OK;
}

int CShareSourceEnumerator::GetSource(int index, IShareSource** out) {
    CmTraceDebug("[CShareSourceEnumerator::GetSource]>>index=", index);
    const Lock lock(m_sourceLock);
    if (out == nullptr || static_cast<unsigned>(index) >= m_vShareSources.size())
        return SHARE_RESULT_FAILED;
    HandOut(m_vShareSources[static_cast<unsigned>(index)], out);
    return SHARE_RESULT_OK;
}

int CShareSourceEnumerator::GetSourceBySourceId(unsigned long id, IShareSource** out) {
    if (out == nullptr)
        return SHARE_RESULT_FAILED;
    const Lock lock(m_sourceLock);
    const auto found = FindSource(m_vShareSources, id);
    // Clients rely on it that what they passed in counts as found.
    IShareSource* const source = found != m_vShareSources.end() ? *found : *out;
    if (source == nullptr)
        return SHARE_RESULT_FAILED;
    HandOut(source, out);
    return SHARE_RESULT_OK;
}

bool CShareSourceEnumerator::RemoveSourceById(unsigned long id, IShareSource** out) {
    const Lock lock(m_sourceLock);
    const auto found = FindSource(m_vShareSources, id);
    if (found == m_vShareSources.end())
        return false;
    IShareSource* const source = *found;
    if (out != nullptr)
        HandOut(source, out);
    m_vShareSources.erase(found);
    m_sourceCount = m_vShareSources.size();
    source->Release();
    return true;
}

void CShareSourceEnumerator::SetFilter(IShareSourceFilter* filter) {
    CmTraceInfo("[CShareSourceEnumerator::SetFilter]>>pFilter=", static_cast<const void*>(filter));
}

void CShareSourceEnumerator::Cleanup() {
    CmTraceDebug("[CShareSourceEnumerator::Cleanup]");
    CleanShareSource();
    CleanSink(); // NOLINT(clang-analyzer-optin.cplusplus.VirtualCall): in the destructor the base's own is meant
}
