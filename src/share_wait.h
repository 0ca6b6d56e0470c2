// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_thread.h"

#include <memory>

class ShareSinkPort;

/// That the calling thread waits for an engine: for its worker to end, for its sink's callback to return.
///
/// A thread that is inside one engine's callback may stop another one. When such threads wait for each other
/// in a ring, none of them ever comes back; so whoever would close a ring has to do without waiting.
///
/// Threads: any; made and destroyed on one. Takes no memory: engines have to end also when there is none.
class ShareWait {
public:
    /// `worker`: 0 when it isn't waited for.
    ShareWait(CmThreadId worker, std::shared_ptr<const ShareSinkPort> port);
    ~ShareWait();
    ShareWait(const ShareWait&) = delete;
    ShareWait& operator=(const ShareWait&) = delete;

    /// False when what is waited for waits for the calling thread, itself or by way of others.
    bool MayBegin() const { return m_mayBegin; }

private:
    bool ComesBackTo(CmThreadId waiter);
    static bool ComesBackFrom(CmThreadId thread, CmThreadId waiter);

    const CmThreadId m_waiter = GetThreadSelfId();
    const CmThreadId m_worker;
    const std::shared_ptr<const ShareSinkPort> m_port;
    bool m_mayBegin = false;
    // The rest is guarded by the mutex of all waits.
    ShareWait* m_next = nullptr;
    bool m_isFollowed = false;
};
