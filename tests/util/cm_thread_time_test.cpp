// SPDX-License-Identifier: Apache-2.0
#include "tests/support/clock_moved_during_read.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <stdexcept>
#include <string>
#include <thread>
#include <vector>

using namespace std::chrono_literals;

namespace {

class TickHandler final : public ICmTimerHandler {
public:
    explicit TickHandler(std::function<void()> fn = [] {}) : m_fn(std::move(fn)) {}

    void OnTimeout(const CCmTimeValue& now, void*) override {
        m_times.push_back(now.ToDuration());
        m_thread = GetThreadSelfId();
        m_ticks.Add();
        m_fn();
    }

    int Ticks() const { return m_ticks.Count(); }

    std::function<void()> m_fn;
    CTally m_ticks;
    std::vector<std::chrono::nanoseconds> m_times; // the ticking thread's own
    std::atomic<CmThreadId> m_thread{0};
};

int Schedule(ACmThread& thread, TickHandler& handler, std::chrono::nanoseconds interval, unsigned count = 0) {
    return thread.GetTimerQueue()->ScheduleTimer(&handler, nullptr, CCmTimeValue(interval), count);
}

} // namespace

TEST(ComTaskThreadOnAManualClock, TicksWhenTheClockIsMovedThere) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler handler;
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 0);
    clock->Advance(9ms);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 0);
    clock->Advance(1ms);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 1);
    EXPECT_EQ(handler.m_thread, thread->GetThreadId());
}

TEST(ComTaskThreadOnAManualClock, WakesByTheMoveAlone) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler handler;
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    clock->Advance(10ms);
    EXPECT_TRUE(handler.m_ticks.Reaches(1));
}

TEST(ComTaskThreadOnAManualClock, MissesNoMoveOnItsWayToSleep) {
    CClockMovedDuringRead clock;
    CmReplaceClock(&clock);
    {
        CRunningThread thread;
        TickHandler handler;
        Settle(*thread);
        clock.MoveDuring(2, 10ms); // the first one finds the timer not due yet, the second one falls asleep
        ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
        EXPECT_TRUE(handler.m_ticks.Reaches(1));
    }
    CmReplaceClock(nullptr);
}

TEST(ComTaskThreadOnAManualClock, DropsTheTicksThatComeDueDuringATick) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler handler;
    handler.m_fn = [&] {
        if (handler.Ticks() == 1)
            clock->Advance(25ms);
    };
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    clock->Advance(10ms);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 1);
    clock->Advance(5ms);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 2);
}

TEST(ComTaskThreadOnAManualClock, KeepsTheCadenceOfThirtyFramesASecond) {
    CManualClockScope clock;
    const std::chrono::nanoseconds start = CmSteadyNow();
    CRunningThread thread;
    TickHandler handler;
    ASSERT_EQ(Schedule(*thread, handler, 33333us), 0);
    for (int step = 0; step < 10000; ++step) {
        clock->Advance(100us);
        Settle(*thread);
    }
    ASSERT_EQ(handler.Ticks(), 30);
    for (int tick = 1; tick <= 30; ++tick) {
        const std::chrono::nanoseconds due = start + tick * 33333us;
        EXPECT_GE(handler.m_times[static_cast<std::size_t>(tick - 1)], due);
        EXPECT_LT(handler.m_times[static_cast<std::size_t>(tick - 1)], due + 100us);
    }
}

TEST(ComTaskThreadOnAManualClock, ComesBackFromAnEventSentAfterAMoveBehindTheTicksThatWereDue) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler often;
    TickHandler seldom;
    ASSERT_EQ(Schedule(*thread, often, 1ms), 0);
    ASSERT_EQ(Schedule(*thread, seldom, 7ms), 0);
    for (int round = 1; round <= 2000; ++round) {
        clock->Advance(1ms);
        Settle(*thread);
        ASSERT_EQ(often.Ticks(), round);
        ASSERT_EQ(seldom.Ticks(), round / 7);
    }
}

TEST(ComTaskThreadOnAManualClock, TicksWhatBecameDueDuringATickBeforeTheNextEvent) {
    CManualClockScope clock;
    CRunningThread thread;
    CGate gate;
    TickHandler blocking([&] { EXPECT_TRUE(gate.Passes()); });
    TickHandler other;
    ASSERT_EQ(Schedule(*thread, blocking, 10ms, 1), 0);
    ASSERT_EQ(Schedule(*thread, other, 20ms, 1), 0);
    clock->Advance(10ms);
    ASSERT_TRUE(blocking.m_ticks.Reaches(1));
    clock->Advance(10ms);
    int ticksBefore = -1;
    Post(
        *thread, [&] { ticksBefore = other.Ticks(); }, CM_EVENT_PRIORITY_HIGH);
    gate.Open();
    Settle(*thread);
    EXPECT_EQ(ticksBefore, 1);
}

