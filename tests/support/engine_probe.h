// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_capture_engine_impl.h"
#include "src/share_engine_factories.h"

#include <memory>
#include <utility>

/// An engine of some kind whose inside tests can reach.
template <class Engine>
class CEngineProbe : public Engine {
public:
    using Engine::_CalculateNewCaptureMaxFrameSize;
    using Engine::_CalculateUpdateRect;
    using Engine::_CaptureProcess;
    using Engine::_CheckFrameDuplicate;
    using Engine::_CreateCaptureThread;
    using Engine::_DestroyCaptureThread;
    using Engine::_FireCaptureEvent;
    using Engine::_GetAssistThread;
    using Engine::_GetCurCaptureMaxSize;
    using Engine::_GetCurShareFrame;
    using Engine::_GetIShareCapturer;
    using Engine::_GetOwnCapturer;
    using Engine::_GetPreShareFrame;
    using Engine::_GetWorker;
    using Engine::_IpcCaptureProcess;
    using Engine::_ReCreateShareCapturer;
    using Engine::_UpdateShareCaptureSize;
    using Engine::_UpdateShareData;
    using Engine::_UpdateShareDisplaySize;
    using Engine::_UpdateShareStatus;
    using Engine::CaculateCaptureFps;
    using Engine::m_pAssistThread;
    using Engine::m_timerAssist;
    using Engine::OnCaptureThreadExit;
    using Engine::ProcessCaptureResult;

    using Engine::m_bCheckDupFrame;
    using Engine::m_bDisplayGone;
    using Engine::m_bFallbackEnabled;
    using Engine::m_bFirstError;
    using Engine::m_bForceFrame;
    using Engine::m_bUseExternalPoint;
    using Engine::m_eCaptureMode;
    using Engine::m_eSHARE_CAPTURE_ENGINE_STATUS;
    using Engine::m_eSHARE_CAPTURE_ENGINE_TYPE;
    using Engine::m_nFailureCount;
    using Engine::m_nFailureWindowMs;
    using Engine::m_nFpsFrames;
    using Engine::m_nFpsWindowMs;
    using Engine::m_nPointX;
    using Engine::m_nPointY;
    using Engine::m_nUnavailableTimes;
    using Engine::m_pCScreenCaptureTaskThread;
    using Engine::m_pCurShareFrame;
    using Engine::m_pCursorImg;
    using Engine::m_pIShareCapturerExternal;
    using Engine::m_pISharePointing;
    using Engine::m_pShareFrameA;
    using Engine::m_pShareFrameB;
    using Engine::m_rcLastUpdate;
    using Engine::m_rcSharePosition;
    using Engine::m_sinkPort;
    using Engine::m_sizeCaptureMax;
    using Engine::m_sizeCurCaptureMax;
    using Engine::m_sizeShareDisplay;
    using Engine::m_spShareCapturerContext;
    using Engine::m_statistic;
    using Engine::m_tickDragStart;
    using Engine::m_tickDupStart;
    using Engine::m_tickFailureStart;
    using Engine::m_tickFpsStart;
    using Engine::m_tickLastCapture;
    using Engine::m_vecCapturedWindows;

    /// The engine owns it from then on, in the place of the one that it had.
    void GivePointing(ISharePointing* pointing) {
        if (m_pISharePointing != nullptr)
            DestroySharePointing(m_pISharePointing);
        m_pISharePointing = pointing;
    }

    /// In the place of the own capturer that it had; null for none.
    void GiveOwnCapturer(std::shared_ptr<IShareCapturer> capturer) {
        this->_SetOwnCapturer(std::move(capturer));
    }
};

/// The engine of a capturer in another process.
class CIpcEngine : public CShareCaptureEngine {
public:
    bool IsIpcCapturer() override { return true; }
};
