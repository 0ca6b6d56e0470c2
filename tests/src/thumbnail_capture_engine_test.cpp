// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include "tests/src/thumbnail_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <array>
#include <functional>
#include <memory>
#include <stdexcept>
#include <string>
#include <vector>

// Jobs: what is taken, in which order it runs, how it ends, and who hears of it.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned HELD = 9;

std::string Named(const std::string& text, const ThumbnailCallback* callback) {
    char pointer[32];
    CCmTextFormator out(pointer, sizeof pointer);
    out << static_cast<const void*>(callback);
    return Info("CThumbnailCaptureEngine::" + text + pointer);
}

class ThumbnailEngine : public testing::Test {
protected:
    /// Comes back when the worker is in the middle of a capture, which lasts until `held` is released.
    void Occupy() {
        plan.capture = [this](unsigned id) { return held(id); };
        ASSERT_TRUE(engine->RequestWindows({HELD}, occupant));
        ASSERT_TRUE(held.IsReached());
    }
    bool IsIdleAfter(int runs) { return plan.ended.Reaches(runs); }

    ThumbnailPlan plan;
    CHeldCapture held{HELD};
    CThumbnailLog occupant;
    std::unique_ptr<CPlannedEngine> engine = std::make_unique<CPlannedEngine>(plan);
};

} // namespace

// ---- Requests

TEST_F(ThumbnailEngine, TellsEachWindowInTheOrderAskedForAndWhichIsTheLast) {
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({3, 1, 3}, log));
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 3 3x1", "window 1 1x1", "window 3 3x1 last"}));
}

TEST_F(ThumbnailEngine, CapturesApplicationsAsSuch) {
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestApps({8, 5}, log));
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"app 8 8x2", "app 5 5x2 last"}));
}

TEST_F(ThumbnailEngine, RefusesWhatAsksForNothingOrTellsNobody) {
    CThumbnailLog log;
    const unsigned id = 1;
    EXPECT_FALSE(engine->requestForWindows(nullptr, 0, &log));
    EXPECT_FALSE(engine->requestForWindows(nullptr, 1, &log));
    EXPECT_FALSE(engine->requestForWindows(&id, 0, &log));
    EXPECT_FALSE(engine->requestForWindows(&id, -1, &log));
    EXPECT_FALSE(engine->requestForWindows(&id, 1, nullptr));
    EXPECT_FALSE(engine->requestForApps(&id, -1, &log));
    EXPECT_FALSE(engine->requestForApps(nullptr, -1, &log));
    EXPECT_FALSE(engine->requestForApps(&id, 1, nullptr));
    EXPECT_FALSE(engine->requestForApps(nullptr, 0, nullptr));
    EXPECT_FALSE(engine->request(nullptr));
    EXPECT_EQ(plan.made.Count(), 0) << "no worker";
    EXPECT_EQ(log.calls.Count(), 0);
}

TEST_F(ThumbnailEngine, TracesARequestFromItsBeginningToTheWorkersEnd) {
    CThumbnailLog log;
    const CTraceLog trace;
    EXPECT_TRUE(engine->RequestWindows({1, 2}, log));
    ASSERT_TRUE(trace.WaitUntilContains("thread exit"));
    EXPECT_EQ(trace.Lines(),
              (Lines{Info("CThumbnailCaptureEngine::requestForWindows, count=2"), Named("cancel, cb=", &log),
                     Info("CThumbnailCaptureEngine::launch, try to launch thread"),
                     Info("CThumbnailCaptureEngine::run, thread started"),
                     Info("CThumbnailCaptureEngine::run, thread exit...")}));
}

TEST_F(ThumbnailEngine, TracesWhatIsAskedForEvenWhenItIsRefused) {
    const CTraceLog trace;
    EXPECT_FALSE(engine->request(nullptr));
    EXPECT_FALSE(engine->requestForApps(nullptr, 5, nullptr));
    EXPECT_FALSE(engine->requestForWindows(nullptr, 7, nullptr));
    EXPECT_EQ(trace.Lines(), (Lines{Info("CThumbnailCaptureEngine::request, cb=0x0"),
                                    Info("CThumbnailCaptureEngine::requestForApps, count=5"),
                                    Info("CThumbnailCaptureEngine::requestForWindows, count=7")}));
}

// ---- The worker

