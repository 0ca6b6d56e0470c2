// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

/// What Start looks for, sets up, clears and keeps, and what a failed one leaves behind.

namespace {

using Lines = std::vector<std::string>;

const std::string IMPL = "src/share_capture_engine_impl";
const std::string THREADS = "src/share_capture_engine_threads";
const std::string TASK_THREAD = "src/share_capture_task_thread";

template <class Bench>
void ExpectRefused(Bench& bench, int code, const std::string& reason) {
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.Forget();
    EXPECT_EQ(bench.engine->Start(), code);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
    EXPECT_EQ(bench.engine->_GetWorker(), nullptr);
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_TRUE(IsLineAt(lines[0], Error(reason), IMPL));
    EXPECT_TRUE(IsLineAt(lines[1], Error("[CShareCaptureEngine::Start]>>fail>>>Init fail"), IMPL));
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{});
    EXPECT_EQ(bench.calls.Count("capturer AddSink"), 0u);
    EXPECT_EQ(bench.calls.Count("pointing AddSink"), 0u);
}

std::string WithoutSource(int kind, int count) {
    return "[CShareCaptureEngine::Start]>>fail>>without screen source, m_eSHARE_CAPTURE_ENGINE_TYPE=" +
           std::to_string(kind) + ",count = " + std::to_string(count);
}

template <class Bench>
void ExpectStarts(Bench& bench) {
    EXPECT_EQ(bench.engine->Start(), 0);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
    EXPECT_EQ(bench.capturer.Sink(), bench.engine);
}

const std::string NO_CAPTURER = "[CShareCaptureEngine::_Init]>>fail>>pIShareCapturer is NULL";

} // namespace

TEST(ShareCaptureEngineStart, RefusesWithoutAnExternalCapturer) {
    CEngineBench<> bench(true);
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    ExpectRefused(bench, -4, NO_CAPTURER);
}

TEST(ShareCaptureEngineStart, RefusesEachKindWithoutItsOwnCapturer) {
    CEngineBench<CShareCaptureDesktopEngine> desktop;
    desktop.engine->GiveOwnCapturer(nullptr);
    ExpectRefused(desktop, -4, NO_CAPTURER);
}

TEST(ShareCaptureEngineStart, RefusesAnApplicationOrWindowEngineWithoutItsOwnCapturer) {
    {
        CEngineBench<CShareCaptureAppEngine> app;
        app.engine->GiveOwnCapturer(nullptr);
        ExpectRefused(app, -4, NO_CAPTURER);
    }
    CEngineBench<CShareCaptureWindowEngine> window;
    window.engine->GiveOwnCapturer(nullptr);
    ExpectRefused(window, -4, NO_CAPTURER);
}

TEST(ShareCaptureEngineStart, IgnoresAnExternalCapturerOnAnotherKind) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.engine->GiveOwnCapturer(nullptr);
    bench.engine->m_pIShareCapturerExternal = &bench.capturer;
    ExpectRefused(bench, -4, NO_CAPTURER);
    bench.engine->m_pIShareCapturerExternal = nullptr;
}

TEST(ShareCaptureEngineStart, FindsNothingToShareOnAKindThatIsNone) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourceCount = 2; });
    bench.engine->m_eSHARE_CAPTURE_ENGINE_TYPE = static_cast<SHARE_CAPTURE_ENGINE_TYPE>(0);
    ExpectRefused(bench, -6, WithoutSource(0, 2));
}

TEST(ShareCaptureEngineStart, WantsASourceOrADisplayOnADesktopEngine) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    ExpectRefused(bench, -6, WithoutSource(2, 0));
}

TEST(ShareCaptureEngineStart, IsContentWithASourceOnADesktopEngine) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourceCount = 1; });
    ExpectStarts(bench);
}

TEST(ShareCaptureEngineStart, IsContentWithADisplayOnADesktopEngine) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.display = 0; });
    ExpectStarts(bench);
}

TEST(ShareCaptureEngineStart, WantsASourceOrAnApplicationOnAnApplicationEngine) {
    CEngineBench<CShareCaptureAppEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.display = 1; });
    ExpectRefused(bench, -6, WithoutSource(3, 0));
}

