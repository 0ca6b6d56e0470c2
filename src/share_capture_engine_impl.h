// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"
#include "src/share_capture_task_thread.h"
#include "src/share_capturer_context.h"
#include "src/share_sink_port.h"
#include "src/share_wait.h"
#include "util/cm_guarded_call.h"
#include "util/cm_mutex.h"
#include "util/cm_thread.h"

#include <screenshare/share_capture_engine.h>
#include <screenshare/share_pointing.h>

#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <utility>
#include <vector>

/// What a pass is asked for.
enum SHARE_CAPTURE_MASK : unsigned {
    SHARE_CAPTURE_MASK_CONTENT = 1,
    SHARE_CAPTURE_MASK_POINTER = 2,
};

/// SHARE_CAPTURE_STATISTIC as the pass keeps it: written by the worker, read by anybody.
struct ShareCaptureCounters {
    ShareRelaxed<int> nTotalFrames;
    ShareRelaxed<int> m_nMsAverageCaptureTime;
    ShareRelaxed<int> m_nMsAverageDeliverCapabilityTime;
    ShareRelaxed<unsigned> m_nMsAverageCaptureCapabilityTime;
    ShareRelaxed<int> nCaptureWidth;
    ShareRelaxed<int> nCaptureHeight;
    ShareRelaxed<int> nCaptureFps;
    ShareRelaxed<int> nDuplicateFrames;
    ShareRelaxed<unsigned> nFlags;
    ShareRelaxed<SCREEN_CAPTURER_TYPE> m_eLastMode;

    void Clear();
    void Store(const SHARE_CAPTURE_STATISTIC& statistic, SCREEN_CAPTURER_TYPE mode);
    void Load(SHARE_CAPTURE_STATISTIC& statistic) const;
};

