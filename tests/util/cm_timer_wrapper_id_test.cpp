// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "tests/support/trace_log.h"
#include "util/cm_timer_queue.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstdio>
#include <functional>
#include <memory>
#include <stdexcept>
#include <thread>
#include <vector>

using namespace std::chrono_literals;

namespace {

const CCmTimeValue TEN_MS(0, 10000);

class Sink final : public CCmTimerWrapperIDSink {
public:
    explicit Sink(std::function<void(CCmTimerWrapperID*)> fn = [](CCmTimerWrapperID*) {})
        : m_fn(std::move(fn)) {}

    void OnTimer(CCmTimerWrapperID* timer) override {
        m_lastTimer = timer;
        m_lastThread = GetThreadSelfId();
        m_ticks.Add();
        m_fn(timer);
    }

    int Ticks() const { return m_ticks.Count(); }

    std::function<void(CCmTimerWrapperID*)> m_fn;
    CTally m_ticks;
    std::atomic<CCmTimerWrapperID*> m_lastTimer{nullptr};
    std::atomic<CmThreadId> m_lastThread{0};
};

/// A thread that cannot tick.
class BareThread final : public ACmThread {};

/// A thread whose timer queue only keeps what it is given, for the test to tick.
class TimerTaker final : public ACmThread, public ICmTimerQueue {
public:
    ICmTimerQueue* GetTimerQueue() override { return this; }

    int ScheduleTimer(ICmTimerHandler*, void*, const CCmTimeValue&, unsigned) override { return -1; }
    int CancelTimer(ICmTimerHandler* handler) override {
        m_cancelled.push_back(handler);
        return 0;
    }
    int ScheduleSharedTimer(std::shared_ptr<ICmTimerHandler> handler, void* argument, const CCmTimeValue&,
                            unsigned) override {
        if (m_refuses)
            return -1;
        m_taken.push_back([handler, argument] { handler->OnTimeout(CCmTimeValue(), argument); });
        m_handler = handler.get();
        return 0;
    }

    bool m_refuses = false;
    std::vector<std::function<void()>> m_taken; // calling one is a tick of that schedule
    std::vector<ICmTimerHandler*> m_cancelled;
    ICmTimerHandler* m_handler = nullptr;
};

class CCmTimerWrapperIDTest : public testing::Test {
protected:
    void Advance(std::chrono::nanoseconds step) {
        m_clock->Advance(step);
        Settle(*m_thread);
        Settle(*m_otherThread);
    }

    CManualClockScope m_clock;
    CRunningThread m_thread{"timers"};
    CRunningThread m_otherThread{"other timers"};
};

} // namespace

TEST_F(CCmTimerWrapperIDTest, TicksOnTheThreadThatItWasGiven) {
    Sink sink;
    CCmTimerWrapperID timer;
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    Advance(9ms);
    EXPECT_EQ(sink.Ticks(), 0);
    Advance(1ms);
    EXPECT_EQ(sink.Ticks(), 1);
    EXPECT_EQ(sink.m_lastTimer, &timer);
    EXPECT_EQ(sink.m_lastThread, m_thread->GetThreadId());
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 2);
}

TEST_F(CCmTimerWrapperIDTest, TicksAsOftenAsCounted) {
    Sink sink;
    CCmTimerWrapperID timer;
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 2), 0);
    for (int i = 0; i < 5; ++i)
        Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 2);
}

TEST_F(CCmTimerWrapperIDTest, RefusesBadArgumentsAndKeepsTheTimerThatItHas) {
    Sink sink;
    CCmTimerWrapperID timer;
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    const auto bare = std::make_shared<BareThread>();
    const auto notStarted = std::make_shared<KRNUTIL::ComTaskThread>();
    EXPECT_EQ(timer.ScheduleInThread(nullptr, &sink, TEN_MS, 0), -1);
    EXPECT_EQ(timer.ScheduleInThread(&*m_otherThread, nullptr, TEN_MS, 0), -1);
    EXPECT_EQ(timer.ScheduleInThread(&*m_otherThread, &sink, CCmTimeValue(), 0), -1);
    EXPECT_EQ(timer.ScheduleInThread(&*m_otherThread, &sink, CCmTimeValue(-1, 0), 0), -1);
    EXPECT_EQ(timer.ScheduleInThread(bare.get(), &sink, TEN_MS, 0), -1);
    EXPECT_EQ(timer.ScheduleInThread(notStarted.get(), &sink, TEN_MS, 0), -1);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
    EXPECT_EQ(sink.m_lastThread, m_thread->GetThreadId());
}

