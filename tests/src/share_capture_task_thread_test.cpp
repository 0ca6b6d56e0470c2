// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_task_thread.h"

#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <chrono>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <utility>
#include <vector>

/// The worker by itself: what a tick calls is a counter.

namespace {

using Lines = std::vector<std::string>;
using namespace std::chrono_literals;

const std::string FILE_PATH = "src/share_capture_task_thread";

std::string TimerLine(unsigned fps) {
    return Info("[CShareCaptureEngine::_InitCaptureTimer]>>current  nFps=" + std::to_string(fps));
}

/// What the ticks of a worker call.
struct TickTarget {
    CTally ticks;
    std::function<void()> during; // set before the thread runs
    CmThreadId thread = 0;

    static unsigned Tick(void* target) {
        auto& self = *static_cast<TickTarget*>(target);
        self.thread = GetThreadSelfId();
        if (self.during)
            self.during();
        self.ticks.Add();
        return 0;
    }
};

class CaptureTaskThread : public testing::Test {
protected:
    ~CaptureTaskThread() override { EXPECT_EQ(worker->DestroyCaptureThread(), 0); }

    void Start(unsigned fps) {
        ASSERT_EQ(worker->CreateCaptureThread(TickTarget::Tick, &target, fps), 0);
        trace.Clear();
    }
    void Advance(std::chrono::microseconds step) {
        clock->Advance(step);
        Settle(*worker);
    }
    int Ticks() const { return target.ticks.Count(); }

    CManualClockScope clock;
    CTraceLog trace;
    TickTarget target;
    const std::shared_ptr<CScreenCaptureTaskThread> worker = std::make_shared<CScreenCaptureTaskThread>();
};

} // namespace

TEST_F(CaptureTaskThread, TicksFirstAfterOnePeriodAndThenInPhase) {
    Start(5);
    Advance(199999us);
    EXPECT_EQ(Ticks(), 0);
    Advance(1us);
    EXPECT_EQ(Ticks(), 1);
    Advance(150000us);
    EXPECT_EQ(Ticks(), 1);
    Advance(50000us);
    EXPECT_EQ(Ticks(), 2);
    EXPECT_EQ(target.thread, worker->GetThreadId());
}

TEST_F(CaptureTaskThread, CutsThePeriodToWholeMicroseconds) {
    Start(30);
    Advance(33332us);
    EXPECT_EQ(Ticks(), 0);
    Advance(1us);
    EXPECT_EQ(Ticks(), 1);
    Advance(33332us);
    EXPECT_EQ(Ticks(), 1);
    Advance(1us);
    EXPECT_EQ(Ticks(), 2);
}

TEST_F(CaptureTaskThread, TicksOnceASecondAtARateOfZero) {
    Start(0);
    Advance(999999us);
    EXPECT_EQ(Ticks(), 0);
    Advance(1us);
    EXPECT_EQ(Ticks(), 1);
}

TEST_F(CaptureTaskThread, DropsTicksThatItMissedAndKeepsItsPhase) {
    Start(5);
    Advance(1050000us); // five periods and a quarter
    EXPECT_EQ(Ticks(), 1);
    Advance(149999us);
    EXPECT_EQ(Ticks(), 1);
    Advance(1us);
    EXPECT_EQ(Ticks(), 2);
}

TEST_F(CaptureTaskThread, DropsTicksThatComeDueDuringATick) {
    bool first = true;
    target.during = [&] {
        if (std::exchange(first, false))
            clock->Advance(450ms);
    };
    Start(5);
    Advance(200ms);
    EXPECT_EQ(Ticks(), 1) << "nothing catches up after a tick that overran its period";
    Advance(149999us);
    EXPECT_EQ(Ticks(), 1);
    Advance(1us);
    EXPECT_EQ(Ticks(), 2);
}

