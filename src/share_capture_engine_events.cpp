// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_pass.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <utility>

/// What comes of a capture's result, and the way of every notification from capturer and pointing object to
/// the client's sink: posted by whoever finds something out, told on the assist thread.

namespace {

void TraceWindowList(const std::vector<unsigned>& windows) {
    if (!CmTraceOn(CM_TRACE_INFO))
        return;
    CCmTraceLine line(CM_TRACE_INFO, CM_TRACE_TAG);
    line << "[CShareCaptureEngine::OnCapturedWindowChanged ";
    for (const unsigned window : windows)
        line << window << ",";
    line.Write(CM_TRACE_TAG);
}

} // namespace

// Results of captures.

void CShareCaptureEngine::ProcessCaptureResult(int result) {
    switch (result) {
        case SHARE_CAPTURE_DISPLAY_GONE:
            m_tickFailureStart = 0;
            m_tickDragStart = 0;
            return;
        case SHARE_CAPTURE_DRAGGING:
            if (m_tickDragStart == 0)
                m_tickDragStart = ShareTickNow();
            return;
        case SHARE_CAPTURE_OK:
        case SHARE_CAPTURE_NO_DATA:
            m_tickFailureStart = 0;
            m_nFailureCount = 0;
            m_tickDragStart = 0;
            m_bDisplayGone = false;
            return;
        default:
            ProcessCaptureFailure(result);
    }
}

void CShareCaptureEngine::ProcessCaptureFailure(int result) {
    if (m_bDisplayGone) {
        m_tickFailureStart = 0;
        m_tickDragStart = 0;
        return;
    }
    if (!m_bFallbackEnabled)
        return;
    if (m_tickDragStart != 0 && !_DiscountDrag(ShareTickNow()))
        return;
    if (m_eCaptureMode == SCREEN_CAPTURER_TYPE_DEFAULT)
        return;

    const unsigned now = ShareTickNow();
    const unsigned start = m_tickFailureStart;
    const unsigned elapsed = start == 0 ? 0 : now - start;
    if (result == SHARE_CAPTURE_FATAL || elapsed > m_nFailureWindowMs) {
        _FallBackToDefaultMode();
        return;
    }
    if (start == 0) {
        m_tickFailureStart = now;
        m_nFailureCount = 1;
        m_tickDragStart = 0;
    } else {
        m_nFailureCount = ShareUtil::Sum(m_nFailureCount, 1);
    }
}

/// Ends a drag: its time doesn't count against the mode. False when the drag had begun before the failures
/// did, which then start afresh.
bool CShareCaptureEngine::_DiscountDrag(unsigned now) {
    const unsigned dragged = now - m_tickDragStart;
    m_tickDragStart = 0;
    const unsigned start = m_tickFailureStart;
    if (start == 0)
        return true;
    const unsigned span = now - start;
    if (span != 0 && dragged > span) {
        m_tickFailureStart = 0;
        return false;
    }
    m_tickFailureStart = start + dragged;
    return true;
}

void CShareCaptureEngine::_FallBackToDefaultMode() {
    constexpr unsigned FELL_BACK = 2;
    m_tickFailureStart = 0;
    m_nFailureCount = 0;
    CmTraceInfo("[CShareCaptureEngine::ProcessCapturingFailure]>> old=", static_cast<int>(m_eCaptureMode),
                ",new=", static_cast<int>(SCREEN_CAPTURER_TYPE_DEFAULT));
    m_eCaptureMode = SCREEN_CAPTURER_TYPE_DEFAULT;
    AppShareConfig::Instance()->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    _ReCreateShareCapturer();
    m_statistic.nFlags = m_statistic.nFlags | FELL_BACK;
}

// Posting.

bool CShareCaptureEngine::_CanPost() const {
    return m_sinkPort->HasSink() && _GetAssistThread() != nullptr;
}

ICmEventQueue* CShareCaptureEngine::_GetEventQueue(const std::shared_ptr<ACmThread>& thread) const {
    ICmEventQueue* queue = thread->GetEventQueue();
    if (queue == nullptr)
        CmReportFailedCheck("pEventQueue != NULL");
    return queue;
}

/// Posts `fire(port)` to the assist thread. It holds the port and not the engine, so it may outlive the
/// engine; the sink is looked at again when it fires. Without a sink or an assist thread the notification is
/// dropped; -1 when it is lost because there is no memory for it.
template <class Fire>
int CShareCaptureEngine::_PostToSink(Fire fire) {
    if (!m_sinkPort->HasSink())
        return SHARE_RESULT_OK;
    const std::shared_ptr<ACmThread> thread = _GetAssistThread();
    if (thread == nullptr)
        return SHARE_RESULT_OK;
    ICmEventQueue* queue = _GetEventQueue(thread);
    if (queue == nullptr)
        return SHARE_RESULT_OK;
    auto body = [port = m_sinkPort, fire = std::move(fire)]() mutable {
        const ShareCallOutMark mark; // a trace receiver may call out, too
        fire(*port);
    };
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCaptureEngine::_PostToSink]>>fail>>", [&] {
        result = queue->PostEvent(new CCmInvokeEvent(std::move(body)), CM_EVENT_PRIORITY_NORMAL);
    });
    return result;
}

