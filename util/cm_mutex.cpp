// SPDX-License-Identifier: Apache-2.0
#include "util/cm_mutex.h"

#include <system_error>

int CCmMutexThreadRecursive::Lock() {
    try {
        m_mutex.lock();
        return 0;
    } catch (const std::system_error&) {
        return -1;
    }
}

int CCmMutexThreadRecursive::UnLock() {
    m_mutex.unlock();
    return 0;
}
