// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

// What runs where: at once on the caller before Start, between two passes on the worker after it.

TEST(RunOnCaptureThread, GivesTheRealResultBeforeStart) {
    CEngineBench<> bench;
    const CmThreadId self = GetThreadSelfId();
    CmThreadId ranOn = 0;
    EXPECT_EQ(bench.engine->RunOnCaptureThread([&] {
        ranOn = GetThreadSelfId();
        return 17u;
    }),
              17);
    EXPECT_EQ(ranOn, self);
}

TEST(RunOnCaptureThread, RefusesAnEmptyFunctionWhereItWouldRunInline) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->RunOnCaptureThread({}), -1);
    bench.Start();
    EXPECT_EQ(bench.engine->RunOnCaptureThread({}), 0);
    Settle(*bench.engine->_GetWorker());
}

TEST(RunOnCaptureThread, GivesZeroAtOnceAfterStartAndRunsOnTheWorker) {
    CEngineBench<> bench;
    bench.Start();
    CmThreadId ranOn = 0;
    EXPECT_EQ(bench.engine->RunOnCaptureThread([&] {
        ranOn = GetThreadSelfId();
        return 17u;
    }),
              0);
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(ranOn, bench.engine->_GetWorker()->GetThreadId());
}

TEST(RunOnCaptureThread, RunsInlineInsideAPassAndGivesTheRealResult) {
    CEngineBench<> bench;
    bench.Start();
    int result = 0;
    bench.sink.SetFrameHook(
        [&](IShareFrame*) { result = bench.engine->RunOnCaptureThread([] { return 17u; }); });
    bench.Tick();
    EXPECT_EQ(result, 17);
}

TEST(RunOnCaptureThread, ContainsAnException) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->RunOnCaptureThread([]() -> unsigned { throw std::runtime_error("no"); }), -1);
    EXPECT_TRUE(bench.trace.Contains("[CShareCaptureEngine::RunOnCaptureThread]>>fail>>no"));
}

TEST(RunOnCaptureThread, RunsWhatItAcceptedBeforeStopAndRefusesWhatComesLater) {
    CEngineBench<> bench;
    bench.Start();
    const std::shared_ptr<CScreenCaptureTaskThread> worker = bench.engine->_GetWorker();
    CGate inCapture;
    CGate goOn;
    bench.capturer.SetHook([&](IShareFrame*) {
        inCapture.Open();
        EXPECT_TRUE(goOn.Passes());
    });
    bench.Advance(200);
    ASSERT_TRUE(inCapture.Passes());
    int ran = 0;
    EXPECT_EQ(bench.engine->RunOnCaptureThread([&] { return static_cast<unsigned>(++ran); }), 0);
    goOn.Open();
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(ran, 1);
    EXPECT_EQ(worker->async([&] { return static_cast<unsigned>(++ran); }), -1);
    EXPECT_EQ(ran, 1);
}

TEST(FireCaptureEvent, RunsOnePassOutOfTurn) {
    CEngineBench<> bench;
    bench.engine->_FireCaptureEvent();
    EXPECT_EQ(bench.calls.CountStarting("Capture"), 0u);
    bench.Start();
    bench.engine->_FireCaptureEvent();
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(SetCaptureFps, RunsInlineBeforeStartWithTheCapturersResult) {
    CEngineBench<> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.controlResult = -5; });
    EXPECT_EQ(bench.engine->SetCaptureFps(10), -5);
    EXPECT_EQ(bench.engine->m_spShareCapturerContext->GetCaptureFps(), 10);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.controlResult = 0; });
    EXPECT_EQ(bench.engine->SetCaptureFps(11), 0);
}

TEST(SetCaptureFps, TakesEffectBetweenPassesAfterStart) {
    CEngineBench<> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.controlResult = -5; });
    bench.Start();
    EXPECT_EQ(bench.engine->SetCaptureFps(10), 0);
    Settle(*bench.engine->_GetWorker());
    bench.Advance(100);
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(SetCaptureFps, KeepsTheOldRateForZero) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetCaptureFps(0), 0);
    EXPECT_EQ(bench.engine->m_spShareCapturerContext->GetCaptureFps(), 5);
    EXPECT_EQ(bench.calls.Count("SetFPS 5"), 1u);
}

TEST(SetCaptureFps, NeedsACapturer) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    EXPECT_EQ(bench.engine->SetCaptureFps(10), -4);
    EXPECT_EQ(bench.engine->m_spShareCapturerContext->GetCaptureFps(), 5);
}