TEST_F(ThumbnailEngine, KeepsNothingBetweenRunsOfTheWorker) {
    CThumbnailLog log;
    for (int run = 1; run <= 3; ++run) {
        EXPECT_TRUE(engine->RequestWindows({1}, log));
        ASSERT_TRUE(IsIdleAfter(run));
        EXPECT_EQ(plan.made.Count(), run);
        EXPECT_EQ(plan.stopped.Count(), run);
    }
    EXPECT_EQ(log.lasts.Count(), 3);
}

TEST_F(ThumbnailEngine, HasNoThreadWhenThereIsNoWorkAndAfterStop) {
    const auto threads = CountThreadsOfProcess();
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1}, log));
    ASSERT_TRUE(log.lasts.Reaches(1));
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    Occupy();
    EXPECT_EQ(CountThreadsOfProcess(), threads + 1);
    held.Release();
    engine->stop();
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST_F(ThumbnailEngine, RefusesARequestWhenNoThreadCanBeStartedAndTakesTheNext) {
    CThumbnailLog log;
    {
        const CNoNewThreadsScope none;
        const CTraceLog trace;
        EXPECT_FALSE(engine->RequestWindows({1}, log));
        ASSERT_EQ(trace.Lines().size(), 4u);
        EXPECT_NE(trace.Lines().back().find("thread constructor failed"), std::string::npos);
    }
    CThumbnailLog other;
    EXPECT_TRUE(engine->RequestWindows({2}, other));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(other.lasts.Count(), 1);
    EXPECT_EQ(log.calls.Count(), 0) << "a refused request has run";
}

// ---- Order

TEST_F(ThumbnailEngine, RunsOnlyTheSecondOfTwoRequestsThatWait) {
    Occupy();
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1, 2}, log));
    EXPECT_TRUE(engine->RequestWindows({3}, log));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"window 3 3x1 last"});
    EXPECT_EQ(occupant.Calls(), ThumbnailCalls{"window 9 9x1 last"});
}

TEST_F(ThumbnailEngine, EndsTheRunningJobForANewRequestOfItsCallback) {
    Occupy();
    const CTraceLog trace;
    EXPECT_TRUE(engine->RequestWindows({4, 5}, occupant));
    EXPECT_EQ(trace.Lines(), (Lines{Info("CThumbnailCaptureEngine::requestForWindows, count=2"),
                                    Named("cancel, is running, cb=", &occupant)}));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(occupant.Calls(), (ThumbnailCalls{"window 4 4x1", "window 5 5x1 last"}));
}

TEST_F(ThumbnailEngine, RunsTheCallbackOfTheLowestAddressFirst) {
    Occupy();
    std::mutex mutex;
    std::vector<int> order;
    const auto note = [&](int number) {
        return [&order, &mutex, number](std::size_t) {
            const std::lock_guard<std::mutex> lock(mutex);
            order.push_back(number);
            return true;
        };
    };
    struct Callbacks {
        CThumbnailLog first;
        CThumbnailLog second;
        CThumbnailLog third;
    } callbacks{CThumbnailLog(note(1)), CThumbnailLog(note(2)), CThumbnailLog(note(3))};
    EXPECT_TRUE(engine->RequestWindows({1}, callbacks.third));
    EXPECT_TRUE(engine->RequestWindows({1}, callbacks.first));
    EXPECT_TRUE(engine->RequestWindows({1}, callbacks.second));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(order, (std::vector<int>{1, 2, 3}));
}

// ---- Ends and failures

TEST_F(ThumbnailEngine, EndsOnlyTheJobWhoseCallbackHasHadEnough) {
    Occupy();
    CThumbnailLog sated([](std::size_t count) { return count < 2; });
    CThumbnailLog other;
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, sated));
    EXPECT_TRUE(engine->RequestWindows({1, 2}, other));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(sated.Calls(), (ThumbnailCalls{"window 1 1x1", "window 2 2x1"}));
    EXPECT_EQ(other.Calls(), (ThumbnailCalls{"window 1 1x1", "window 2 2x1 last"}));
}

TEST_F(ThumbnailEngine, GoesOnBehindAFailureAndTellsTheLastItemEvenIfItFails) {
    plan.capture = [](unsigned id) { return id == 2; };
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, log));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 failed", "window 2 2x1", "window 3 failed last"}));
}

