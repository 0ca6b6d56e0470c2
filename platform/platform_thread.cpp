// SPDX-License-Identifier: Apache-2.0
#include "platform/platform_thread.h"

#include "util/cm_thread.h"

#include <atomic>

namespace platform {

namespace {

constinit thread_local const PlatformThreadScope* t_innermost = nullptr;

/// How many rests are under way.
constinit std::atomic<int> g_rests{0};

} // namespace

PlatformThreadScope::PlatformThreadScope(const ACmThread* thread) : m_thread(thread), m_outer(t_innermost) {
    t_innermost = this;
}

PlatformThreadScope::~PlatformThreadScope() {
    t_innermost = m_outer;
}

bool OnPlatformThread() {
    return t_innermost != nullptr;
}

bool OnEndingPlatformThread() {
    if (t_innermost == nullptr)
        return false;
    return g_rests.load() > 0 || (t_innermost->m_thread != nullptr && t_innermost->m_thread->GetStopFlag());
}

PlatformRestScope::PlatformRestScope() {
    ++g_rests;
}

PlatformRestScope::~PlatformRestScope() {
    --g_rests;
}

} // namespace platform
