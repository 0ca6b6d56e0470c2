// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_ref.h"
#include "src/share_source.h"
#include "src/share_source_enum.h"

#include <atomic>

/// Counts the sources that live.
class CCountedSource : public CShareSource {
public:
    explicit CCountedSource(std::atomic<int>& alive) : m_alive(alive) { ++m_alive; }
    ~CCountedSource() override { --m_alive; }

private:
    std::atomic<int>& m_alive;
};

/// An enumerator whose list is in the test's hands.
class COpenEnumerator : public CShareSourceEnumerator {
public:
    using CShareSourceEnumerator::AppendSource;
    using CShareSourceEnumerator::CleanShareSource;
    using CShareSourceEnumerator::FindSink;
    using CShareSourceEnumerator::m_vSinks;

    /// Appends a source with that id.
    IShareSource* Append(unsigned long id) {
        ShareSourceInfo info;
        info.sourceId = id;
        const ShareRef<IShareSource> source(new CCountedSource(alive));
        source.Get()->SetInfo(&info);
        AppendSource(source.Get());
        return source.Get();
    }

    void AppendNull() { AppendSource(nullptr); }

    inline static std::atomic<int> alive{0};
};
