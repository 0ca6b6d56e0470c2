// SPDX-License-Identifier: Apache-2.0
#include "src/share_wait.h"

#include "src/share_sink_port.h"

#include <mutex>
#include <utility>

namespace {

constinit std::mutex g_mutex;
constinit ShareWait* g_waits = nullptr; // those under way

} // namespace

ShareWait::ShareWait(CmThreadId worker, std::shared_ptr<const ShareSinkPort> port)
    : m_worker(worker),
      m_port(std::move(port)) {
    const std::lock_guard<std::mutex> lock(g_mutex);
    for (ShareWait* wait = g_waits; wait != nullptr; wait = wait->m_next)
        wait->m_isFollowed = false;
    m_mayBegin = !ComesBackTo(m_waiter);
    if (!m_mayBegin)
        return;
    m_next = g_waits;
    g_waits = this;
}

ShareWait::~ShareWait() {
    if (!m_mayBegin)
        return;
    const std::lock_guard<std::mutex> lock(g_mutex);
    ShareWait** place = &g_waits;
    while (*place != this)
        place = &(*place)->m_next;
    *place = m_next;
}

/// The worker may be waiting for the thread that is inside the sink, to tell the sink something itself.
bool ShareWait::ComesBackTo(CmThreadId waiter) {
    m_isFollowed = true;
    return ComesBackFrom(m_worker, waiter) || ComesBackFrom(m_port->ThreadInside(), waiter);
}

bool ShareWait::ComesBackFrom(CmThreadId thread, CmThreadId waiter) {
    if (thread == 0)
        return false;
    if (thread == waiter)
        return true;
    for (ShareWait* wait = g_waits; wait != nullptr; wait = wait->m_next) {
        if (wait->m_waiter == thread && !wait->m_isFollowed && wait->ComesBackTo(waiter))
            return true;
    }
    return false;
}
