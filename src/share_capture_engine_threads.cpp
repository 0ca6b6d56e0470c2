// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_call_out.h"
#include "src/share_capture_engine_impl.h"
#include "util/cm_trace.h"

#include <exception>
#include <utility>

/// The engine's two threads: the worker, its own between Start and Stop, and the assist thread, which it
/// shares with every other engine of the process.

namespace {

constexpr const char* ASSIST_THREAD_NAME = "scn-cap-assist-{6F923E32-2392-4FE0-9F9E-BBE5C305E053}";

/// Cancels an engine's timer on the assist thread. It belongs to whoever waits for it: an engine has to end
/// also when there is no memory for an event.
class CancelEvent final : public ICmEvent {
public:
    explicit CancelEvent(CCmTimerWrapperID& timer) : m_timer(timer) {}

    int OnEventFire() override {
        m_timer.Cancel(false);
        return 0;
    }
    void OnDestorySelf() override {}

private:
    CCmTimerWrapperID& m_timer;
};

} // namespace

int CShareCaptureEngine::_CreateCaptureThread() {
    std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    if (worker == nullptr) {
        CmCallGuarded("[CShareCaptureEngine::_CreateCaptureThread]>>fail>>",
                      [&] { worker = std::make_shared<CScreenCaptureTaskThread>(); });
        if (worker == nullptr)
            return SHARE_RESULT_FAILED;
        const std::lock_guard<std::mutex> lock(m_mutexHandles);
        m_pCScreenCaptureTaskThread = worker;
    }
    worker->SetThreadExit([this] { OnCaptureThreadExit(); });
    const auto fps = static_cast<unsigned>(m_spShareCapturerContext->GetCaptureFps());
    const int result = worker->CreateCaptureThread(ThreadRun, this, fps);
    if (result != SHARE_RESULT_OK) {
        CmTraceError(
            "[CShareCaptureEngine::_CreateCaptureThread]>>m_pCScreenCaptureTaskThread->CreateCaptureThread fail");
        _DestroyCaptureThread();
    } else {
        CmTraceInfo("[CShareCaptureEngine::_CreateCaptureThread]>>sucess");
    }
    m_tickLastCapture = 0;
    return result;
}

int CShareCaptureEngine::_DestroyCaptureThread() {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    if (worker == nullptr)
        return SHARE_RESULT_OK;
    worker->DestroyCaptureThread();
    {
        const std::lock_guard<std::mutex> lock(m_mutexHandles);
        m_pCScreenCaptureTaskThread = nullptr;
    }
    CmTraceInfo("[CShareCaptureEngine::_DestroyCaptureThread]");
    m_tickLastCapture = 0;
    return SHARE_RESULT_OK;
}

void CShareCaptureEngine::OnCaptureThreadExit() {
    if (const std::shared_ptr<IShareCapturer> own = _GetOwnCapturer())
        own->Stop();
}

unsigned CShareCaptureEngine::ThreadRun(void* engine) {
    if (engine == nullptr)
        return 0;
    const bool noPointer =
        (AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_NO_POINTER) != 0;
    static_cast<CShareCaptureEngine*>(engine)->_CaptureProcess(
        noPointer ? SHARE_CAPTURE_MASK_CONTENT : SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER);
    return 0;
}

int CShareCaptureEngine::RunOnCaptureThread(std::function<unsigned()> fn) {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    if (worker != nullptr && !worker->IsCurrentThread())
        return worker->async(std::move(fn));
    if (!fn)
        return SHARE_RESULT_FAILED;
    try {
        return static_cast<int>(fn());
    } catch (const std::exception& error) {
        CmTraceError("[CShareCaptureEngine::RunOnCaptureThread]>>fail>>", error.what());
        return SHARE_RESULT_FAILED;
    }
}

void CShareCaptureEngine::_FireCaptureEvent() {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    if (worker == nullptr || worker->IsCurrentThread())
        return;
    RunOnCaptureThread([worker] {
        worker->CaptureProcess();
        return static_cast<unsigned>(SHARE_RESULT_FAILED);
    });
}

