// SPDX-License-Identifier: Apache-2.0
#include "src/share_source_dummy.h"

#include "src/share_ref.h"

namespace {

constexpr unsigned long DUMMY_SOURCE_COUNT = 5;

} // namespace

CShareSourceEnumeratorDummy::CShareSourceEnumeratorDummy(ShareSourceType type) : m_eSourceType(type) {
    init();
}

void CShareSourceEnumeratorDummy::init() {
    CleanShareSource();
    for (unsigned long id = 0; id < DUMMY_SOURCE_COUNT; ++id) {
        const ShareRef<IShareSource> source(new CShareSourceDummy);
        ShareSourceInfo info;
        info.sourceId = id;
        info.eType = m_eSourceType;
        source.Get()->SetInfo(&info);
        AppendSource(source.Get());
    }
}
