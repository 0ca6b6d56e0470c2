// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_never_destroyed.h"

#include <pthread.h>

#include <atomic>
#include <new>

namespace platform {

/// One T for the process, never destroyed. A forked child has a fresh one: the other threads of the parent
/// don't exist there, so nobody would give back a lock that they held, or end what they were at. Ask for it
/// once while the library is loaded, so that no fork falls into its making.
template <class T>
class OnePerProcess {
public:
    static T& Get() { return *Current().load(std::memory_order_acquire); }

private:
    static std::atomic<T*>& Current() {
        static const CCmNeverDestroyed<T> first;
        static std::atomic<T*> current{&*first};
        [[maybe_unused]] static const int forkHandler =
            pthread_atfork(nullptr, nullptr, [] { StartAfreshInChild(); });
        return current;
    }

    static void StartAfreshInChild() {
        if (T* const fresh = new (std::nothrow) T)
            Current().store(fresh, std::memory_order_release);
    }
};

} // namespace platform
