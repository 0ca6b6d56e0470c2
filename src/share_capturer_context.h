// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"
#include "src/share_region.h"

#include <screenshare/share_types.h>

#include <vector>

/// What one share has been told and what it has found out. Shared by the engine and its capturer.
/// Threads: any.
class ShareCapturerContext {
public:
    ShareCapturerContext();
    virtual ~ShareCapturerContext() = default;
    ShareCapturerContext(const ShareCapturerContext&) = delete;
    ShareCapturerContext& operator=(const ShareCapturerContext&) = delete;

    /// -2 below 1; the rate then stays.
    int SetCaptureFps(int fps);
    int GetCaptureFps() const { return m_nCaptureFps; }

    int SetCaptureMaxSize(TVLSize size);
    int GetCaptureMaxSize(TVLSize& size) const;
    int UpdateSharedDisplay(unsigned display);

    int SetShareType(SHARE_TYPE type);
    SHARE_TYPE GetShareType() const { return m_eShareType; }

    /// The windows in the picture, top of the stack first.
    int GetCapturedWindows(std::vector<unsigned>& windows) const;
    /// What the shared windows cover, hidden parts included.
    int GetSharedWindowRegion(TVLRegion& region) const;
    int GetSharedWindowCount() const { return 0; }
    int GetSharedAppCount() const { return 0; }
    bool IsAppShared(unsigned pid) const;
    bool IsWindowShared(unsigned window) const;

    ShareRelaxed<bool> m_bNoWindowBaseArea{true};
    ShareRelaxed<bool> m_bExcludeMenuBar{false};

protected:
    TVLRegion m_rgnSharedWindow;

private:
    ShareRelaxedSize m_sizeCaptureMax;
    ShareRelaxed<int> m_nCaptureFps{5};
    ShareRelaxed<SHARE_TYPE> m_eShareType{SHARE_TYPE_DESKTOP};
};
