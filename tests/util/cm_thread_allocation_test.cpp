// SPDX-License-Identifier: Apache-2.0
#include "tests/support/sanitizer.h"
#include "tests/support/threads.h"
#include "util/cm_timer_queue.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <new>

using namespace std::chrono_literals;

namespace {

thread_local int t_allocations = 0;

} // namespace

// A sanitizer brings its own allocator and finds out less when we stand before it.
#if !SCREENSHARE_TEST_SANITIZED

void* operator new(std::size_t size) {
    ++t_allocations;
    if (void* const memory = std::malloc(size != 0 ? size : 1))
        return memory;
    throw std::bad_alloc();
}

void operator delete(void* memory) noexcept {
    std::free(memory);
}

void operator delete(void* memory, std::size_t) noexcept {
    std::free(memory);
}

#endif

namespace {

class TickingHandler final : public ICmTimerHandler {
public:
    void OnTimeout(const CCmTimeValue&, void*) override {
        m_allocations = t_allocations;
        m_ticks.Add();
    }

    CTally m_ticks;
    int m_allocations = 0; // of the ticking thread, up to its latest tick; read only while it does not tick
};

} // namespace

TEST(ComTaskThreadAllocations, CountsThoseOfOneThread) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "a sanitizer allocates in our place";
    const int before = t_allocations;
    ::operator delete(::operator new(3));
    EXPECT_EQ(t_allocations, before + 1);
}

TEST(ComTaskThreadAllocations, AreNoneAtATick) {
    if (SCREENSHARE_TEST_SANITIZED)
        GTEST_SKIP() << "a sanitizer allocates in our place";
    CManualClockScope clock;
    CRunningThread thread;
    TickingHandler handler;
    ASSERT_EQ(thread->GetTimerQueue()->ScheduleTimer(&handler, nullptr, CCmTimeValue(1ms), 0), 0);
    const auto tick = [&](int count) {
        for (int i = 0; i < count; ++i) {
            clock->Advance(1ms);
            Settle(*thread);
        }
    };
    tick(10);
    const int before = handler.m_allocations;
    tick(1000);
    EXPECT_EQ(handler.m_ticks.Count(), 1010);
    EXPECT_EQ(handler.m_allocations, before);
}