TEST_F(ThumbnailEngine, TakesACaptureThatThrowsForOneThatFailed) {
    plan.capture = [](unsigned id) { return id != 1 ? true : throw std::runtime_error("no room"); };
    CThumbnailLog log;
    const CTraceLog trace;
    EXPECT_TRUE(engine->RequestWindows({1, 2}, log));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 failed", "window 2 2x1 last"}));
    EXPECT_TRUE(trace.Contains("no room"));
}

TEST_F(ThumbnailEngine, EndsTheJobOfACallbackThatThrowsAndRunsTheOthers) {
    Occupy();
    CThumbnailLog wild([](std::size_t) -> bool { throw std::runtime_error("wild"); });
    CThumbnailLog other;
    EXPECT_TRUE(engine->RequestWindows({1, 2}, wild));
    EXPECT_TRUE(engine->RequestWindows({1, 2}, other));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(wild.Calls(), ThumbnailCalls{"window 1 1x1"});
    EXPECT_EQ(other.Calls(), (ThumbnailCalls{"window 1 1x1", "window 2 2x1 last"}));
    engine->cancel(&other); // the mutex is free
}

// ---- When nothing can be captured

TEST_F(ThumbnailEngine, TellsEachThatWaitsThatThereAreNoThumbnails) {
    CGate gate;
    plan.init = [&gate] { return !gate.Passes(); };
    std::array<CThumbnailLog, 2> logs;
    const CTraceLog trace;
    EXPECT_TRUE(engine->RequestWindows({1, 2}, logs[1]));
    EXPECT_TRUE(engine->RequestWindows({1, 2}, logs[0]));
    gate.Open();
    ASSERT_TRUE(IsIdleAfter(1));
    for (const CThumbnailLog& log : logs)
        EXPECT_EQ(log.Calls(), ThumbnailCalls{"error -1"});
    EXPECT_EQ(trace.Lines().back(), Info("CThumbnailCaptureEngine::run 0, thread exit..."));
    EXPECT_EQ(plan.stopped.Count(), 0);
}

TEST_F(ThumbnailEngine, TakesACapturerThatThrowsForOneThatCannotStart) {
    plan.init = []() -> bool { throw std::runtime_error("no server"); };
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1}, log));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"error -1"});
}

TEST_F(ThumbnailEngine, LetsARequestMadeOnAnErrorWaitForTheNextOne) {
    std::atomic<bool> isBroken{true};
    plan.init = [&isBroken] { return !isBroken; };
    CThumbnailLog stubborn([this, &stubborn, &isBroken](std::size_t) {
        if (isBroken) {
            EXPECT_TRUE(engine->RequestWindows({7}, stubborn));
        }
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1}, stubborn));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(stubborn.Calls(), ThumbnailCalls{"error -1"});
    EXPECT_EQ(plan.made.Count(), 1) << "nobody has asked since";
    isBroken = false;
    CThumbnailLog other;
    EXPECT_TRUE(engine->RequestWindows({2}, other));
    ASSERT_TRUE(IsIdleAfter(2));
    EXPECT_EQ(stubborn.Calls(), (ThumbnailCalls{"error -1", "window 7 7x1 last"}));
    EXPECT_EQ(other.Calls(), ThumbnailCalls{"window 2 2x1 last"});
}

TEST_F(ThumbnailEngine, TellsNoErrorToACallbackThatAnotherOneHasCancelledOnItsOwn) {
    CGate gate;
    plan.init = [&gate] { return !gate.Passes(); };
    std::array<std::unique_ptr<CThumbnailLog>, 2> logs;
    const auto endOther = [this, &logs](std::size_t self) {
        return [this, &logs, self](std::size_t) {
            std::unique_ptr<CThumbnailLog>& other = logs[1 - self];
            engine->cancel(other.get());
            other.reset();
            return true;
        };
    };
    logs[0] = std::make_unique<CThumbnailLog>(endOther(0));
    logs[1] = std::make_unique<CThumbnailLog>(endOther(1));
    for (const auto& log : logs)
        EXPECT_TRUE(engine->RequestWindows({1}, *log));
    gate.Open();
    ASSERT_TRUE(IsIdleAfter(1));
    ASSERT_NE(logs[0] == nullptr, logs[1] == nullptr) << "exactly one has heard of it";
    EXPECT_EQ((logs[0] ? logs[0] : logs[1])->Calls(), ThumbnailCalls{"error -1"});
}