bool CShareCaptureEngine::IsCalledFromInside() const {
    if (m_sinkPort->IsCurrentThreadInside())
        return true;
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    return worker != nullptr && worker->IsCurrentThread();
}

ShareWait CShareCaptureEngine::WaitForCallbacks() const {
    const std::shared_ptr<CScreenCaptureTaskThread> worker = _GetWorker();
    return {worker != nullptr ? worker->GetThreadId() : 0, m_sinkPort};
}

void CShareCaptureEngine::_InitAssistThread() {
    if (_GetAssistThread() != nullptr)
        return;
    ACmThread* thread = nullptr;
    ACmThreadSingletonFactory::Instance()->GetSingletonThread(ASSIST_THREAD_NAME, thread);
    if (thread == nullptr)
        return;
    {
        const std::lock_guard<std::mutex> lock(m_mutexHandles);
        if (m_pAssistThread == nullptr) {
            m_pAssistThread = thread->shared_from_this();
            m_timerAssist.ScheduleInThread(thread, this, CCmTimeValue(2, 0), 0);
            return;
        }
    }
    // Start and SetSink at the same time: one hold is enough.
    ACmThreadSingletonFactory::Instance()->ResleseSingletonThread(ASSIST_THREAD_NAME, thread);
}

void CShareCaptureEngine::_FinitAssistThread() {
    std::shared_ptr<ACmThread> thread;
    {
        const std::lock_guard<std::mutex> lock(m_mutexHandles);
        thread.swap(m_pAssistThread);
    }
    if (thread == nullptr)
        return;
    if (ICmEventQueue* queue = _GetEventQueue(thread)) {
        // Behind every event of this engine that waits already, so none is left when it returns. Not from
        // inside a callback of another engine: an event that waits for that callback would be waited for.
        CancelEvent cancel(m_timerAssist);
        if (ShareCallOutMark::IsSet() || queue->SendEvent(&cancel) != 0)
            m_timerAssist.Cancel(false);
    }
    ACmThreadSingletonFactory::Instance()->ResleseSingletonThread(ASSIST_THREAD_NAME, thread.get());
}

void CShareCaptureEngine::OnTimer(CCmTimerWrapperID*) {}

CCmMutexThreadRecursive* CShareCaptureEngine::_CapturerMutex() {
    return m_eSHARE_CAPTURE_ENGINE_TYPE == SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION ? &m_mutexCapturer
                                                                                        : nullptr;
}

std::shared_ptr<IShareCapturer> CShareCaptureEngine::_GetIShareCapturer() {
    if (m_eSHARE_CAPTURE_ENGINE_TYPE != SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION)
        return _GetOwnCapturer();
    const CCmMutexGuard guard(m_mutexCapturer);
    // Points to the client's object without owning it.
    return {std::shared_ptr<void>(), m_pIShareCapturerExternal};
}

std::shared_ptr<IShareCapturer> CShareCaptureEngine::_GetOwnCapturer() const {
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    return m_pIShareCapturer;
}

void CShareCaptureEngine::_SetOwnCapturer(std::shared_ptr<IShareCapturer> capturer) {
    // The old one goes after the lock, since its destructor calls out.
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    m_pIShareCapturer.swap(capturer);
}

bool CShareCaptureEngine::_HasCapturer() {
    if (m_eSHARE_CAPTURE_ENGINE_TYPE == SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION)
        return _GetIShareCapturer() != nullptr;
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    return m_bReplacingCapturer || m_pIShareCapturer != nullptr;
}

void CShareCaptureEngine::_MarkCapturerReplaced(bool isBeingReplaced) {
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    m_bReplacingCapturer = isBeingReplaced;
}

std::shared_ptr<CScreenCaptureTaskThread> CShareCaptureEngine::_GetWorker() const {
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    return m_pCScreenCaptureTaskThread;
}

std::shared_ptr<ACmThread> CShareCaptureEngine::_GetAssistThread() const {
    const std::lock_guard<std::mutex> lock(m_mutexHandles);
    return m_pAssistThread;
}