TEST_F(CaptureTaskThread, TracesItsRateItsStartAndItsEnd) {
    ASSERT_EQ(worker->CreateCaptureThread(TickTarget::Tick, &target, 30), 0);
    EXPECT_EQ(
        trace.Lines(),
        (Lines{TimerLine(30), Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Start,[CheckPoint]")}));
    trace.Clear();
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    EXPECT_EQ(trace.Lines(),
              Lines{Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]")});
}

TEST_F(CaptureTaskThread, TracesItsStartEvenWhenItCouldNotStart) {
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(worker->CreateCaptureThread(TickTarget::Tick, &target, 30), -1);
    }
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_TRUE(IsLineAt(lines[0],
                         Error("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Create fail,[CheckPoint]"),
                         FILE_PATH));
    EXPECT_EQ(lines[1], Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]"));
    EXPECT_EQ(lines[2], Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Start,[CheckPoint]"));
}

TEST_F(CaptureTaskThread, SetsTheTimerAnewForANewRate) {
    Start(5);
    Advance(150ms);
    worker->SetFps(10);
    Settle(*worker);
    EXPECT_EQ(trace.Lines(), Lines{TimerLine(10)});
    Advance(99999us);
    EXPECT_EQ(Ticks(), 0) << "the old timer still ticks";
    Advance(1us);
    EXPECT_EQ(Ticks(), 1);
    Advance(100ms);
    EXPECT_EQ(Ticks(), 2);
}

TEST_F(CaptureTaskThread, LeavesTheTimerAloneForTheRateThatItHas) {
    Start(5);
    Advance(150ms);
    worker->SetFps(5);
    Settle(*worker);
    EXPECT_EQ(trace.Lines(), Lines{});
    Advance(50ms);
    EXPECT_EQ(Ticks(), 1) << "the phase was lost";
}

TEST_F(CaptureTaskThread, SetsTheTimerAtOnceWhenTheRateChangesInsideATick) {
    target.during = [&] { worker->SetFps(10); };
    Start(5);
    Advance(200ms);
    EXPECT_EQ(Ticks(), 1);
    Advance(100ms);
    EXPECT_EQ(Ticks(), 2);
}

TEST_F(CaptureTaskThread, TracesARateThatNoTimerCanKeepAndTicksNoMore) {
    Start(5);
    worker->SetFps(1000001);
    Settle(*worker);
    const Lines lines = trace.Lines();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0], TimerLine(1000001));
    EXPECT_TRUE(IsLineAt(
        lines[1], Error("[CShareCaptureEngine::_InitCaptureTimer]>>fail craete timer , ScheduleTimer fail"),
        FILE_PATH));
    Advance(10s);
    EXPECT_EQ(Ticks(), 0);
}

TEST_F(CaptureTaskThread, HasNeitherTimerNorQueuesWithoutSomethingToCall) {
    ASSERT_EQ(worker->CreateCaptureThread(TickTarget::Tick, nullptr, 5), 0);
    EXPECT_EQ(worker->GetEventQueue(), nullptr);
    EXPECT_EQ(worker->GetTimerQueue(), nullptr);
    EXPECT_FALSE(trace.Contains("_InitCaptureTimer"));
    bool ran = false;
    EXPECT_EQ(worker->async([&] {
        ran = true;
        return 0u;
    }),
              0);
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    EXPECT_FALSE(ran) << "a function is dropped without a word where there is no queue";

    const auto other = std::make_shared<CScreenCaptureTaskThread>();
    ASSERT_EQ(other->CreateCaptureThread(nullptr, &target, 5), 0);
    EXPECT_EQ(other->GetTimerQueue(), nullptr);
    EXPECT_EQ(other->DestroyCaptureThread(), 0);
}

TEST_F(CaptureTaskThread, TracesATimerThatHasNoQueue) {
    // The only moment on the worker without a queue: the end of one that never got any.
    worker->SetThreadExit([this] { worker->SetFps(7); });
    ASSERT_EQ(worker->CreateCaptureThread(nullptr, nullptr, 5), 0);
    trace.Clear();
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    const Lines lines = trace.LinesContaining("_InitCaptureTimer");
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_EQ(lines[0], TimerLine(7));
    EXPECT_TRUE(IsLineAt(
        lines[1], Error("[CShareCaptureEngine::_InitCaptureTimer]>>fail craete timer , pTimerQueue is NULL"),
        FILE_PATH));
}

TEST_F(CaptureTaskThread, RunsPostedFunctionsInOrderOnItself) {
    Start(5);
    std::vector<int> order;
    CmThreadId ranOn = 0;
    for (int i = 0; i < 3; ++i) {
        EXPECT_EQ(worker->async([&, i] {
            order.push_back(i);
            ranOn = GetThreadSelfId();
            return 99u;
        }),
                  0);
    }
    EXPECT_EQ(worker->async(nullptr), 0);
    Settle(*worker);
    EXPECT_EQ(order, (std::vector<int>{0, 1, 2}));
    EXPECT_EQ(ranOn, worker->GetThreadId());
}

TEST_F(CaptureTaskThread, RunsAFunctionAtOnceWhenItIsPostedFromItself) {
    Start(5);
    std::vector<std::string> order;
    Send(*worker, [&] {
        EXPECT_EQ(worker->async([&] {
            order.push_back("posted");
            return 0u;
        }),
                  0);
        EXPECT_EQ(worker->async(nullptr), 0);
        order.push_back("behind");
    });
    EXPECT_EQ(order, (Lines{"posted", "behind"}));
}

TEST_F(CaptureTaskThread, NeverRunsAFunctionBesideATick) {
    CGate gate;
    CTally inside;
    bool inTick = false;
    bool besideTick = false;
    target.during = [&] {
        inTick = true;
        inside.Add();
        EXPECT_TRUE(gate.Passes());
        inTick = false;
    };
    Start(5);
    clock->Advance(200ms);
    ASSERT_TRUE(inside.Reaches(1));
    worker->async([&] {
        besideTick = inTick;
        return 0u;
    });
    gate.Open();
    Settle(*worker);
    EXPECT_FALSE(besideTick);
    EXPECT_EQ(Ticks(), 1);
}

TEST_F(CaptureTaskThread, CallsNothingOnceItIsDestroyed) {
    Start(5);
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    worker->CaptureProcess();
    clock->Advance(10s);
    EXPECT_EQ(Ticks(), 0);
    EXPECT_EQ(worker->async([] { return 0u; }), -1) << "a function that never runs is not accepted";
}

TEST_F(CaptureTaskThread, MayBeDestroyedTwice) {
    Start(5);
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    EXPECT_EQ(trace.CountContaining(">>Destroy,[CheckPoint]"), 2u);
}

TEST_F(CaptureTaskThread, TicksOutOfTurnOnWhateverThreadAsks) {
    Start(5);
    worker->CaptureProcess();
    EXPECT_EQ(Ticks(), 1);
    EXPECT_EQ(target.thread, GetThreadSelfId());
}

TEST_F(CaptureTaskThread, IsNotDestroyedWhileItTicksOnWhateverThread) {
    CGate gate;
    CTally inside;
    target.during = [&] {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    };
    Start(5);
    const CCallOnThread tick([&] { worker->CaptureProcess(); });
    ASSERT_TRUE(inside.Reaches(1));
    const CCallOnThread destroy([&] {
        EXPECT_EQ(worker->DestroyCaptureThread(), 0);
        EXPECT_EQ(Ticks(), 1) << "the tick was not over";
    });
    destroy.UntilItWaits();
    EXPECT_FALSE(destroy.HasReturned());
    gate.Open();
}

TEST_F(CaptureTaskThread, RunsItsExitFunctionOnItselfBehindEverythingElse) {
    std::vector<std::string> order;
    CmThreadId exitedOn = 0;
    worker->SetThreadExit([&] {
        order.push_back("exit");
        exitedOn = GetThreadSelfId();
    });
    Start(5);
    const CmThreadId id = worker->GetThreadId();
    worker->async([&] {
        order.push_back("function");
        return 0u;
    });
    EXPECT_EQ(worker->DestroyCaptureThread(), 0);
    EXPECT_EQ(order, (Lines{"function", "exit"}));
    EXPECT_EQ(exitedOn, id);
}

TEST_F(CaptureTaskThread, OutlivesATickAndAFunctionThatThrow) {
    bool first = true;
    target.during = [&] {
        if (std::exchange(first, false))
            throw std::runtime_error("tick");
    };
    Start(5);
    Advance(200ms);
    EXPECT_EQ(Ticks(), 0);
    worker->async([]() -> unsigned { throw std::runtime_error("function"); });
    Advance(200ms);
    EXPECT_EQ(Ticks(), 1);
    EXPECT_EQ(trace.CountContaining("ERROR: "), 2u);
}
