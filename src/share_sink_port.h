// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "src/share_call_out.h"
#include "util/cm_mutex.h"
#include "util/cm_thread.h"

#include <screenshare/share_capture_engine.h>

#include <atomic>
#include <utility>

/// The way from an engine to its client's sink: the sink, the mutex that is held during every call on it, and
/// the knowledge of who is inside such a call.
///
/// Ownership: shared by the engine and the events that are under way, so an event that fires after its
///            engine has gone finds the port, and no sink in it.
class ShareSinkPort {
public:
    /// A look without the mutex, for the side that posts; the sink may be gone by the time an event fires.
    bool HasSink() const { return m_pIShareCaptureEngineSink.load(std::memory_order_relaxed) != nullptr; }

    void SetSink(IShareCaptureEngineSink* sink) {
        m_pIShareCaptureEngineSink.store(sink, std::memory_order_relaxed);
    }

    /// Calls `call(sink)` under the mutex; false when there is no sink.
    template <class Call>
    bool CallSink(Call&& call) {
        const CCmMutexGuard guard(m_mutexSink);
        IShareCaptureEngineSink* sink = m_pIShareCaptureEngineSink.load(std::memory_order_relaxed);
        if (sink == nullptr)
            return false;
        const InsideMark mark(*this);
        std::forward<Call>(call)(*sink);
        return true;
    }

    /// True on a thread that is inside a call on this sink.
    bool IsCurrentThreadInside() const { return ThreadInside() == GetThreadSelfId(); }

    /// 0 for none.
    CmThreadId ThreadInside() const { return m_threadInside.load(std::memory_order_relaxed); }

    CCmMutexThreadRecursive& Mutex() { return m_mutexSink; }

private:
    /// Calls may nest, since the mutex is recursive, but only on one thread.
    class InsideMark {
    public:
        explicit InsideMark(ShareSinkPort& port)
            : m_port(port),
              m_before(port.m_threadInside.exchange(GetThreadSelfId(), std::memory_order_relaxed)) {}
        ~InsideMark() { m_port.m_threadInside.store(m_before, std::memory_order_relaxed); }
        InsideMark(const InsideMark&) = delete;
        InsideMark& operator=(const InsideMark&) = delete;

    private:
        ShareSinkPort& m_port;
        CmThreadId m_before;
        ShareCallOutMark m_callOut;
    };

    CCmMutexThreadRecursive m_mutexSink;
    std::atomic<IShareCaptureEngineSink*> m_pIShareCaptureEngineSink{nullptr};
    std::atomic<CmThreadId> m_threadInside{0};
};
