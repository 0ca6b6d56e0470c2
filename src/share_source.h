// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/qvn_unknown_impl.h"

#include <screenshare/share_source.h>

/// A source as a plain record: it looks nothing up.
class CShareSource : public IShareSource, public qvn::CQvnUnknownImpl {
public:
    CShareSource() = default;
    ~CShareSource() override = default;

    unsigned AddRef() override { return AddRefImpl(); }
    unsigned Release() override { return ReleaseImpl(); }
    int QueryInterface(const qvn::_tagUUID& iid, void** out) override { return QueryInterfaceImpl(iid, out); }
    unsigned GetReference() override { return GetReferenceImpl(); }

    unsigned long GetSourceUniqueId() override { return m_info.sourceId; }
    ShareSourceType GetSourceType() override;
    bool IsShared() override;
    TVLRect GetSourceRect(bool bScaled) override;
    void SetSourceRect(const TVLRect& rect) override { m_info.rect = rect; }
    /// -1: a record has no name to give, even where one was set.
    int GetDeviceName(char* out, int length) override;
    int GetDeviceId(char* out, int length) override;
    void* GetSourceHandle() override { return nullptr; }
    void SetInfo(const ShareSourceInfo* info) override;

protected:
    ShareSourceInfo m_info;
};
