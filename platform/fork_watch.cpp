// SPDX-License-Identifier: Apache-2.0
#include "platform/fork_watch.h"

#include <pthread.h>

#include <atomic>

namespace platform {

namespace {

constinit std::atomic<unsigned> g_forks{0};

[[maybe_unused]] const int g_forkHandler = pthread_atfork(nullptr, nullptr, [] { ++g_forks; });

} // namespace

ForkWatch::ForkWatch() : m_forks(g_forks.load(std::memory_order_relaxed)) {}

bool ForkWatch::InChild() const {
    return m_forks != g_forks.load(std::memory_order_relaxed);
}

} // namespace platform
