// SPDX-License-Identifier: Apache-2.0
#include "src/share_capturer_context.h"

#include "util/cm_trace.h"

ShareCapturerContext::ShareCapturerContext() {
    m_sizeCaptureMax = TVLSize{2880, 1800};
}

int ShareCapturerContext::SetCaptureFps(int fps) {
    if (fps < 1)
        return SHARE_RESULT_INVALID_PARAM;
    if (fps != m_nCaptureFps)
        CmTraceInfo("ShareCapturerContext::SetCaptureFps fps=", fps);
    m_nCaptureFps = fps;
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::SetCaptureMaxSize(TVLSize size) {
    m_sizeCaptureMax = size;
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetCaptureMaxSize(TVLSize& size) const {
    size = m_sizeCaptureMax;
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::UpdateSharedDisplay(unsigned) {
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::SetShareType(SHARE_TYPE type) {
    if (type == m_eShareType)
        return SHARE_RESULT_OK;
    m_eShareType = type;
    CmTraceInfo("ShareCapturerContext::SetShareType eShareType=", static_cast<int>(type));
    return SHARE_RESULT_OK;
}

int ShareCapturerContext::GetCapturedWindows(std::vector<unsigned>& windows) const {
    windows.clear();
    return SHARE_RESULT_OK;
}

bool ShareCapturerContext::IsAppShared(unsigned) const {
    return false;
}

bool ShareCapturerContext::IsWindowShared(unsigned) const {
    return false;
}

int ShareCapturerContext::GetSharedWindowRegion(TVLRegion& region) const {
    region.CopyRgn(m_rgnSharedWindow);
    return SHARE_RESULT_OK;
}