TEST(ShareCaptureEngineStart, IsContentWithASourceOnAnApplicationEngine) {
    CEngineBench<CShareCaptureAppEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourceCount = 1; });
    ExpectStarts(bench);
}

TEST(ShareCaptureEngineStart, WantsAWindowOnAWindowEngineWhateverSourcesThereAre) {
    CEngineBench<CShareCaptureWindowEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.sourceCount = 1;
        answers.display = 1;
    });
    ExpectRefused(bench, -6, WithoutSource(4, 1));
}

TEST(ShareCaptureEngineStart, LooksNeitherAtSourcesNorAtDisplaysOfAnExternalCapturer) {
    CEngineBench<> bench;
    ExpectStarts(bench);
    EXPECT_EQ(bench.calls.Count("GetCurrentCaptureDisplayId"), 0u);
}

TEST(ShareCaptureEngineStart, PutsItselfIntoCapturerAndPointerBeforeTheWorkerRuns) {
    CEngineBench<> bench(true);
    EXPECT_EQ(bench.engine->Start(), 0);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"capturer AddSink", "pointing AddSink", "pointing Start"}));
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"capturer AddSink", "pointing AddSink", "pointing Start",
                                          "capturer RemoveSink", "pointing RemoveSink", "pointing Stop"}));
}

TEST(ShareCaptureEngineStart, GoesOnWithoutAPointingObjectAfterATrace) {
    CEngineBench<> bench;
    bench.engine->GivePointing(nullptr);
    bench.Forget();
    EXPECT_EQ(bench.engine->Start(), 0);
    const Lines lines = bench.trace.LinesContaining("m_pISharePointing");
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0], Error("[CShareCaptureEngine::_Init]>>m_pISharePointing is NULL"), IMPL));
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STARTED);
}

TEST(ShareCaptureEngineStart, TracesTheWayOfAGoodRun) {
    CEngineBench<> bench(true);
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.Forget();
    EXPECT_EQ(bench.engine->Start(), 0);
    bench.SettleEvents();
    EXPECT_EQ(bench.trace.Lines(),
              (Lines{Info("[CShareCaptureEngine::_InitCaptureTimer]>>current  nFps=5"),
                     Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Start,[CheckPoint]"),
                     Info("[CShareCaptureEngine::_CreateCaptureThread]>>sucess"),
                     Info("[CShareCaptureEngine::OnCaptureStatusChanged]>> status=1")}));
    bench.trace.Clear();
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.trace.Lines(),
              (Lines{Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]"),
                     Info("[CShareCaptureEngine::_DestroyCaptureThread]"),
                     Info("[CShareCaptureEngine::OnCaptureStatusChanged]>> status=2")}));
}

TEST(ShareCaptureEngineStart, ClearsWhatBelongsToTheFormerRun) {
    CEngineBench<> bench;
    SHARE_CAPTURE_STATISTIC before{1, 2, 3, 4, 5, 6, 7, 8, 9, SCREEN_CAPTURER_TYPE_DEFAULT};
    bench.engine->OnCaptureStatistics(before);
    bench.engine->m_tickFailureStart = 1;
    bench.engine->m_nFailureCount = 2;
    bench.engine->m_bDisplayGone = true;
    bench.engine->m_bFirstError = false;
    bench.engine->m_tickLastCapture = 3;
    EXPECT_EQ(bench.engine->Start(), 0);
    const SHARE_CAPTURE_STATISTIC now = bench.Statistic();
    EXPECT_EQ(now.nTotalFrames, 0);
    EXPECT_EQ(now.m_nMsAverageCaptureTime, 0);
    EXPECT_EQ(now.m_nMsAverageDeliverCapabilityTime, 0);
    EXPECT_EQ(now.m_nMsAverageCaptureCapabilityTime, 0u);
    EXPECT_EQ(now.nCaptureWidth, 0);
    EXPECT_EQ(now.nCaptureHeight, 0);
    EXPECT_EQ(now.nCaptureFps, 0);
    EXPECT_EQ(now.nDuplicateFrames, 0);
    EXPECT_EQ(now.nFlags, 0u);
    EXPECT_EQ(bench.engine->m_tickFailureStart, 0u);
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
    EXPECT_FALSE(bench.engine->m_bDisplayGone);
    EXPECT_TRUE(bench.engine->m_bFirstError);
    EXPECT_EQ(bench.engine->m_tickLastCapture, 0u);
}

