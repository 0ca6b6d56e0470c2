// SPDX-License-Identifier: Apache-2.0
#include "util/cm_mutex.h"

#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <thread>

namespace {

class RefusingMutex final : public CCmMutexThreadBase {
public:
    int Lock() override { return -1; }
    int UnLock() override {
        ++m_unlocks;
        return 0;
    }

    int m_unlocks = 0;
};

} // namespace

TEST(CCmMutexThreadRecursive, MayBeTakenAgainByItsHolder) {
    CCmMutexThreadRecursive mutex;
    EXPECT_EQ(mutex.Lock(), 0);
    EXPECT_EQ(mutex.Lock(), 0);
    EXPECT_EQ(mutex.UnLock(), 0);
    EXPECT_EQ(mutex.UnLock(), 0);
}

TEST(CCmMutexThreadRecursive, KeepsOthersOutUntilItIsUnlockedAsOftenAsLocked) {
    CCmMutexThreadRecursive mutex;
    int guarded = 0;
    ASSERT_EQ(mutex.Lock(), 0);
    ASSERT_EQ(mutex.Lock(), 0);
    std::thread other([&] {
        const CCmMutexGuard guard(mutex);
        guarded *= 2;
    });
    guarded = 3;
    mutex.UnLock();
    guarded += 4;
    mutex.UnLock();
    other.join();
    EXPECT_EQ(guarded, 14);
}

TEST(CCmMutexThreadRecursive, LosesNoChangeMadeUnderIt) {
    constexpr int ROUNDS = 20000;
    CCmMutexThreadRecursive mutex;
    int guarded = 0;
    const auto raise = [&] {
        for (int i = 0; i < ROUNDS; ++i) {
            const CCmMutexGuard outer(mutex);
            const CCmMutexGuard inner(mutex);
            ++guarded;
        }
    };
    std::thread other(raise);
    raise();
    other.join();
    EXPECT_EQ(guarded, 2 * ROUNDS);
}

TEST(CCmMutexGuard, DoesNotUnlockWhatItCouldNotLock) {
    RefusingMutex mutex;
    {
        const CCmMutexGuard refused(mutex);
        const CCmMutexGuard none(nullptr);
    }
    EXPECT_EQ(mutex.m_unlocks, 0);
}
