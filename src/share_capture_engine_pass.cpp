// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"

#include "src/app_share_config.h"
#include "src/share_common_util.h"
#include "src/share_dump_time_usage.h"
#include "src/share_frame.h"
#include "src/share_image_save.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <exception>

namespace {

/// How long the sink may go without a picture while the capturer has nothing new, ms.
constexpr unsigned RESEND_AFTER_MS = 1000;
/// How long equal frames are held back, ms.
constexpr unsigned HOLD_DUPLICATES_MS = 1001;
/// Every so many frames the means start again from one sample.
constexpr int FRAMES_PER_MEAN = 50;
/// So many passes in a row may be without content before it is worth a warning.
constexpr int UNAVAILABLE_PASSES_TOLERATED = 4;

/// An engine makes both of its frames itself, so they are of one kind.
bool IsSameData(IShareFrame& a, IShareFrame& b) {
    CShareFrame* const ownA = CShareFrame::OwnOf(&a);
    CShareFrame* const ownB = CShareFrame::OwnOf(&b);
    return ownA != nullptr && ownB != nullptr && ownA->HasSameData(*ownB);
}

/// While a capturer has the frame. Its note is believed only if the capturer is one of ours and has put it
/// there itself: others may write what they like, and our own ones may be inside theirs.
class FillingGuard {
public:
    /// `partner`: a frame that may be left with what is in this one, or null.
    FillingGuard(IShareFrame& frame, bool isOwnCapturer, IShareFrame* partner)
        : m_frame(CShareFrame::OwnOf(&frame)),
          m_isOwnCapturer(isOwnCapturer) {
        if (m_frame != nullptr)
            m_frame->BeginFilling(CShareFrame::OwnOf(partner));
    }
    ~FillingGuard() {
        if (m_frame == nullptr)
            return;
        m_frame->EndFilling();
        if (!m_isOwnCapturer)
            CShareFrame::DropNoteOf(*m_frame);
    }
    FillingGuard(const FillingGuard&) = delete;
    FillingGuard& operator=(const FillingGuard&) = delete;

private:
    CShareFrame* const m_frame;
    const bool m_isOwnCapturer;
};

} // namespace

unsigned ShareTickNow() {
    return static_cast<unsigned>(TvlCommonUtil::TickNowMS());
}

void CShareCaptureEngine::_CaptureProcess(unsigned mask) {
    if (!_MayCapture())
        return;
    if (IsIpcCapturer()) {
        _IpcCaptureProcess();
        return;
    }
    Pass pass;
    pass.frame = _GetCurShareFrame();
    if (pass.frame == nullptr) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_CaptureProcess]>>pIShareFrame=",
                             static_cast<const void*>(pass.frame));
        return;
    }
    _PrepareDump(pass);
    pass.mask = mask;
    pass.startTick = ShareTickNow();
    pass.wantCursor = (mask & SHARE_CAPTURE_MASK_POINTER) != 0;
    pass.scale = AppShareConfig::Instance()->GetCurrentScale();
    pass.withdrawals = m_spShareCapturerContext->Withdrawals();

    if (!_CaptureStep(pass))
        return;
    _ReadScale(pass);
    if (pass.IsTemporaryResult())
        _ReusePreviousFrame(pass);
    _ComposePointer(pass);
    CaculateCaptureFps(pass.gotContent);

    if (!pass.gotContent) {
        _ReportNoContent(pass);
    } else if (!pass.reused && !m_bForceFrame && _CheckFrameDuplicate(pass.frame)) {
        m_nWithdrawalsOfPrevious = pass.withdrawals; // it shows what this one does
        return;
    } else {
        _DeliverPass(pass);
    }
    _ReportPass(pass);
}

bool CShareCaptureEngine::_MayCapture() {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    if (worker != nullptr && !worker->IsCurrentThread()) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(
            m_bFirstError, site,
            "[CShareCaptureEngine::_CaptureProcess] _CaptureProcess just is called by Capturer thread");
        return false;
    }
    if (m_eSHARE_CAPTURE_ENGINE_STATUS != SHARE_CAPTURE_ENGINE_STATUS_STARTED) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(
            m_bFirstError, site,
            "[CShareCaptureEngine::_CaptureProcess]m_eSHARE_CAPTURE_ENGINE_STATUS!=SHARE_CAPTURE_ENGINE_STATUS_STARTED");
        return false;
    }
    bool hasSink = false;
    {
        const CCmMutexGuard guard(m_sinkPort->Mutex());
        hasSink = m_sinkPort->HasSink();
    }
    if (!hasSink) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site,
                             "[CShareCaptureEngine::_CaptureProcess]m_pIShareCaptureEngineSink==TVLNull");
    }
    return hasSink;
}