TEST(ShareCaptureEngineStart, KeepsTheOtherCountersOfTheFormerRun) {
    CEngineBench<> bench;
    bench.engine->m_tickFpsStart = 1;
    bench.engine->m_nFpsFrames = 2;
    bench.engine->m_tickDupStart = 3;
    bench.engine->m_nUnavailableTimes = 4;
    bench.engine->m_tickDragStart = 5;
    bench.engine->m_bForceFrame = true;
    EXPECT_EQ(bench.engine->Start(), 0);
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.engine->m_tickFpsStart, 1u);
    EXPECT_EQ(bench.engine->m_nFpsFrames, 2u);
    EXPECT_EQ(bench.engine->m_tickDupStart, 3u);
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 4);
    EXPECT_EQ(bench.engine->m_tickDragStart, 5u);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
}

TEST(ShareCaptureEngineStart, ArmsTheFirstErrorEvenWhenItFails) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    bench.engine->m_bFirstError = false;
    EXPECT_EQ(bench.engine->Start(), -4);
    EXPECT_TRUE(bench.engine->m_bFirstError);
}

TEST(ShareCaptureEngineStart, KeepsTheStatisticOfTheFormerRunWhenItFails) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    SHARE_CAPTURE_STATISTIC before{};
    before.nTotalFrames = 7;
    bench.engine->OnCaptureStatistics(before);
    EXPECT_EQ(bench.engine->Start(), -4);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 7);
}

TEST(ShareCaptureEngineStart, FailsWithItsCodeAndTracesWhenTheWorkerCannotBeStarted) {
    CEngineBench<> bench(true);
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.Forget();
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(bench.engine->Start(), -1);
    }
    EXPECT_EQ(bench.engine->GetCaptureStatus(), SHARE_CAPTURE_ENGINE_STATUS_STOPPED);
    EXPECT_EQ(bench.engine->_GetWorker(), nullptr);
    EXPECT_EQ(bench.capturer.Sink(), nullptr);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"capturer AddSink", "pointing AddSink", "pointing Start",
                                          "capturer RemoveSink", "pointing RemoveSink", "pointing Stop"}));
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{});

    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 8u);
    EXPECT_TRUE(IsLineAt(lines[0],
                         Error("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Create fail,[CheckPoint]"),
                         TASK_THREAD));
    EXPECT_EQ(lines[1], Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]"));
    EXPECT_EQ(lines[2], Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Start,[CheckPoint]"));
    EXPECT_TRUE(IsLineAt(lines[3],
                         Error("[CShareCaptureEngine::_CreateCaptureThread]>>m_pCScreenCaptureTaskThread->"
                               "CreateCaptureThread fail"),
                         THREADS));
    EXPECT_EQ(lines[4], Info("[CShareCaptureEngine::CScreenCaptureTaskThread]>>Destroy,[CheckPoint]"));
    EXPECT_EQ(lines[5], Info("[CShareCaptureEngine::_DestroyCaptureThread]"));
    EXPECT_TRUE(IsLineAt(lines[6], Error("[CShareCaptureEngine::_Init]>>_CreateCaptureThread fail"), IMPL));
    EXPECT_TRUE(IsLineAt(lines[7], Error("[CShareCaptureEngine::Start]>>fail>>>Init fail"), IMPL));
}

TEST(ShareCaptureEngineStart, SucceedsOnceThreadsCanBeStartedAgain) {
    CEngineBench<> bench;
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(bench.engine->Start(), -1);
    }
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(ShareCaptureEngineStart, RunsWithoutEventsWhenTheAssistThreadCannotBeStarted) {
    CEngineBench<> bench;
    {
        const CNoNewThreadsScope noRoom;
        EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    }
    EXPECT_EQ(bench.engine->_GetAssistThread(), nullptr);
    bench.engine->OnCaptureError(-203);
    EXPECT_TRUE(bench.engine->m_bDisplayGone);
    EXPECT_EQ(bench.engine->Start(), 0);
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{"status 1"}) << "the error was told to nobody";
}
