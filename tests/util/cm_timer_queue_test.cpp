// SPDX-License-Identifier: Apache-2.0
#include "util/cm_timer_queue.h"

#include "tests/support/threads.h"
#include "tests/support/trace_log.h"

#include <gtest/gtest.h>

#include <functional>
#include <limits>
#include <stdexcept>
#include <string>
#include <vector>

using namespace std::chrono_literals;

namespace {

const CCmTimeValue TEN_MS(0, 10000);

/// Calls a function at each tick, and keeps the times.
class Handler final : public ICmTimerHandler {
public:
    explicit Handler(std::function<void()> fn = [] {}) : m_fn(std::move(fn)) {}

    void OnTimeout(const CCmTimeValue& now, void* argument) override {
        m_ticks.push_back(now.ToDuration());
        m_argument = argument;
        m_fn();
    }

    std::function<void()> m_fn;
    std::vector<std::chrono::nanoseconds> m_ticks;
    void* m_argument = nullptr;
};

/// A timer queue whose owner is the test's thread, on a clock that the test moves.
class CCmTimerQueueTest : public testing::Test {
protected:
    /// Moves the clock and runs what is due then.
    void Advance(std::chrono::nanoseconds step) {
        m_clock->Advance(step);
        m_queue.RunDue();
    }

    std::chrono::nanoseconds SinceStart() const { return CmSteadyNow() - m_start; }

    std::optional<std::chrono::nanoseconds> NextDue() {
        const CCmWaitPoint::Lock lock = m_waitPoint.Acquire();
        const auto due = m_queue.NextDueLocked();
        return due ? std::optional(*due - m_start) : std::nullopt;
    }

    CManualClockScope m_clock;
    const std::chrono::nanoseconds m_start = CmSteadyNow();
    CCmWaitPoint m_waitPoint;
    CCmTimerQueue m_queue{m_waitPoint};
};

} // namespace

TEST_F(CCmTimerQueueTest, TicksFirstOneIntervalAfterScheduling) {
    Handler handler;
    EXPECT_EQ(NextDue(), std::nullopt);
    ASSERT_EQ(m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0), 0);
    EXPECT_EQ(NextDue(), 10ms);
    Advance(0ms);
    Advance(10ms - 1ns);
    EXPECT_TRUE(handler.m_ticks.empty());
    Advance(1ns);
    EXPECT_EQ(handler.m_ticks, std::vector{m_start + 10ms});
    EXPECT_EQ(NextDue(), 20ms);
}

TEST_F(CCmTimerQueueTest, HandsOutTheArgument) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, &m_clock, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(handler.m_argument, &m_clock);
}

TEST_F(CCmTimerQueueTest, TicksOnceADueTimeHoweverOftenItIsRun) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    m_queue.RunDue();
    m_queue.RunDue();
    EXPECT_EQ(handler.m_ticks.size(), 1u);
}

TEST_F(CCmTimerQueueTest, TicksOnceAfterAStallAndKeepsThePhase) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(55ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    EXPECT_EQ(NextDue(), 60ms);
    Advance(4ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    Advance(1ms);
    EXPECT_EQ(handler.m_ticks.size(), 2u);
}

TEST_F(CCmTimerQueueTest, TicksOnceAfterAStallOfWholeIntervals) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(30ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    EXPECT_EQ(NextDue(), 40ms);
}

TEST_F(CCmTimerQueueTest, DropsTheTicksThatComeDueDuringATick) {
    Handler handler([this] { m_clock->Advance(25ms); });
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(SinceStart(), 35ms);
    EXPECT_EQ(NextDue(), 40ms);
    m_queue.RunDue();
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    Advance(5ms);
    EXPECT_EQ(handler.m_ticks, (std::vector{m_start + 10ms, m_start + 40ms}));
}

TEST_F(CCmTimerQueueTest, DropsATickThatComesDueAsATickEnds) {
    Handler handler([this] { m_clock->Advance(10ms); });
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(NextDue(), 30ms);
}

TEST_F(CCmTimerQueueTest, TicksLateForWhatCameDueDuringAnotherHandlersTick) {
    Handler slow([this] { m_clock->Advance(25ms); });
    Handler other;
    m_queue.ScheduleTimer(&slow, nullptr, TEN_MS, 1);
    m_queue.ScheduleTimer(&other, nullptr, CCmTimeValue(20ms), 0);
    Advance(10ms);
    EXPECT_TRUE(other.m_ticks.empty()) << "it was not due when the round began";
    m_queue.RunDue();
    EXPECT_EQ(other.m_ticks, std::vector{m_start + 35ms});
    EXPECT_EQ(NextDue(), 40ms);
}

TEST_F(CCmTimerQueueTest, TicksAsOftenAsCounted) {
    Handler once;
    Handler thrice;
    m_queue.ScheduleTimer(&once, nullptr, TEN_MS, 1);
    m_queue.ScheduleTimer(&thrice, nullptr, TEN_MS, 3);
    for (int i = 0; i < 10; ++i)
        Advance(10ms);
    EXPECT_EQ(once.m_ticks.size(), 1u);
    EXPECT_EQ(thrice.m_ticks.size(), 3u);
    EXPECT_EQ(NextDue(), std::nullopt);
}

TEST_F(CCmTimerQueueTest, DoesNotCountDroppedTicks) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 3);
    Advance(95ms);
    Advance(95ms);
    Advance(95ms);
    Advance(95ms);
    EXPECT_EQ(handler.m_ticks.size(), 3u);
}