void CShareCaptureEngine::_PrepareDump(Pass& pass) {
    AppShareConfig& config = *AppShareConfig::Instance();
    if (m_statistic.nTotalFrames % config.GetDumpDataEveryFrames() != 0)
        return;
    pass.dumpContent = config.IsCaptureDumpDataEnabled();
    pass.dumpPoint = config.IsCaptureDumpPointDataEnabled();
    if (!pass.dumpContent && !pass.dumpPoint)
        return;
    pass.dumpName = config.GetCaptureDumpPathNamePrefix();
    // The folder may lie where everybody can write, and a picture of a screen is nobody else's.
    if (!config.IsDumpFolderTrusted()) {
        pass.dumpContent = false;
        pass.dumpPoint = false;
    }
}

/// False when there is no capturer and the pass is over.
bool CShareCaptureEngine::_CaptureStep(Pass& pass) {
    const CCmMutexGuard guard(_CapturerMutex());
    std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    if (capturer == nullptr) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_CaptureProcess]>>pIShareFrame=",
                             static_cast<const void*>(pass.frame),
                             ">>pIShareCapturer=", static_cast<const void*>(capturer.get()));
        return false;
    }
    if ((pass.mask & SHARE_CAPTURE_MASK_CONTENT) == 0)
        return true;
    if (capturer->SetCaptureMaxSize(_GetCurCaptureMaxSize()) != SHARE_RESULT_OK)
        return true;

    pass.result = _CaptureFrame(*capturer, pass.frame);
    if (pass.result == SHARE_CAPTURE_OK) {
        _AfterGoodCapture(pass, *capturer);
    } else {
        pass.wantCursor = false;
    }
    // Let go of first: a fallback ends the old capturer before it makes the new one.
    capturer.reset();
    ProcessCaptureResult(pass.result);
    return true;
}

int CShareCaptureEngine::_CaptureFrame(IShareCapturer& capturer, IShareFrame* frame) {
    const bool isOwnCapturer = m_eSHARE_CAPTURE_ENGINE_TYPE != SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION;
    // Who holds back duplicates compares the frame with the one before, which then has to stay as it is.
    const FillingGuard filling(*frame, isOwnCapturer, m_bCheckDupFrame ? nullptr : _GetPreShareFrame());
    ShareDumpTimeUsage usage;
    int result = SHARE_CAPTURE_FAILED;
    try {
        result = capturer.Capture(frame);
    } catch (const std::exception& error) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_CaptureProcess]>>Capture threw ",
                             error.what());
    } catch (...) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site, "[CShareCaptureEngine::_CaptureProcess]>>Capture threw");
    }
    if ((AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_PERFORMANCE_TRACE) != 0)
        CmTraceInfo("[Performance] _CaptureProcess Capture(pShareFrame) time =", usage.Stop());
    return result;
}

void CShareCaptureEngine::_AfterGoodCapture(Pass& pass, IShareCapturer& capturer) {
    pass.gotContent = true;
    m_nUnavailableTimes = 0;
    if (pass.wantCursor && capturer.PointerCaptured())
        pass.wantCursor = false;
    if (m_eSHARE_CAPTURE_ENGINE_TYPE != SHARE_CAPTURE_ENGINE_TYPE_DESKTOP)
        _ReportWindowList();
}

void CShareCaptureEngine::_ReportWindowList() {
    m_vecWindowsOfThisPass.clear();
    m_spShareCapturerContext->GetCapturedWindows(m_vecWindowsOfThisPass);
    if (m_vecWindowsOfThisPass == m_vecCapturedWindows)
        return;
    // A list that could not be told is told with the next pass.
    if (OnCapturedWindowChanged(m_vecWindowsOfThisPass) == SHARE_RESULT_OK)
        m_vecCapturedWindows.swap(m_vecWindowsOfThisPass);
}

