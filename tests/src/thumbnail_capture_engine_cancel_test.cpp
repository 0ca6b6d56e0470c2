// SPDX-License-Identifier: Apache-2.0
#include "src/thumbnail_capture_engine.h"

#include "tests/src/thumbnail_tools.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <atomic>
#include <memory>
#include <string>
#include <vector>

// Cancelling and stopping, also from inside a callback.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned HELD = 9;

std::string CancelLine(const char* text, const ThumbnailCallback* callback) {
    char pointer[32];
    CCmTextFormator out(pointer, sizeof pointer);
    out << static_cast<const void*>(callback);
    return Info("CThumbnailCaptureEngine::cancel, " + std::string(text) + pointer);
}

class ThumbnailCancel : public testing::Test {
protected:
    /// Comes back when the worker is in the middle of the first of three captures.
    void Occupy() {
        plan.capture = [this](unsigned id) { return held(id); };
        ASSERT_TRUE(engine->RequestWindows({HELD, 1, 2}, *occupant));
        ASSERT_TRUE(held.IsReached());
    }
    bool IsIdleAfter(int runs) { return plan.ended.Reaches(runs); }

    ThumbnailPlan plan;
    CHeldCapture held{HELD};
    std::unique_ptr<CThumbnailLog> occupant = std::make_unique<CThumbnailLog>();
    std::unique_ptr<CPlannedEngine> engine = std::make_unique<CPlannedEngine>(plan);
};

} // namespace

TEST_F(ThumbnailCancel, ReturnsDuringACaptureAndLetsTheCallbackBeDestroyed) {
    Occupy();
    const CTraceLog trace;
    engine->cancel(occupant.get());
    EXPECT_EQ(trace.Lines(), Lines{CancelLine("is running, cb=", occupant.get())});
    EXPECT_EQ(occupant->calls.Count(), 0);
    occupant.reset();
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
}

TEST_F(ThumbnailCancel, NeverTellsALastItem) {
    Occupy();
    CThumbnailLog log([this, &log](std::size_t count) {
        if (count == 2)
            engine->cancel(&log);
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, log));
    engine->cancel(occupant.get());
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(occupant->Calls(), ThumbnailCalls{});
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 1x1", "window 2 2x1"}));
}

TEST_F(ThumbnailCancel, DropsAJobThatWaits) {
    Occupy();
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1}, log));
    const CTraceLog trace;
    engine->cancel(&log);
    EXPECT_EQ(trace.Lines(), Lines{CancelLine("cb=", &log)});
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.calls.Count(), 0);
    EXPECT_EQ(occupant->lasts.Count(), 1) << "another one's job has ended with it";
}

TEST_F(ThumbnailCancel, ChangesNothingForAnUnknownCallback) {
    Occupy();
    CThumbnailLog unknown;
    engine->cancel(&unknown);
    engine->cancel(nullptr);
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(occupant->Calls(), (ThumbnailCalls{"window 9 9x1", "window 1 1x1", "window 2 2x1 last"}));
}

TEST_F(ThumbnailCancel, ActsOnTheJobOfThatMomentOnly) {
    Occupy();
    engine->cancel(occupant.get());
    EXPECT_TRUE(engine->RequestWindows({4}, *occupant));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(occupant->Calls(), ThumbnailCalls{"window 4 4x1 last"});
}

TEST_F(ThumbnailCancel, WaitsForACallUnderWay) {
    CTally entered;
    CGate gate;
    CThumbnailLog log([&](std::size_t) {
        entered.Add();
        return gate.Passes();
    });
    EXPECT_TRUE(engine->RequestWindows({1, 2}, log));
    ASSERT_TRUE(entered.Reaches(1));
    {
        const CCallOnThread cancelling([&] { engine->cancel(&log); });
        cancelling.UntilItWaits();
        EXPECT_FALSE(cancelling.HasReturned());
        gate.Open();
    }
    const int calls = log.calls.Count();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.calls.Count(), calls);
}