TEST_F(CCmTimerQueueTest, TicksWithoutEndWhenTheCountIsZero) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    for (int i = 0; i < 1000; ++i)
        Advance(10ms);
    EXPECT_EQ(handler.m_ticks.size(), 1000u);
    EXPECT_EQ(handler.m_ticks.back(), m_start + 10s);
}

TEST_F(CCmTimerQueueTest, ReplacesTheTimerOfAHandler) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    m_clock->Advance(9ms);
    m_queue.ScheduleTimer(&handler, &handler, CCmTimeValue(20ms), 1);
    EXPECT_EQ(NextDue(), 29ms);
    Advance(20ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    EXPECT_EQ(handler.m_argument, &handler);
    EXPECT_EQ(NextDue(), std::nullopt);
}

TEST_F(CCmTimerQueueTest, RefusesBadArgumentsAndKeepsTheTimerThatItHas) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    EXPECT_EQ(m_queue.ScheduleTimer(nullptr, nullptr, TEN_MS, 0), -1);
    EXPECT_EQ(m_queue.ScheduleTimer(&handler, nullptr, CCmTimeValue(), 0), -1);
    EXPECT_EQ(m_queue.ScheduleTimer(&handler, nullptr, CCmTimeValue(0, -1), 0), -1);
    EXPECT_EQ(m_queue.ScheduleSharedTimer(nullptr, nullptr, TEN_MS, 0), -1);
    EXPECT_EQ(NextDue(), 10ms);
}

TEST_F(CCmTimerQueueTest, TakesIntervalsThatNeverEnd) {
    Handler handler;
    EXPECT_EQ(m_queue.ScheduleTimer(&handler, nullptr, CCmTimeValue(std::numeric_limits<long>::max(), 0), 0),
              0);
    EXPECT_EQ(NextDue(), std::chrono::nanoseconds::max() - m_start);
    Advance(24h);
    EXPECT_TRUE(handler.m_ticks.empty());
}