void CShareCaptureEngine::_ReadScale(Pass& pass) {
    const TVLRect captured = pass.frame->GetMetaInfo().rectCapture;
    const int capturedWidth = ShareUtil::Extent(captured.left, captured.right);
    if (capturedWidth != 0) {
        int width = 0;
        int height = 0;
        pass.frame->GetFrameSize(width, height);
        pass.scale = static_cast<float>(width) / static_cast<float>(capturedWidth);
        return;
    }
    const CCmMutexGuard guard(_CapturerMutex());
    // Asked for anew: the capture step may have replaced the capturer.
    if (const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer())
        pass.scale = capturer->GetScaleFactor();
}

/// Something is being dragged, or a session has nothing new: the sink still gets a picture about once a
/// second. Not one that may show what has been kept out since.
void CShareCaptureEngine::_ReusePreviousFrame(Pass& pass) {
    IShareFrame* previous = _GetPreShareFrame();
    if (previous == nullptr || m_spShareCapturerContext->Withdrawals() != m_nWithdrawalsOfPrevious)
        return;
    // Made larger when there was no memory, it has lost its pixels and tells a length all the same.
    if (previous->GetFrameData() == nullptr && previous->GetFrameDataLen() > 0)
        return;
    const unsigned last = m_tickLastCapture;
    const bool due = last != 0 && ShareTickNow() - last > RESEND_AFTER_MS;
    if (!m_bForceFrame && !due)
        return;
    pass.wantCursor = false;
    pass.gotContent = true;
    pass.reused = true;
    previous->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    pass.frame = previous;
}

void CShareCaptureEngine::_ReportNoContent(const Pass& pass) {
    if (!pass.IsTemporaryResult()) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site,
                             "[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Content, ret=",
                             static_cast<unsigned>(pass.result));
        return;
    }
    m_nUnavailableTimes = ShareUtil::Sum(m_nUnavailableTimes, 1);
    if (m_nUnavailableTimes > UNAVAILABLE_PASSES_TOLERATED) {
        static CCmRepeatedTraceSite site(10);
        CmTraceRepeated(site, CM_TRACE_WARNING,
                        "[CShareCaptureEngine::_CaptureProcess]>> Capture Content is temporary unavailable, ",
                        ",times=", m_nUnavailableTimes);
    }
    OnCaptureEvent(SHARE_CAPTURE_EVENT_CONTENT_UNAVAILABLE, pass.result, nullptr);
}

void CShareCaptureEngine::_DeliverPass(Pass& pass) {
    if (!pass.reused) {
        if (IShareFrame* other = _GetPreShareFrame())
            m_pCurShareFrame = other;
        m_nWithdrawalsOfPrevious = pass.withdrawals;
    }
    m_bForceFrame = false;
    if (pass.dumpContent)
        SaveFrameToPNG(pass.frame, (pass.dumpName + "_combined" + ".png").c_str());

    const unsigned captureTime = ShareTickNow() - pass.startTick;
    const unsigned meanBefore = m_statistic.m_nMsAverageCaptureCapabilityTime;
    m_statistic.m_nMsAverageCaptureCapabilityTime =
        meanBefore == 0 ? captureTime : (meanBefore + captureTime) / 2;
    m_statistic.nTotalFrames = ShareUtil::Sum(m_statistic.nTotalFrames, 1);

    const unsigned deliverTick = ShareTickNow();
    int width = 0;
    int height = 0;
    pass.frame->GetFrameSize(width, height);
    TVLRect rcUpdate{0, 0, width, height};
    _CalculateUpdateRect(pass, width, height, rcUpdate);
    _UpdateShareData(pass.frame, rcUpdate);

    if (width != m_statistic.nCaptureWidth || height != m_statistic.nCaptureHeight) {
        m_statistic.nCaptureWidth = width;
        m_statistic.nCaptureHeight = height;
        CmTraceInfo("[CShareCaptureEngine::_CaptureProcess]>>new capture size w=", width, ",h=", height,
                    ",[Checkpoint]");
    }
    _AverageTimes(deliverTick, width, height);
}

void CShareCaptureEngine::_ReportPass(const Pass& pass) {
    if (!pass.cursorOk) {
        static CCmRepeatedTraceSite site;
        CmTraceRepeatedError(m_bFirstError, site,
                             "[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Cursor,");
    }
    constexpr unsigned MAG_SEEN = 1;
    const AppShareConfig& config = *AppShareConfig::Instance();
    const unsigned flags = m_statistic.nFlags;
    if ((flags & MAG_SEEN) == 0 && config.m_bRecreateCapturer &&
        config.GetScreenCapturerType() == SCREEN_CAPTURER_TYPE_MAG)
        m_statistic.nFlags = flags | MAG_SEEN;
}

