// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_task_thread.h"

#include "src/share_call_out.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <utility>

class CScreenCaptureTaskThread::RunEvent final : public ICmEvent {
public:
    explicit RunEvent(std::function<unsigned()> fn) : m_fn(std::move(fn)) {}

    int OnEventFire() override {
        if (m_fn)
            m_fn();
        return 0;
    }

private:
    std::function<unsigned()> m_fn;
};

int CScreenCaptureTaskThread::CreateCaptureThread(CaptureFn pfn, void* arg, unsigned fps) {
    m_pfnCapture = pfn;
    m_pCaptureArg = arg;
    m_nFps = fps;
    const int result = Create("scn-cap", 1, 1, 0) == 0 ? 0 : -1;
    if (result != 0) {
        CmTraceError("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Create fail,[CheckPoint]");
        DestroyCaptureThread();
    }
    CmTraceInfo("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Start,[CheckPoint]");
    return result;
}

int CScreenCaptureTaskThread::DestroyCaptureThread() {
    {
        const CCmMutexGuard guard(m_mutexCapture);
        m_pfnCapture = nullptr;
        m_pCaptureArg = nullptr;
    }
    Stop(nullptr);
    Join();
    Destory(0);
    CmTraceInfo("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]");
    return 0;
}

int CScreenCaptureTaskThread::OnThreadInit() {
    if (m_pfnCapture == nullptr || m_pCaptureArg == nullptr)
        return 0;
    const int result = ComTaskThread::OnThreadInit();
    if (result == 0)
        _InitCaptureTimer();
    return result;
}

int CScreenCaptureTaskThread::OnThreadRun() {
    const ShareCallOutMark mark;
    const int result = ComTaskThread::OnThreadRun();
    if (m_fnThreadExit)
        m_fnThreadExit();
    return result;
}

void CScreenCaptureTaskThread::OnTimeout(const CCmTimeValue&, void*) {
    CaptureProcess();
}

void CScreenCaptureTaskThread::CaptureProcess() {
    const CCmMutexGuard guard(m_mutexCapture);
    if (m_pfnCapture != nullptr)
        m_pfnCapture(m_pCaptureArg);
}

void CScreenCaptureTaskThread::SetFps(unsigned fps) {
    if (fps == m_nFps)
        return;
    m_nFps = fps;
    async([this] {
        _InitCaptureTimer();
        return 0U;
    });
}

int CScreenCaptureTaskThread::async(std::function<unsigned()> fn) {
    if (IsCurrentThread()) {
        if (fn)
            fn();
        return 0;
    }
    ICmEventQueue* queue = GetEventQueue();
    if (queue == nullptr)
        return 0;
    return queue->PostEvent(new RunEvent(std::move(fn)), CM_EVENT_PRIORITY_NORMAL);
}

void CScreenCaptureTaskThread::_InitCaptureTimer() {
    const unsigned fps = m_nFps;
    CmTraceInfo("[CShareCaptureEngine::_InitCaptureTimer]>>current  nFps=", fps);
    ICmTimerQueue* timers = GetTimerQueue();
    if (timers == nullptr) {
        CmTraceError("[CShareCaptureEngine::_InitCaptureTimer]>>fail craete timer , pTimerQueue is NULL");
        return;
    }
    timers->CancelTimer(this);
    const CCmTimeValue interval(0, static_cast<long>(1000000 / std::max(fps, 1U)));
    if (timers->ScheduleTimer(this, nullptr, interval, 0) != 0)
        CmTraceError("[CShareCaptureEngine::_InitCaptureTimer]>>fail craete timer , ScheduleTimer fail");
}