// ---- From inside a call

TEST_F(ThumbnailCancel, LetsACallbackCancelAndDestroyItself) {
    CThumbnailLog* log = nullptr;
    log = new CThumbnailLog([this, &log](std::size_t) {
        engine->cancel(log);
        delete log;
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, *log));
    ASSERT_TRUE(IsIdleAfter(1));
}

TEST_F(ThumbnailCancel, LetsACallbackRequestAnew) {
    CThumbnailLog log([this, &log](std::size_t count) {
        if (count == 1) {
            EXPECT_TRUE(engine->RequestApps({5}, log));
        }
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, log));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), (ThumbnailCalls{"window 1 1x1", "app 5 5x2 last"}));
    EXPECT_EQ(plan.made.Count(), 1) << "the worker was there";
}

TEST_F(ThumbnailCancel, LetsACallbackEndAnotherOne) {
    Occupy();
    auto first = std::make_unique<CThumbnailLog>();
    EXPECT_TRUE(engine->RequestWindows({1}, *first));
    // The occupant's job is replaced by one that ends the other one, whichever of both runs first.
    CThumbnailLog ending([&](std::size_t) {
        engine->cancel(first.get());
        first.reset();
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1}, ending));
    held.Release();
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(ending.Calls(), ThumbnailCalls{"window 1 1x1 last"});
    EXPECT_EQ(first, nullptr);
}

// ---- Stop

TEST_F(ThumbnailCancel, StopsTheRunningJobAndNeverRunsTheOthers) {
    Occupy();
    CThumbnailLog log;
    EXPECT_TRUE(engine->RequestWindows({1}, log));
    {
        const CTraceLog trace;
        const CCallOnThread stopping([this] { engine->stop(); });
        stopping.UntilItWaits();
        EXPECT_FALSE(stopping.HasReturned()) << "the worker is in a capture";
        EXPECT_EQ(trace.Lines(), Lines{Info("CThumbnailCaptureEngine::stop")});
        held.Release();
    }
    EXPECT_EQ(plan.ended.Count(), 1) << "the worker is not gone";
    EXPECT_EQ(plan.stopped.Count(), 1);
    EXPECT_EQ(occupant->calls.Count(), 0);
    EXPECT_EQ(log.calls.Count(), 0);
}

TEST_F(ThumbnailCancel, TakesNoRequestAfterStop) {
    engine->stop();
    CThumbnailLog log;
    const unsigned id = 1;
    EXPECT_FALSE(engine->requestForWindows(&id, 1, &log));
    EXPECT_FALSE(engine->requestForApps(&id, 1, &log));
    EXPECT_FALSE(engine->request(&log));
    engine->cancel(&log);
    EXPECT_EQ(plan.made.Count(), 0);
}

TEST_F(ThumbnailCancel, StopsFromInsideACallWithoutWaitingForItself) {
    const auto threads = CountThreadsOfProcess();
    CThumbnailLog log([this](std::size_t) {
        engine->stop();
        return true;
    });
    EXPECT_TRUE(engine->RequestWindows({1, 2, 3}, log));
    ASSERT_TRUE(IsIdleAfter(1));
    EXPECT_EQ(log.Calls(), ThumbnailCalls{"window 1 1x1"});
    engine->stop();
    EXPECT_TRUE(ThreadsComeDownTo(threads));
}

TEST_F(ThumbnailCancel, StopsOnItsDestructionWhatIsUnderWay) {
    Occupy();
    const CTraceLog trace;
    {
        const CCallOnThread destroying([this] { engine.reset(); });
        destroying.UntilItWaits();
        held.Release();
    }
    EXPECT_EQ(plan.ended.Count(), 1);
    EXPECT_EQ(occupant->calls.Count(), 0);
    EXPECT_EQ(trace.CountContaining("CThumbnailCaptureEngine::stop"), 1u);
}