TEST_F(CCmTimerQueueTest, CancelsATimer) {
    Handler handler;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(m_queue.CancelTimer(&handler), 0);
    EXPECT_EQ(NextDue(), std::nullopt);
    Advance(10ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
}

TEST_F(CCmTimerQueueTest, CancelsNothingWithoutHarm) {
    Handler handler;
    Handler stranger;
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    EXPECT_EQ(m_queue.CancelTimer(&stranger), 0);
    EXPECT_EQ(m_queue.CancelTimer(nullptr), 0);
    EXPECT_EQ(NextDue(), 10ms);
}

TEST_F(CCmTimerQueueTest, LetsATickCancelItsOwnTimer) {
    Handler handler;
    handler.m_fn = [&] { m_queue.CancelTimer(&handler); };
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    Advance(10ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    EXPECT_EQ(NextDue(), std::nullopt);
}

TEST_F(CCmTimerQueueTest, LetsATickScheduleItsOwnTimerAnew) {
    Handler handler;
    handler.m_fn = [&] {
        m_clock->Advance(7ms);
        m_queue.ScheduleTimer(&handler, nullptr, CCmTimeValue(100ms), 2);
    };
    m_queue.ScheduleTimer(&handler, nullptr, TEN_MS, 1);
    Advance(10ms);
    EXPECT_EQ(handler.m_ticks.size(), 1u);
    EXPECT_EQ(NextDue(), 117ms);
    handler.m_fn = [] {};
    Advance(100ms);
    EXPECT_EQ(NextDue(), 217ms);
    Advance(100ms);
    EXPECT_EQ(handler.m_ticks.size(), 3u);
    EXPECT_EQ(NextDue(), std::nullopt);
}

TEST_F(CCmTimerQueueTest, DoesNotTickATimerThatIsScheduledByATickInTheSameRound) {
    Handler late;
    Handler early([&] {
        m_clock->Advance(1h);
        m_queue.ScheduleTimer(&late, nullptr, CCmTimeValue(0, 1), 0);
    });
    m_queue.ScheduleTimer(&early, nullptr, TEN_MS, 1);
    Advance(10ms);
    EXPECT_TRUE(late.m_ticks.empty());
}

TEST_F(CCmTimerQueueTest, TicksTwoHandlersThatAreDueAtOnceInTheOrderOfScheduling) {
    std::string order;
    Handler first([&] { order += "1"; });
    Handler second([&] { order += "2"; });
    m_queue.ScheduleTimer(&first, nullptr, TEN_MS, 0);
    m_queue.ScheduleTimer(&second, nullptr, TEN_MS, 0);
    Advance(10ms);
    Advance(10ms);
    EXPECT_EQ(order, "1212");
    m_queue.ScheduleTimer(&first, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(order, "121221");
}

TEST_F(CCmTimerQueueTest, TicksInTheOrderOfTheDueTimes) {
    std::string order;
    Handler slow([&] { order += "s"; });
    Handler quick([&] { order += "q"; });
    m_queue.ScheduleTimer(&slow, nullptr, CCmTimeValue(20ms), 0);
    m_queue.ScheduleTimer(&quick, nullptr, CCmTimeValue(11ms), 0);
    Advance(25ms);
    EXPECT_EQ(order, "qs");
}

TEST_F(CCmTimerQueueTest, DoesNotTickAHandlerThatAnEarlierTickOfTheRoundCancelled) {
    Handler victim;
    Handler killer([&] { m_queue.CancelTimer(&victim); });
    m_queue.ScheduleTimer(&killer, nullptr, TEN_MS, 0);
    m_queue.ScheduleTimer(&victim, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(killer.m_ticks.size(), 1u);
    EXPECT_TRUE(victim.m_ticks.empty());
}

TEST_F(CCmTimerQueueTest, BeginsNoTickOnceStopped) {
    Handler victim;
    Handler stopper([&] { m_queue.Stop(); });
    m_queue.ScheduleTimer(&stopper, nullptr, TEN_MS, 0);
    m_queue.ScheduleTimer(&victim, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_EQ(m_queue.ScheduleTimer(&victim, nullptr, TEN_MS, 0), 0);
    EXPECT_EQ(NextDue(), std::nullopt);
    Advance(10ms);
    EXPECT_EQ(stopper.m_ticks.size(), 1u);
    EXPECT_TRUE(victim.m_ticks.empty());
}

TEST_F(CCmTimerQueueTest, TracesAnExceptionOnceAndTicksOn) {
    const CTraceLog log(CM_TRACE_ERROR);
    Handler thrower([] { throw std::runtime_error("no ink"); });
    Handler next;
    m_queue.ScheduleTimer(&thrower, nullptr, TEN_MS, 0);
    m_queue.ScheduleTimer(&next, nullptr, TEN_MS, 0);
    Advance(10ms);
    ASSERT_EQ(log.Lines().size(), 1u);
    EXPECT_TRUE(IsLineAt(log.Lines()[0],
                         "[[ScreenShare],[Core]] ERROR: "
                         "[CCmTimerQueue::RunDue]>>exception from a tick: no ink",
                         "util/cm_timer_queue"));
    EXPECT_EQ(next.m_ticks.size(), 1u);
    Advance(10ms);
    EXPECT_EQ(thrower.m_ticks.size(), 2u);
}

TEST_F(CCmTimerQueueTest, KeepsASharedHandlerForAsLongAsItMayTick) {
    auto handler = std::make_shared<Handler>();
    const auto schedule = [&] { return m_queue.ScheduleSharedTimer(handler, nullptr, TEN_MS, 1); };
    ASSERT_EQ(schedule(), 0);
    EXPECT_EQ(handler.use_count(), 2);
    ASSERT_EQ(schedule(), 0);
    EXPECT_EQ(handler.use_count(), 2) << "replaced";
    Advance(10ms);
    EXPECT_EQ(handler.use_count(), 1) << "after the last tick";
    ASSERT_EQ(schedule(), 0);
    m_queue.CancelTimer(handler.get());
    EXPECT_EQ(handler.use_count(), 1) << "cancelled";
    ASSERT_EQ(schedule(), 0);
    m_queue.Stop();
    EXPECT_EQ(handler.use_count(), 1) << "stopped";
    ASSERT_EQ(schedule(), 0);
    EXPECT_EQ(handler.use_count(), 1) << "scheduled too late";
}

TEST_F(CCmTimerQueueTest, KeepsASharedHandlerDuringItsTick) {
    auto handler = std::make_shared<Handler>();
    const std::weak_ptr<Handler> watch = handler;
    handler->m_fn = [&] {
        m_queue.CancelTimer(watch.lock().get());
        handler.reset();
        EXPECT_FALSE(watch.expired());
    };
    m_queue.ScheduleSharedTimer(handler, nullptr, TEN_MS, 0);
    Advance(10ms);
    EXPECT_TRUE(watch.expired());
}
