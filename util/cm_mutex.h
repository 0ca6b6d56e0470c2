// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <mutex>

/// A lock with the library's own verbs. Lock gives 0 on success; call UnLock only after a 0.
class CCmMutexThreadBase {
public:
    virtual ~CCmMutexThreadBase() = default;
    virtual int Lock() = 0;
    virtual int UnLock() = 0;
};

/// May be taken again by the thread that holds it; gives up the lock with as many UnLock calls.
/// Errors: Lock gives -1 when the operating system refuses the lock.
class CCmMutexThreadRecursive final : public CCmMutexThreadBase {
public:
    int Lock() override;
    int UnLock() override;

private:
    std::recursive_mutex m_mutex;
};

/// Holds a lock for a scope, and nothing if the lock was refused.
/// With a null mutex it holds nothing: for locks that only some objects need.
class CCmMutexGuard {
public:
    explicit CCmMutexGuard(CCmMutexThreadBase& mutex) : CCmMutexGuard(&mutex) {}
    explicit CCmMutexGuard(CCmMutexThreadBase* mutex)
        : m_mutex(mutex != nullptr && mutex->Lock() == 0 ? mutex : nullptr) {}
    ~CCmMutexGuard() {
        if (m_mutex != nullptr)
            m_mutex->UnLock();
    }
    CCmMutexGuard(const CCmMutexGuard&) = delete;
    CCmMutexGuard& operator=(const CCmMutexGuard&) = delete;

private:
    CCmMutexThreadBase* m_mutex;
};