TEST_F(CCmTimerWrapperIDTest, SchedulesWithoutWaitingForABusyThread) {
    CGate gate;
    Sink sink;
    Post(*m_thread, [&] { EXPECT_TRUE(gate.Passes()); });
    CCmTimerWrapperID timer;
    EXPECT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    gate.Open();
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
}

TEST_F(CCmTimerWrapperIDTest, ReplacesItsTimer) {
    Sink former;
    Sink next;
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &former, TEN_MS, 0);
    Advance(9ms);
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &next, TEN_MS, 0), 0);
    Advance(9ms);
    EXPECT_EQ(next.Ticks(), 0);
    Advance(1ms);
    EXPECT_EQ(next.Ticks(), 1);
    EXPECT_EQ(former.Ticks(), 0);
}

TEST_F(CCmTimerWrapperIDTest, MovesToAnotherThread) {
    Sink sink;
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    ASSERT_EQ(timer.ScheduleInThread(&*m_otherThread, &sink, TEN_MS, 0), 0);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
    EXPECT_EQ(sink.m_lastThread, m_otherThread->GetThreadId());
}

TEST_F(CCmTimerWrapperIDTest, RelievesTheThreadThatItLeaves) {
    const auto left = std::make_shared<TimerTaker>();
    Sink sink;
    CCmTimerWrapperID timer;
    ASSERT_EQ(timer.ScheduleInThread(left.get(), &sink, TEN_MS, 0), 0);
    ASSERT_EQ(timer.ScheduleInThread(left.get(), &sink, TEN_MS, 0), 0);
    EXPECT_TRUE(left->m_cancelled.empty()) << "the queue replaces it by itself";
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    EXPECT_EQ(left->m_cancelled, std::vector{left->m_handler});
}

TEST_F(CCmTimerWrapperIDTest, IgnoresTicksThatWereUnderWayWhenItsScheduleEnded) {
    const auto thread = std::make_shared<TimerTaker>();
    Sink former;
    Sink next;
    auto timer = std::make_unique<CCmTimerWrapperID>();
    timer->ScheduleInThread(thread.get(), &former, TEN_MS, 0);
    timer->ScheduleInThread(thread.get(), &next, TEN_MS, 0);
    ASSERT_EQ(thread->m_taken.size(), 2u);
    thread->m_taken[0]();
    EXPECT_EQ(former.Ticks() + next.Ticks(), 0) << "replaced";
    thread->m_taken[1]();
    EXPECT_EQ(next.Ticks(), 1);
    timer->Cancel(false);
    thread->m_taken[1]();
    EXPECT_EQ(next.Ticks(), 1) << "cancelled";
    timer->ScheduleInThread(thread.get(), &next, TEN_MS, 0);
    timer.reset();
    thread->m_taken[2]();
    EXPECT_EQ(next.Ticks(), 1) << "destroyed";
}

TEST_F(CCmTimerWrapperIDTest, KeepsTheTimerThatItHasWhenAnotherThreadRefusesIt) {
    const auto refusing = std::make_shared<TimerTaker>();
    refusing->m_refuses = true;
    Sink sink;
    CCmTimerWrapperID timer;
    ASSERT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    EXPECT_EQ(timer.ScheduleInThread(refusing.get(), &sink, TEN_MS, 0), -1);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
}

TEST_F(CCmTimerWrapperIDTest, TicksNoMoreOnceCancelled) {
    for (const bool wait : {false, true}) {
        Sink sink;
        CCmTimerWrapperID timer;
        timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
        Advance(10ms);
        timer.Cancel(wait);
        Advance(10ms);
        EXPECT_EQ(sink.Ticks(), 1) << "waiting: " << wait;
        timer.Cancel(wait);
        EXPECT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
        Advance(10ms);
        EXPECT_EQ(sink.Ticks(), 2) << "waiting: " << wait;
    }
}

TEST_F(CCmTimerWrapperIDTest, CancelsNothingWithoutHarm) {
    Sink sink;
    CCmTimerWrapperID timer;
    timer.Cancel(false);
    timer.Cancel(true);
    EXPECT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
}

TEST_F(CCmTimerWrapperIDTest, WaitsForARunningTickOnlyWhenAsked) {
    CGate gate;
    std::atomic<bool> tickEnded{false};
    Sink sink([&](CCmTimerWrapperID*) {
        EXPECT_TRUE(gate.Passes());
        tickEnded = true;
    });
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    m_clock->Advance(10ms);
    ASSERT_TRUE(sink.m_ticks.Reaches(1));
    timer.Cancel(false);
    EXPECT_FALSE(tickEnded);
    std::thread opener([&] { gate.Open(); });
    timer.Cancel(true);
    EXPECT_TRUE(tickEnded);
    opener.join();
}

