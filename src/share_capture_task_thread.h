// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_atomic.h"
#include "util/cm_mutex.h"
#include "util/cm_thread.h"

#include <functional>

/// The worker of an engine: ticks at the frame rate, and runs closures from other threads between ticks.
///
/// Ownership: the engine holds the thread from its Start to its Stop; who posts to it copies that share.
/// Locks:     m_mutexCapture is held for the length of a tick, so DestroyCaptureThread waits for the one in
///            progress.
class CScreenCaptureTaskThread final : public KRNUTIL::ComTaskThread, public ICmTimerHandler {
public:
    using CaptureFn = unsigned (*)(void*);

    /// Starts the thread; each tick calls `pfn(arg)`. 0, or -1 when the thread cannot be started.
    int CreateCaptureThread(CaptureFn pfn, void* arg, unsigned fps);

    /// Waits for the tick in progress and ends the thread. May be called again. Gives 0.
    int DestroyCaptureThread();

    /// Replaces the period; nothing happens when it is the present one.
    void SetFps(unsigned fps);

    /// Runs `fn` on the worker: at once when called there, else between two ticks. 0 when it ran or will run,
    /// -1 when the worker is about to end and it won't.
    int async(std::function<unsigned()> fn);

    /// One tick, out of turn.
    void CaptureProcess();

    bool IsCurrentThread() const { return GetThreadId() == GetThreadSelfId(); }

    int OnThreadInit() override;
    int OnThreadRun() override;
    void OnTimeout(const CCmTimeValue& now, void* argument) override;

    /// Runs on the worker after its loop has ended. Set before CreateCaptureThread.
    void SetThreadExit(std::function<void()> fn) { m_fnThreadExit = std::move(fn); }

private:
    class RunEvent;

    void _InitCaptureTimer();

    CaptureFn m_pfnCapture = nullptr; // with the argument, guarded by m_mutexCapture once the thread runs
    void* m_pCaptureArg = nullptr;
    ShareRelaxed<unsigned> m_nFps{5};
    CCmMutexThreadRecursive m_mutexCapture;
    std::function<void()> m_fnThreadExit;
};
