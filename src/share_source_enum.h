// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_source_enumerator.h>

#include <atomic>
#include <cstddef>
#include <mutex>
#include <vector>

/// The list of sources and its observers; subclasses fill it.
///
/// Threads: any. Sources and sinks each have a recursive lock. An event runs under the sinks' lock, which may
/// be
///          followed by the sources' and never the other way round.
class CShareSourceEnumerator : public IShareSourceEnumerator {
public:
    CShareSourceEnumerator() = default;
    ~CShareSourceEnumerator() override;
    CShareSourceEnumerator(const CShareSourceEnumerator&) = delete;
    CShareSourceEnumerator& operator=(const CShareSourceEnumerator&) = delete;

    int AddSink(IShareSourceEnumSink* sink) override;
    int RemoveSink(IShareSourceEnumSink* sink) override;
    int CleanSink() override;
    void Refresh() override {}
    int GetNumber(int& number) override;
    int GetSource(int index, IShareSource** out) override;
    int GetSourceBySourceId(unsigned long id, IShareSource** out) override;
    void SetFilter(IShareSourceFilter* filter) override;
    int GetShareSourceEnumeratorType() override { return m_nEnumeratorType; }
    bool RemoveSourceById(unsigned long id, IShareSource** out) override;
    int OnShareSourceEvent(SHARE_SOURCE_EVENT event, IShareSource* source) override;
    void Cleanup() override;

    bool HasSourceObserver() const;

protected:
    using SinkPlace = std::vector<IShareSourceEnumSink*>::iterator;

    /// Releases every source and empties the list; sends no event.
    void CleanShareSource();
    /// Puts a source at the end of the list, with a reference of the list's own.
    void AppendSource(IShareSource* source);
    /// The end when it is not there. The caller holds m_sinkLock.
    SinkPlace FindSink(IShareSourceEnumSink* sink);

    std::vector<IShareSource*> m_vShareSources;
    std::vector<IShareSourceEnumSink*> m_vSinks;
    int m_nEnumeratorType = 0;
    mutable std::recursive_mutex m_sourceLock;
    mutable std::recursive_mutex m_sinkLock;

private:
    /// Size of the list, for those who ask without its lock.
    std::atomic<std::size_t> m_sourceCount{0};
};