IShareFrame* CShareCaptureEngine::_GetPreShareFrame() {
    return m_pShareFrameA != m_pCurShareFrame ? m_pShareFrameA : m_pShareFrameB;
}

/// Holds back a frame that is equal to the one before, except one about each second, which keeps the receiver
/// alive.
bool CShareCaptureEngine::_CheckFrameDuplicate(IShareFrame* frame) {
    if (frame == nullptr || !m_bCheckDupFrame || m_pShareFrameB == nullptr || frame != m_pCurShareFrame)
        return false;
    IShareFrame* other = nullptr;
    if (frame == m_pShareFrameA)
        other = m_pShareFrameB;
    if (frame == m_pShareFrameB)
        other = m_pShareFrameA;
    if (other == nullptr)
        return false;

    const unsigned now = ShareTickNow();
    if (!IsSameData(*frame, *other)) {
        m_tickDupStart = 0;
        return false;
    }
    m_statistic.nDuplicateFrames = ShareUtil::Sum(m_statistic.nDuplicateFrames, 1);
    if (m_tickDupStart == 0) {
        m_tickDupStart = now;
        return true;
    }
    if (now - m_tickDupStart < HOLD_DUPLICATES_MS)
        return true;
    m_tickDupStart = now;
    return false;
}

void CShareCaptureEngine::CaculateCaptureFps(bool counted) {
    const unsigned now = ShareTickNow();
    if (m_tickFpsStart == 0) {
        m_tickFpsStart = now;
        return;
    }
    const unsigned elapsed = now - m_tickFpsStart;
    if (elapsed > m_nFpsWindowMs) {
        m_statistic.nCaptureFps = static_cast<int>(m_nFpsFrames * 1000.0 / elapsed);
        m_tickFpsStart = now;
        m_nFpsFrames = 0;
        return;
    }
    if (counted)
        ++m_nFpsFrames;
}

void CShareCaptureEngine::_AverageTimes(unsigned deliverTick, int width, int height) {
    const int total = m_statistic.nTotalFrames;
    const bool keepMean = total % FRAMES_PER_MEAN != 0;

    int deliver = static_cast<int>(ShareTickNow() - deliverTick);
    if (const int before = m_statistic.m_nMsAverageDeliverCapabilityTime; keepMean && before != 0)
        deliver = ShareUtil::Sum(before, deliver) / 2;
    m_statistic.m_nMsAverageDeliverCapabilityTime = deliver;

    const unsigned now = ShareTickNow();
    if (const unsigned last = m_tickLastCapture; last != 0) {
        int gap = static_cast<int>(now - last);
        if (const int before = m_statistic.m_nMsAverageCaptureTime; keepMean && before != 0)
            gap = ShareUtil::Sum(before, gap) / 2;
        m_statistic.m_nMsAverageCaptureTime = gap;
    }
    m_tickLastCapture = now;

    if (total == 1) {
        CmTraceInfo("[CShareCaptureEngine::_CaptureProcess]>>Capture first Frame w=", width, ",h=", height,
                    ",[Checkpoint]");
    } else if (total % AppShareConfig::Instance()->GetFrameTraceFrequency() == 0) {
        CmTraceDebug(
            "[CShareCaptureEngine::_CaptureProcess]>>Captured", " TotalFrames=", total,
            "  m_nMsAverageDeliverCapabilityTime(ms)=", int{m_statistic.m_nMsAverageDeliverCapabilityTime},
            "  m_nMsAverageCaptureCapabilityTime(ms)=",
            unsigned{m_statistic.m_nMsAverageCaptureCapabilityTime},
            "  m_nMsAverageCaptureTime(ms)=", int{m_statistic.m_nMsAverageCaptureTime}, " [CheckPoint]");
    }
}

void CShareCaptureEngine::_UpdateShareData(IShareFrame* frame, TVLRect& rcUpdate) {
    const bool delivered = m_sinkPort->CallSink([&](IShareCaptureEngineSink& sink) {
        if (frame->GetTimestamp() == 0)
            frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
        sink.OnCaptureData(frame, rcUpdate);
    });
    if (delivered)
        return;
    static CCmRepeatedTraceSite site;
    CmTraceRepeatedError(m_bFirstError, site,
                         "[CShareCaptureEngine::_UpdateShareData]>>m_pIShareCaptureEngineSink=NULL");
}