/// The engine: a worker that asks a capturer for a picture at each tick, and hands frames and events to a
/// sink. As it stands it is the engine of the user-customisation kind; the other kinds bind it to a capturer
/// of their own.
///
/// Locks, in the order in which they may be taken, each optional:
///   m_mutexLifecycle      Start and Stop against each other.
///   worker's m_mutexCapture  a whole pass.
///   m_mutexCapturer       the external capturer and calls on it; only on the user-customisation kind.
///   m_sinkPort's mutex    the sink and every call on it.
///   m_mutexStatus         the status with the posting of its event.
///   m_mutexHandles        leaf: copies of the shared pointers to worker, assist thread and own capturer.
/// Posting an event takes neither the sink's mutex nor the capturer's, so it is allowed under any of them.
/// Stop and SetSink wait for callbacks of other threads, and ask a ShareWait first whether they may.
class CShareCaptureEngine : public IShareCaptureEngine,
                            public IShareCapturerSink,
                            public ISharePointingSink,
                            public CCmTimerWrapperIDSink {
public:
    CShareCaptureEngine();
    ~CShareCaptureEngine() override;
    CShareCaptureEngine(const CShareCaptureEngine&) = delete;
    CShareCaptureEngine& operator=(const CShareCaptureEngine&) = delete;

    int AddCaptureShareSource(IShareSource* source) override;
    int RemoveCaptureShareSource(IShareSource* source) override;
    int GetCaptureShareSourceCount() override;
    IShareSource* GetCaptureShareSource(int index) override;

    int Start() override;
    int Stop() override;
    int Pause() override;
    int Resume() override;
    int SetSink(IShareCaptureEngineSink* sink) override;
    int SetCaptureFps(unsigned fps) override;
    int SetCaptureMaxFrameSize(unsigned width, unsigned height) override;
    int SetFilterSelf(bool filter) override;
    int AddSharedWindow(unsigned window) override;
    int RemoveSharedWindow(unsigned window) override;
    int AddUnSharedWindow(unsigned window) override;
    int RemoveUnSharedWindow(unsigned window) override;
    int AddSharedProcess(unsigned pid) override;
    int RemoveSharedProcess(unsigned pid) override;
    int AddUnSharedProcess(unsigned pid) override;
    int RemoveUnSharedProcess(unsigned pid) override;
    int SelectSharedDisplay(unsigned display) override;
    int SetCaptureMode(SCREEN_CAPTURER_TYPE mode) override;
    int SetAppShareBackgroundColor(int rgb) override;
    SHARE_CAPTURE_ENGINE_TYPE GetCaptureEngineType() override;
    SHARE_CAPTURE_ENGINE_STATUS GetCaptureStatus() override;
    void GetCaptureSize(TVLSize& size) override;
    int GetShareCaptureStatistic(SHARE_CAPTURE_STATISTIC& statistic) override;
    bool IsAppShared(unsigned pid) override;
    bool IsWindowShared(unsigned window) override;
    int SetExternalIShareCapturer(IShareCapturer* capturer) override;
    int EnableExternalISharePointing(bool enable) override;
    int SetCaptureThreadCount(unsigned count) override;
    int Config(SHARE_CAPTURE_ENGINE_CONFIG selector, void* data, unsigned size) override;

    int OnShareSourceAdded(IShareSource* source) override;
    int OnShareSourceRemoved(IShareSource* source) override;
    int OnCapturedDisplaySizedChanged(TVLSize size) override;
    int OnCapturedDisplayChanged(bool present) override;
    int OnCapturedNoSharedApp() override;
    int OnCapturedAppDisplayChanged(unsigned display, int left, int top, int width, int height) override;
    int OnCapturedWindowChanged(std::vector<unsigned>& windows) override;
    int OnCapturedAppsCrossMultiMonitors(bool cross) override;
    int OnCaptureStatusChanged(int status) override;
    int OnCapturePositionChanged(int x, int y, int width, int height) override;
    int OnCaptureEvent(int type, int value, void* data) override;
    int OnCaptureError(int code) override;
    int OnCaptureStatistics(SHARE_CAPTURE_STATISTIC& statistic) override;

    int OnPointingPosChanged(int x, int y) override;
    int OnPointingImgChanged(ISharePointingImg* image) override;

    /// The assist thread's timer: nothing is due there.
    void OnTimer(CCmTimerWrapperID* timer) override;

    /// True on a kind of engine whose capturer lives in another process and does the pass's work there.
    virtual bool IsIpcCapturer();

    /// True when the calling thread is inside a callback of this engine's sink, or is its worker: such a
    /// thread can't wait for this engine.
    bool IsCalledFromInside() const;

    /// The calling thread's wait until no callback of this engine runs any more.
    ShareWait WaitForCallbacks() const;

    /// The single door to the worker. Another thread than the worker: hands `fn` over and gives 0 at once, or
    /// -1 when the worker is ending. Otherwise runs it here and gives its result.
    int RunOnCaptureThread(std::function<unsigned()> fn);

    /// What a tick calls, with the engine.
    static unsigned ThreadRun(void* engine);

protected:
    /// What one pass works out on its way.
    struct Pass;
    class Replacing;

    // Lifecycle (share_capture_engine_impl)
    void _MakeParts();
    void _ReleaseParts();
    int _Init();
    int _CheckSource();
    bool _HasSource(IShareCapturer& capturer);
    void _CleanupCapturer();
    int _CreateCaptureThread();
    int _DestroyCaptureThread();
    void OnCaptureThreadExit();
    void _InitAssistThread();
    void _FinitAssistThread();
    void _UpdateShareStatus(SHARE_CAPTURE_ENGINE_STATUS status);
    bool _MoveStatus(SHARE_CAPTURE_ENGINE_STATUS from, SHARE_CAPTURE_ENGINE_STATUS to);
    std::unique_lock<std::recursive_mutex> _LockLifecycle();

    std::shared_ptr<IShareCapturer> _GetIShareCapturer();
    std::shared_ptr<IShareCapturer> _GetOwnCapturer() const;
    void _SetOwnCapturer(std::shared_ptr<IShareCapturer> capturer);
    /// Whether there is a capturer, or will be when what is posted now runs.
    bool _HasCapturer();
    void _MarkCapturerReplaced(bool isBeingReplaced);
    std::shared_ptr<CScreenCaptureTaskThread> _GetWorker() const;
    std::shared_ptr<ACmThread> _GetAssistThread() const;
    /// m_mutexCapturer on the user-customisation kind, null on the others.
    CCmMutexThreadRecursive* _CapturerMutex();

    // Pass (share_capture_engine_pass)
    void _CaptureProcess(unsigned mask);
    void _FireCaptureEvent();
    virtual void _IpcCaptureProcess();
    bool _MayCapture();
    void _PrepareDump(Pass& pass);
    bool _CaptureStep(Pass& pass);
    int _CaptureFrame(IShareCapturer& capturer, IShareFrame* frame);
    void _AfterGoodCapture(Pass& pass, IShareCapturer& capturer);
    void _ReportWindowList();
    void _ReadScale(Pass& pass);
    void _ReusePreviousFrame(Pass& pass);
    void _ComposePointer(Pass& pass);
    void _ReportNoContent(const Pass& pass);
    void _DeliverPass(Pass& pass);
    void _ReportPass(const Pass& pass);
    bool _CheckFrameDuplicate(IShareFrame* frame);
    void CaculateCaptureFps(bool counted);
    void _AverageTimes(unsigned deliverTick, int width, int height);
    void _UpdateShareData(IShareFrame* frame, TVLRect& rcUpdate);
    IShareFrame* _GetCurShareFrame() { return m_pCurShareFrame; }
    IShareFrame* _GetPreShareFrame();

    // Sizes (share_capture_engine_size)
    TVLSize _GetCurCaptureMaxSize();
    void _UpdateCaptureMaxFrameSize(TVLSize size);
    bool _IsWindowAreaWanted();
    void _CalculateUpdateRect(const Pass& pass, int width, int height, TVLRect& rcUpdate);
    int _CalculateNewCaptureMaxFrameSize(const TVLRect& rcUpdate, TVLSize size);
    void _UpdateIShareFrameSize(TVLSize size);
    void _UpdateShareDisplaySize(TVLSize size);
    void _UpdateShareCapturePosition();
    void _UpdateShareCaptureSize();

    // Results and notifications (share_capture_engine_events)
    void ProcessCaptureResult(int result);
    void ProcessCaptureFailure(int result);
    bool _DiscountDrag(unsigned now);
    void _FallBackToDefaultMode();
    void _NotifyDisplaySize(TVLSize size);
    template <class Fire>
    int _PostToSink(Fire fire);
    bool _CanPost() const;
    ICmEventQueue* _GetEventQueue(const std::shared_ptr<ACmThread>& thread) const;

    // Control (share_capture_engine_control)
    /// RunOnCaptureThread for the client's operations, which must not throw: -1 also when there is no memory
    /// to hand the call over with.
    template <class Call>
    int _HandToCaptureThread(Call call) {
        int result = SHARE_RESULT_FAILED;
        CmCallGuarded("[CShareCaptureEngine::RunOnCaptureThread]>>fail>>",
                      [&] { result = RunOnCaptureThread(std::move(call)); });
        return result;
    }
    bool _ReCreateShareCapturer();
    template <class Call>
    int _PostToCapturer(Call call, int whenGone = SHARE_RESULT_FAILED);
    int _ConfigSwitch(SHARE_CAPTURE_ENGINE_CONFIG selector, unsigned value);
    int _ConfigContentType(unsigned type);

    std::shared_ptr<ShareSinkPort> m_sinkPort; // the sink with its mutex; never null
    SHARE_CAPTURE_ENGINE_TYPE m_eSHARE_CAPTURE_ENGINE_TYPE = SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION;
    std::shared_ptr<ShareCapturerContext> m_spShareCapturerContext; // constant after construction
    std::shared_ptr<IShareCapturer> m_pIShareCapturer;              // guarded by m_mutexHandles
    IShareCapturer* m_pIShareCapturerExternal = nullptr;            // guarded by m_mutexCapturer; not owned
    ISharePointing* m_pISharePointing = nullptr;                    // owned; constant after construction
    ShareRelaxed<bool> m_bUseExternalPoint;
    IShareFrame* m_pShareFrameA = nullptr; // holds one reference

    // The pointer as the pointing object told it: worker only.
    ISharePointingImg* m_pCursorImg = nullptr; // holds one reference
    int m_nPointX = 0;
    int m_nPointY = 0;

    std::atomic<SHARE_CAPTURE_ENGINE_STATUS> m_eSHARE_CAPTURE_ENGINE_STATUS{
        SHARE_CAPTURE_ENGINE_STATUS_STOPPED};
    ShareRelaxedSize m_sizeShareDisplay;
    ShareRelaxedRect m_rcSharePosition;
    std::shared_ptr<CScreenCaptureTaskThread> m_pCScreenCaptureTaskThread; // guarded by m_mutexHandles
    ShareCaptureCounters m_statistic;
    CCmMutexThreadRecursive m_mutexCapturer;
    ShareRelaxed<unsigned> m_tickLastCapture;
    std::atomic<bool> m_bFirstError{true};
    ShareRelaxed<SCREEN_CAPTURER_TYPE> m_eCaptureMode{SCREEN_CAPTURER_TYPE_DEFAULT};
    int m_nUnavailableTimes = 0; // worker only
    bool m_bFallbackEnabled = true;
    ShareRelaxed<unsigned> m_tickFailureStart;
    ShareRelaxed<int> m_nFailureCount;
    unsigned m_nFailureWindowMs = 5000;
    ShareRelaxed<unsigned> m_tickDragStart;
    unsigned m_tickFpsStart = 0; // worker only, as the next two
    unsigned m_nFpsFrames = 0;
    unsigned m_nFpsWindowMs = 1000;
    ShareRelaxedSize m_sizeCaptureMax;
    ShareRelaxedSize m_sizeCurCaptureMax;
    IShareFrame* m_pShareFrameB = nullptr; // holds one reference
    unsigned m_tickDupStart = 0;           // worker only
    /// Withdrawals when what the previous frame shows was captured. Worker only.
    std::uint64_t m_nWithdrawalsOfPrevious = 0;
    ShareRelaxed<bool> m_bCheckDupFrame;
    IShareFrame* m_pCurShareFrame = nullptr;      // worker only
    std::vector<unsigned> m_vecCapturedWindows;   // worker only
    std::vector<unsigned> m_vecWindowsOfThisPass; // worker only; kept for its memory
    std::shared_ptr<ACmThread> m_pAssistThread;   // guarded by m_mutexHandles
    CCmTimerWrapperID m_timerAssist;
    TVLRect m_rcLastUpdate{}; // worker only
    ShareRelaxed<bool> m_bForceFrame;
    ShareRelaxed<bool> m_bDisplayGone;

private:
    bool m_bReplacingCapturer = false; // guarded by m_mutexHandles
    std::recursive_mutex m_mutexLifecycle;
    std::recursive_mutex m_mutexStatus;
    mutable std::mutex m_mutexHandles;
};