TEST_F(CCmTimerWrapperIDTest, WaitsForATickThatBeganBeforeTheTimerMovedAway) {
    CGate gate;
    std::atomic<bool> tickEnded{false};
    Sink slow([&](CCmTimerWrapperID*) {
        EXPECT_TRUE(gate.Passes());
        tickEnded = true;
    });
    Sink next;
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &slow, TEN_MS, 0);
    m_clock->Advance(10ms);
    ASSERT_TRUE(slow.m_ticks.Reaches(1));
    ASSERT_EQ(timer.ScheduleInThread(&*m_otherThread, &next, TEN_MS, 0), 0);
    m_clock->Advance(10ms);
    EXPECT_TRUE(next.m_ticks.Reaches(1));
    EXPECT_FALSE(tickEnded);
    std::thread opener([&] { gate.Open(); });
    timer.Cancel(true);
    EXPECT_TRUE(tickEnded);
    opener.join();
}

TEST_F(CCmTimerWrapperIDTest, MayBeCancelledInsideItsTick) {
    Sink sink([](CCmTimerWrapperID* timer) { timer->Cancel(true); });
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    Advance(10ms);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
}

TEST_F(CCmTimerWrapperIDTest, MayBeDestroyedInsideItsTick) {
    auto timer = std::make_unique<CCmTimerWrapperID>();
    Sink sink([&](CCmTimerWrapperID*) { timer.reset(); });
    timer->ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    Advance(10ms);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
    EXPECT_EQ(timer, nullptr);
}

TEST_F(CCmTimerWrapperIDTest, MayBeDestroyedOnTheTimersThreadWhileATickIsDue) {
    auto timer = std::make_unique<CCmTimerWrapperID>();
    Sink sink;
    CGate begun;
    CGate gate;
    Post(*m_thread, [&] {
        begun.Open();
        EXPECT_TRUE(gate.Passes());
        timer.reset();
    });
    ASSERT_TRUE(begun.Passes());
    timer->ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    m_clock->Advance(10ms);
    gate.Open();
    Settle(*m_thread);
    EXPECT_EQ(sink.Ticks(), 0);
}

TEST_F(CCmTimerWrapperIDTest, TicksOnAfterAnException) {
    const CTraceLog log(CM_TRACE_ERROR);
    Sink sink([](CCmTimerWrapperID*) { throw std::runtime_error("no ink"); });
    CCmTimerWrapperID timer;
    timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0);
    Advance(10ms);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 2);
    EXPECT_EQ(log.CountContaining("no ink"), 2u);
    timer.Cancel(true);
}

TEST_F(CCmTimerWrapperIDTest, OutlivesItsThread) {
    Sink sink;
    CCmTimerWrapperID timer;
    {
        CRunningThread shortLived("short lived");
        timer.ScheduleInThread(&*shortLived, &sink, TEN_MS, 0);
    }
    timer.Cancel(true);
    EXPECT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    Advance(10ms);
    EXPECT_EQ(sink.Ticks(), 1);
}

TEST_F(CCmTimerWrapperIDTest, NeverTicksOnAStoppedThread) {
    Sink sink;
    CCmTimerWrapperID timer;
    m_thread->Stop(nullptr);
    EXPECT_EQ(timer.ScheduleInThread(&*m_thread, &sink, TEN_MS, 0), 0);
    m_clock->Advance(10ms);
    m_thread->Join();
    EXPECT_EQ(sink.Ticks(), 0);
}

// Timers come and go while their ticks run; the sink and the timer are freed at once, for the sanitizers to
// see.
TEST_F(CCmTimerWrapperIDTest, IsQuietOnceDestroyedWhereverItsTickIs) {
    const int rounds = 500 * TestEffort();
    std::printf("%d rounds\n", rounds);
    std::atomic<bool> done{false};
    std::thread mover([&] {
        while (!done)
            m_clock->Advance(1ms);
    });
    int withTicks = 0;
    for (int round = 0; round < rounds; ++round) {
        auto ticks = std::make_unique<std::atomic<int>>(0);
        auto sink = std::make_unique<Sink>([&ticks](CCmTimerWrapperID*) { ++*ticks; });
        auto timer = std::make_unique<CCmTimerWrapperID>();
        ASSERT_EQ(timer->ScheduleInThread(&*m_thread, sink.get(), CCmTimeValue(0, 1000), 0), 0);
        ASSERT_TRUE(sink->m_ticks.Reaches(round % 5));
        if (round % 3 == 0)
            timer->ScheduleInThread(&*m_otherThread, sink.get(), CCmTimeValue(0, 1000), 0);
        timer.reset();
        withTicks += *ticks != 0;
        sink.reset();
        ticks.reset();
    }
    done = true;
    mover.join();
    EXPECT_GT(withTicks, 0) << "no timer ever ticked: nothing was tried";
}
