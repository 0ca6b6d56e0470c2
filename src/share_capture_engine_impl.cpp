// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_impl.h"

#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_engine_factories.h"
#include "src/share_frame.h"
#include "util/cm_trace.h"

#include <screenshare/share_engine.h>

#include <utility>

namespace {

IShareFrame* NewFrame() {
    auto* frame = new CShareFrame;
    frame->AddRef();
    frame->AllowNote(); // sinks only read
    return frame;
}

template <class Object>
void ReleaseAndClear(Object*& object) {
    if (object != nullptr)
        object->Release();
    object = nullptr;
}

} // namespace

void ShareCaptureCounters::Clear() {
    Store(SHARE_CAPTURE_STATISTIC{}, static_cast<SCREEN_CAPTURER_TYPE>(0));
}

void ShareCaptureCounters::Store(const SHARE_CAPTURE_STATISTIC& statistic, SCREEN_CAPTURER_TYPE mode) {
    nTotalFrames = statistic.nTotalFrames;
    m_nMsAverageCaptureTime = statistic.m_nMsAverageCaptureTime;
    m_nMsAverageDeliverCapabilityTime = statistic.m_nMsAverageDeliverCapabilityTime;
    m_nMsAverageCaptureCapabilityTime = statistic.m_nMsAverageCaptureCapabilityTime;
    nCaptureWidth = statistic.nCaptureWidth;
    nCaptureHeight = statistic.nCaptureHeight;
    nCaptureFps = statistic.nCaptureFps;
    nDuplicateFrames = statistic.nDuplicateFrames;
    nFlags = statistic.nFlags;
    m_eLastMode = mode;
}

void ShareCaptureCounters::Load(SHARE_CAPTURE_STATISTIC& statistic) const {
    statistic.nTotalFrames = nTotalFrames;
    statistic.m_nMsAverageCaptureTime = m_nMsAverageCaptureTime;
    statistic.m_nMsAverageDeliverCapabilityTime = m_nMsAverageDeliverCapabilityTime;
    statistic.m_nMsAverageCaptureCapabilityTime = m_nMsAverageCaptureCapabilityTime;
    statistic.nCaptureWidth = nCaptureWidth;
    statistic.nCaptureHeight = nCaptureHeight;
    statistic.nCaptureFps = nCaptureFps;
    statistic.nDuplicateFrames = nDuplicateFrames;
    statistic.nFlags = nFlags;
}

CShareCaptureEngine::CShareCaptureEngine() : m_sinkPort(std::make_shared<ShareSinkPort>()) {
    UseShareLib();
    try {
        _MakeParts();
    } catch (...) {
        // Nobody calls the destructor of what was never made.
        _ReleaseParts();
        throw;
    }
}

void CShareCaptureEngine::_MakeParts() {
    m_spShareCapturerContext = MakeShareCapturerContext();
    m_pISharePointing = CreateSharePointing(SHARE_POINTING_TYPE_MOUSE, SHARE_INVALID_DISPLAY);
    m_pShareFrameA = NewFrame();
    m_pShareFrameB = NewFrame();
    m_pCurShareFrame = m_pShareFrameA;
    AppShareConfig::Instance()->InitConfig();
    // Whatever type the debug file has asked for, a new engine starts in the default mode, for the whole
    // process.
    AppShareConfig::Instance()->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
}

CShareCaptureEngine::~CShareCaptureEngine() {
    _FinitAssistThread();
    _CleanupCapturer();
    {
        // An event that another thread has posted since then fires without a sink.
        const CCmMutexGuard guard(m_sinkPort->Mutex());
        m_sinkPort->SetSink(nullptr);
    }
    _ReleaseParts();
}

void CShareCaptureEngine::_ReleaseParts() {
    ReleaseAndClear(m_pCursorImg);
    ReleaseAndClear(m_pShareFrameA);
    ReleaseAndClear(m_pShareFrameB);
    if (m_pISharePointing != nullptr)
        DestroySharePointing(m_pISharePointing);
    ReleaseShareLib();
}

std::unique_lock<std::recursive_mutex> CShareCaptureEngine::_LockLifecycle() {
    std::unique_lock<std::recursive_mutex> lock(m_mutexLifecycle, std::defer_lock);
    // The holder may be waiting for just this thread's callback to end.
    if (ShareCallOutMark::IsSet()) {
        if (!lock.try_lock())
            CmTraceError("[CShareCaptureEngine::_LockLifecycle]>>fail>>engine is starting or stopping");
    } else {
        lock.lock();
    }
    return lock;
}