TEST(ComTaskThreadOnAManualClock, TicksWhatBecameDueDuringAnEventBeforeTheNextOne) {
    CManualClockScope clock;
    CRunningThread thread;
    std::string order;
    TickHandler handler([&] { order += "tick "; });
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    Post(*thread, [&] {
        Post(*thread, [&] { order += "second "; });
        clock->Advance(35ms);
        order += "first ";
    });
    Settle(*thread);
    Settle(*thread); // the first may have come before the second event
    EXPECT_EQ(order, "first tick second ");
}

TEST(ComTaskThreadOnAManualClock, CanBeGivenAndRelievedOfTimersInATick) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler added;
    TickHandler handler;
    handler.m_fn = [&] {
        thread->GetTimerQueue()->CancelTimer(&handler);
        Schedule(*thread, added, 1ms, 2);
    };
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    for (int step = 0; step < 30; ++step) {
        clock->Advance(1ms);
        Settle(*thread);
    }
    EXPECT_EQ(handler.Ticks(), 1);
    EXPECT_EQ(added.Ticks(), 2);
}

TEST(ComTaskThreadOnAManualClock, TicksNoMoreOnceCancelledFromElsewhere) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler handler;
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    EXPECT_EQ(thread->GetTimerQueue()->CancelTimer(&handler), 0);
    clock->Advance(10ms);
    Settle(*thread);
    EXPECT_EQ(handler.Ticks(), 0);
}

TEST(ComTaskThreadOnAManualClock, BeginsNoTickOnceStopped) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler handler;
    CGate gate;
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    bool fired = false;
    Post(*thread, [&] { EXPECT_TRUE(gate.Passes()); });
    Post(*thread, [&] { fired = true; });
    thread->Stop(nullptr);
    clock->Advance(10ms);
    gate.Open();
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_TRUE(fired);
    EXPECT_EQ(handler.Ticks(), 0);
}

TEST(ComTaskThreadOnAManualClock, EndsAfterTheTickThatStopsIt) {
    CManualClockScope clock;
    CRunningThread thread;
    TickHandler stopping([&] { thread->Stop(nullptr); });
    TickHandler next;
    ASSERT_EQ(Schedule(*thread, stopping, 10ms), 0);
    ASSERT_EQ(Schedule(*thread, next, 10ms), 0);
    clock->Advance(10ms);
    EXPECT_EQ(thread->Join(), 0);
    EXPECT_EQ(stopping.Ticks(), 1);
    EXPECT_EQ(next.Ticks(), 0);
}

TEST(ComTaskThreadOnAManualClock, TicksOnAfterATickThatThrew) {
    CManualClockScope clock;
    const CTraceLog log(CM_TRACE_ERROR);
    CRunningThread thread;
    TickHandler handler([] { throw std::runtime_error("no ink"); });
    ASSERT_EQ(Schedule(*thread, handler, 10ms), 0);
    for (int tick = 0; tick < 3; ++tick) {
        clock->Advance(10ms);
        Settle(*thread);
    }
    EXPECT_EQ(handler.Ticks(), 3);
    EXPECT_EQ(log.Lines().size(), 3u);
}

TEST(ComTaskThread, WakesForATimerThatIsDueEarlierThanTheOneItSleepsFor) {
    CRunningThread thread;
    TickHandler late;
    TickHandler soon;
    ASSERT_EQ(Schedule(*thread, late, 10h), 0);
    // Again and again, since it may still be on its way to sleep.
    for (int round = 1; round <= 50; ++round) {
        Settle(*thread);
        ASSERT_EQ(Schedule(*thread, soon, 1ms, 1), 0);
        ASSERT_TRUE(soon.m_ticks.Reaches(round));
    }
    EXPECT_EQ(late.Ticks(), 0);
}

TEST(ComTaskThread, WakesForATimerWhileItHasNothingToDo) {
    CRunningThread thread;
    TickHandler handler;
    for (int round = 1; round <= 50; ++round) {
        Settle(*thread);
        ASSERT_EQ(Schedule(*thread, handler, 1ms, 1), 0);
        ASSERT_TRUE(handler.m_ticks.Reaches(round));
    }
}

TEST(ComTaskThread, FiresEventsBesideATimerThatIsAlwaysDue) {
    CRunningThread thread;
    TickHandler handler;
    ASSERT_EQ(Schedule(*thread, handler, 1us), 0);
    ASSERT_TRUE(handler.m_ticks.Reaches(1));
    for (int i = 0; i < 100; ++i)
        Settle(*thread);
    Post(
        *thread, [&] { thread->Stop(nullptr); }, CM_EVENT_PRIORITY_LOW);
    EXPECT_EQ(thread->Join(), 0);
}