int CShareCaptureEngine::OnCaptureStatusChanged(int status) {
    if (!_CanPost())
        return SHARE_RESULT_OK;
    CmTraceInfo("[CShareCaptureEngine::OnCaptureStatusChanged]>> status=", status);
    _PostToSink([status](ShareSinkPort& port) {
        port.CallSink([&](IShareCaptureEngineSink& sink) { sink.OnCaptureStatusChanged(status); });
    });
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedWindowChanged(std::vector<unsigned>& windows) {
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCaptureEngine::OnCapturedWindowChanged]>>fail>>", [&] {
        result = _PostToSink([windows](ShareSinkPort& port) {
            TraceWindowList(windows);
            port.CallSink([&](IShareCaptureEngineSink& sink) {
                sink.OnCapturedWindowListChanged(windows.empty() ? nullptr : windows.data(),
                                                 static_cast<int>(windows.size()));
            });
        });
    });
    return result;
}

int CShareCaptureEngine::OnCapturePositionChanged(int x, int y, int width, int height) {
    const TVLRect rect{x, y, ShareUtil::Sum(x, width), ShareUtil::Sum(y, height)};
    _PostToSink([rect](ShareSinkPort& port) {
        if (CmTraceOn(CM_TRACE_INFO))
            CmTraceInfo("[CShareCaptureEngine::OnCapturePositionChanged]>>",
                        ",rect=", ShareUtil::TVLRectToString(rect).c_str());
        port.CallSink([&](IShareCaptureEngineSink& sink) {
            sink.OnCapturePositionChanged(rect.left, rect.top, ShareUtil::Extent(rect.left, rect.right),
                                          ShareUtil::Extent(rect.top, rect.bottom));
        });
    });
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCaptureEvent(int type, int value, void* data) {
    if (!_CanPost())
        return SHARE_RESULT_OK;
    // That one comes with every pass without content and would flood the trace.
    if (type != SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE)
        CmTraceInfo("[CShareCaptureEngine::OnCaptureEvent, eventType=", type);
    _PostToSink([type, value, data](ShareSinkPort& port) {
        port.CallSink([&](IShareCaptureEngineSink& sink) { sink.OnCaptureEvent(type, value, data); });
    });
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCaptureError(int code) {
    if (code == SHARE_CAPTURE_DISPLAY_GONE)
        m_bDisplayGone = true;
    _PostToSink([code](ShareSinkPort& port) {
        CmTraceInfo("[CShareCaptureEngine::OnCaptureError, nErrorCode=", code);
        port.CallSink([&](IShareCaptureEngineSink& sink) { sink.OnCaptureError(code); });
    });
    return SHARE_RESULT_OK;
}

void CShareCaptureEngine::_NotifyDisplaySize(TVLSize size) {
    _PostToSink([size](ShareSinkPort& port) {
        CmTraceInfo("[CShareCaptureEngine::_UpdateShareDisplaySize]>>x=", size.cx, ",y=", size.cy);
        port.CallSink([&](IShareCaptureEngineSink& sink) { sink.OnCaptureDisplaySizeChanged(size); });
    });
}

// What the capturer tells.

int CShareCaptureEngine::OnShareSourceAdded(IShareSource*) {
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnShareSourceRemoved(IShareSource*) {
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedDisplaySizedChanged(TVLSize size) {
    _UpdateShareDisplaySize(size);
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedDisplayChanged(bool present) {
    if (!present)
        OnCaptureError(SHARE_CAPTURE_DISPLAY_GONE);
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedNoSharedApp() {
    OnCaptureError(SHARE_CAPTURE_NO_SHARED_APP);
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedAppDisplayChanged(unsigned display, int left, int top, int width,
                                                     int height) {
    if (m_pISharePointing != nullptr) {
        CmTraceInfo("[CShareCaptureEngine::OnCapturedAppDisplayChanged sourceId=", display);
        m_pISharePointing->SetBaseDisplayID(display);
    }
    OnCapturePositionChanged(left, top, width, height);
    if (const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer()) {
        TVLSize size{};
        capturer->GetCurrentCaptureSourceSize(size);
        _UpdateShareDisplaySize(size);
    }
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::OnCapturedAppsCrossMultiMonitors(bool cross) {
    return OnCaptureEvent(SHARE_CAPTURE_EVENT_APPS_CROSS_MONITORS, cross ? 1 : 0, nullptr);
}

int CShareCaptureEngine::OnCaptureStatistics(SHARE_CAPTURE_STATISTIC& statistic) {
    m_statistic.Store(statistic, m_eCaptureMode);
    return SHARE_RESULT_OK;
}