int CShareCaptureEngine::Start() {
    const std::unique_lock<std::recursive_mutex> lock = _LockLifecycle();
    if (m_eSHARE_CAPTURE_ENGINE_STATUS != SHARE_CAPTURE_ENGINE_STATUS_STOPPED)
        return SHARE_RESULT_OK;
    if (!lock.owns_lock())
        return SHARE_RESULT_FAILED;
    m_bFirstError = true;
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCaptureEngine::Start]>>fail>>", [&] { result = _Init(); });
    if (result != SHARE_RESULT_OK) {
        CmTraceError("[CShareCaptureEngine::Start]>>fail>>>Init fail");
        return result;
    }
    m_statistic.Clear();
    m_tickFailureStart = 0;
    m_nFailureCount = 0;
    m_bDisplayGone = false;
    m_spShareCapturerContext->NoteInterruption();
    _InitAssistThread();
    _UpdateShareStatus(SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::_Init() {
    if (const int result = _CheckSource(); result != SHARE_RESULT_OK)
        return result;
    if (m_pISharePointing != nullptr) {
        m_pISharePointing->AddSink(this);
        m_pISharePointing->Start();
    } else {
        CmTraceError("[CShareCaptureEngine::_Init]>>m_pISharePointing is NULL");
    }
    const int result = _CreateCaptureThread();
    if (result != SHARE_RESULT_OK) {
        CmTraceError("[CShareCaptureEngine::_Init]>>_CreateCaptureThread fail");
        _CleanupCapturer();
    }
    return result;
}

int CShareCaptureEngine::_CheckSource() {
    const CCmMutexGuard guard(_CapturerMutex());
    const std::shared_ptr<IShareCapturer> capturer = _GetIShareCapturer();
    if (capturer == nullptr) {
        CmTraceError("[CShareCaptureEngine::_Init]>>fail>>pIShareCapturer is NULL");
        return SHARE_RESULT_NO_CAPTURER;
    }
    if (!_HasSource(*capturer)) {
        CmTraceError(
            "[CShareCaptureEngine::Start]>>fail>>without screen source, m_eSHARE_CAPTURE_ENGINE_TYPE=",
            static_cast<int>(m_eSHARE_CAPTURE_ENGINE_TYPE),
            ",count = ", capturer->GetCaptureShareSourceCount());
        return SHARE_RESULT_NOTHING_TO_SHARE;
    }
    capturer->AddSink(this);
    return SHARE_RESULT_OK;
}

bool CShareCaptureEngine::_HasSource(IShareCapturer& capturer) {
    switch (m_eSHARE_CAPTURE_ENGINE_TYPE) {
        case SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION:
            return m_pIShareCapturerExternal != nullptr;
        case SHARE_CAPTURE_ENGINE_TYPE_DESKTOP:
            return capturer.GetCaptureShareSourceCount() >= 1 ||
                   capturer.GetCurrentCaptureDisplayId() != SHARE_INVALID_DISPLAY;
        case SHARE_CAPTURE_ENGINE_TYPE_APP:
            return capturer.GetCaptureShareSourceCount() >= 1 ||
                   m_spShareCapturerContext->GetSharedAppCount() != 0;
        case SHARE_CAPTURE_ENGINE_TYPE_WINDOW:
            return m_spShareCapturerContext->GetSharedWindowCount() != 0;
    }
    return false;
}

int CShareCaptureEngine::Stop() {
    if (IsCalledFromInside()) {
        CmTraceError("[CShareCaptureEngine::Stop]>>fail>>called from inside a callback of this engine");
        return SHARE_RESULT_FAILED;
    }
    const std::unique_lock<std::recursive_mutex> lock = _LockLifecycle();
    if (!lock.owns_lock())
        return SHARE_RESULT_FAILED;
    if (m_eSHARE_CAPTURE_ENGINE_STATUS == SHARE_CAPTURE_ENGINE_STATUS_STOPPED)
        return SHARE_RESULT_OK;
    const ShareWait wait = WaitForCallbacks();
    if (!wait.MayBegin()) {
        CmTraceError("[CShareCaptureEngine::Stop]>>fail>>a callback of this engine waits for this thread");
        return SHARE_RESULT_FAILED;
    }
    _CleanupCapturer();
    _UpdateShareStatus(SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
    m_statistic.Clear();
    _FinitAssistThread();
    return SHARE_RESULT_OK;
}

void CShareCaptureEngine::_CleanupCapturer() {
    _DestroyCaptureThread();
    if (const std::shared_ptr<IShareCapturer> own = _GetOwnCapturer())
        own->RemoveSink(this);
    {
        const CCmMutexGuard guard(_CapturerMutex());
        if (m_pIShareCapturerExternal != nullptr)
            m_pIShareCapturerExternal->RemoveSink(this);
    }
    if (m_pISharePointing == nullptr)
        return;
    m_pISharePointing->RemoveSink(this);
    m_pISharePointing->Stop();
}

int CShareCaptureEngine::Pause() {
    if (_MoveStatus(SHARE_CAPTURE_ENGINE_STATUS_STARTED, SHARE_CAPTURE_ENGINE_STATUS_PAUSED))
        return SHARE_RESULT_OK;
    return m_eSHARE_CAPTURE_ENGINE_STATUS == SHARE_CAPTURE_ENGINE_STATUS_STOPPED ? SHARE_RESULT_FAILED
                                                                                 : SHARE_RESULT_OK;
}

int CShareCaptureEngine::Resume() {
    if (m_eSHARE_CAPTURE_ENGINE_STATUS == SHARE_CAPTURE_ENGINE_STATUS_PAUSED) {
        m_tickFailureStart = 0;
        m_nFailureCount = 0;
        m_spShareCapturerContext->NoteInterruption();
    }
    if (_MoveStatus(SHARE_CAPTURE_ENGINE_STATUS_PAUSED, SHARE_CAPTURE_ENGINE_STATUS_STARTED))
        return SHARE_RESULT_OK;
    return m_eSHARE_CAPTURE_ENGINE_STATUS == SHARE_CAPTURE_ENGINE_STATUS_STOPPED ? SHARE_RESULT_FAILED
                                                                                 : SHARE_RESULT_OK;
}

bool CShareCaptureEngine::_MoveStatus(SHARE_CAPTURE_ENGINE_STATUS from, SHARE_CAPTURE_ENGINE_STATUS to) {
    // Held over the post, so that the sink hears of changes in the order in which they were made.
    const std::lock_guard<std::recursive_mutex> lock(m_mutexStatus);
    if (!m_eSHARE_CAPTURE_ENGINE_STATUS.compare_exchange_strong(from, to))
        return false;
    OnCaptureStatusChanged(to);
    return true;
}

void CShareCaptureEngine::_UpdateShareStatus(SHARE_CAPTURE_ENGINE_STATUS status) {
    const std::lock_guard<std::recursive_mutex> lock(m_mutexStatus);
    if (m_eSHARE_CAPTURE_ENGINE_STATUS.exchange(status) != status)
        OnCaptureStatusChanged(status);
}

int CShareCaptureEngine::SetSink(IShareCaptureEngineSink* sink) {
    const ShareWait wait(0, m_sinkPort);
    if (!wait.MayBegin() && !m_sinkPort->IsCurrentThreadInside()) {
        CmTraceError("[CShareCaptureEngine::SetSink]>>fail>>a callback of this engine waits for this thread");
        return SHARE_RESULT_FAILED;
    }
    const CCmMutexGuard guard(m_sinkPort->Mutex());
    if (sink != nullptr)
        _InitAssistThread();
    m_sinkPort->SetSink(sink);
    CmTraceDebug("[CShareCaptureEngine::SetSink]>>m_pIShareCaptureEngineSink=",
                 static_cast<const void*>(sink));
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::SetExternalIShareCapturer(IShareCapturer* capturer) {
    const std::unique_lock<std::recursive_mutex> lock = _LockLifecycle();
    if (m_eSHARE_CAPTURE_ENGINE_STATUS != SHARE_CAPTURE_ENGINE_STATUS_STOPPED) {
        CmTraceError(
            "[CShareCaptureEngine::StSetExternalIShareCapturerart] cannot set external capturer after started");
        return SHARE_RESULT_FAILED;
    }
    if (m_eSHARE_CAPTURE_ENGINE_TYPE != SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION) {
        CmTraceError(
            "[CShareCaptureEngine::StSetExternalIShareCapturerart] m_eSHARE_CAPTURE_ENGINE_TYPE is not "
            "SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION");
        return SHARE_RESULT_FAILED;
    }
    if (!lock.owns_lock())
        return SHARE_RESULT_FAILED;
    {
        const CCmMutexGuard guard(m_mutexCapturer);
        m_pIShareCapturerExternal = capturer;
        if (capturer != nullptr) {
            TVLSize size{};
            capturer->GetCurrentCaptureSourceSize(size);
            _UpdateShareDisplaySize(size);
        }
    }
    CmTraceInfo("[CShareCaptureEngine::StSetExternalIShareCapturerart]>>m_pIShareCapturerExternal=",
                static_cast<const void*>(capturer));
    return SHARE_RESULT_OK;
}

int CShareCaptureEngine::EnableExternalISharePointing(bool enable) {
    m_bUseExternalPoint = enable;
    CmTraceInfo("[CShareCaptureEngine::EnableExternalISharePointing]>>m_bUseExternalPoint=", enable);
    return SHARE_RESULT_OK;
}

SHARE_CAPTURE_ENGINE_TYPE CShareCaptureEngine::GetCaptureEngineType() {
    return m_eSHARE_CAPTURE_ENGINE_TYPE;
}

SHARE_CAPTURE_ENGINE_STATUS CShareCaptureEngine::GetCaptureStatus() {
    return m_eSHARE_CAPTURE_ENGINE_STATUS;
}

void CShareCaptureEngine::GetCaptureSize(TVLSize& size) {
    size = m_sizeShareDisplay;
}

int CShareCaptureEngine::GetShareCaptureStatistic(SHARE_CAPTURE_STATISTIC& statistic) {
    m_statistic.Load(statistic);
    statistic.eCaptureMode = m_eCaptureMode;
    return SHARE_RESULT_OK;
}
