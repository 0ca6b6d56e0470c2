// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

/// The pass of an engine whose capturer lives in another process: no pointer, no duplicate check, no
/// statistic, and the previous frame goes out again only when a frame is forced.

bool CShareCaptureEngine::IsIpcCapturer() {
    return false;
}

void CShareCaptureEngine::_IpcCaptureProcess() {
    IShareFrame* frame = _GetCurShareFrame();
    if (frame == nullptr) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=",
                             static_cast<const void*>(frame));
        return;
    }
    std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    if (capturer == nullptr) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=",
                             static_cast<const void*>(frame),
                             ">>pIShareCapturer=", static_cast<const void*>(capturer.get()));
        return;
    }
    if (capturer->SetCaptureMaxSize(_GetCurCaptureMaxSize()) != SHARE_RESULT_OK)
        return;

    const int result = _CaptureFrame(*capturer, frame);
    if (result == SHARE_CAPTURE_OK)
        m_nUnavailableTimes = 0;
    capturer.reset();
    ProcessCaptureResult(result);
    if (result != SHARE_CAPTURE_OK) {
        frame = _GetPreShareFrame();
        const bool temporary = result == SHARE_CAPTURE_NOT_READY || result == SHARE_CAPTURE_DRAGGING ||
                               result == SHARE_CAPTURE_NO_DATA;
        if (!temporary || frame == nullptr || !m_bForceFrame)
            return;
        frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    }

    int width = 0;
    int height = 0;
    frame->GetFrameSize(width, height);
    TVLRect rcUpdate{0, 0, width, height};
    if (result != SHARE_CAPTURE_OK) {
        rcUpdate = m_rcLastUpdate;
    } else {
        if (IShareFrame* other = _GetPreShareFrame())
            m_pCurShareFrame = other;
        m_rcLastUpdate = rcUpdate;
    }
    m_bForceFrame = false;
    _UpdateShareData(frame, rcUpdate);
}
