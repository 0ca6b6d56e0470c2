// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/engine_bench.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstring>
#include <ostream>
#include <string>
#include <vector>

/// Construction, status machine, sink and external capturer. What Start looks for stands in
/// share_capture_engine_start_test.cpp, what the threads do in share_capture_engine_threads_test.cpp.

namespace {

using Lines = std::vector<std::string>;

const std::string IMPL = "src/share_capture_engine_impl";

enum class Call {
    Start,
    Stop,
    Pause,
    Resume
};

struct StatusRow {
    SHARE_CAPTURE_ENGINE_STATUS from;
    Call call;
    bool hasCapturer;
    SHARE_CAPTURE_ENGINE_STATUS to;
    const char* told;
    int result;
};

std::ostream& operator<<(std::ostream& out, const StatusRow& row) {
    static const char* const calls[] = {"Start", "Stop", "Pause", "Resume"};
    return out << calls[static_cast<int>(row.call)] << " in status " << row.from
               << (row.hasCapturer ? "" : " without a capturer");
}

constexpr auto STARTED = SHARE_CAPTURE_ENGINE_STATUS_STARTED;
constexpr auto STOPPED = SHARE_CAPTURE_ENGINE_STATUS_STOPPED;
constexpr auto PAUSED = SHARE_CAPTURE_ENGINE_STATUS_PAUSED;

int Make(Call call, IShareCaptureEngine& engine) {
    switch (call) {
        case Call::Start:
            return engine.Start();
        case Call::Stop:
            return engine.Stop();
        case Call::Pause:
            return engine.Pause();
        case Call::Resume:
            return engine.Resume();
    }
    return 0;
}

void Reach(SHARE_CAPTURE_ENGINE_STATUS status, CEngineBench<>& bench) {
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    if (status == STOPPED)
        return;
    EXPECT_EQ(bench.engine->Start(), 0);
    if (status == PAUSED) {
        EXPECT_EQ(bench.engine->Pause(), 0);
    }
    bench.SettleEvents();
    bench.Forget();
}

class StatusMachine : public testing::TestWithParam<StatusRow> {};

} // namespace

TEST_P(StatusMachine, GoesWhereTheRowSaysAndTellsTheSinkSo) {
    const StatusRow& row = GetParam();
    CEngineBench<> bench;
    Reach(row.from, bench);
    ASSERT_EQ(bench.engine->GetCaptureStatus(), row.from);
    if (!row.hasCapturer) {
        EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    }
    EXPECT_EQ(Make(row.call, *bench.engine), row.result);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), row.to);
    // An engine that has just been stopped has told its events before Stop came back.
    if (bench.engine->_GetAssistThread() != nullptr)
        bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), row.told[0] != '\0' ? Lines{row.told} : Lines{});
}

INSTANTIATE_TEST_SUITE_P(AllRows, StatusMachine,
                         testing::Values(StatusRow{STOPPED, Call::Start, true, STARTED, "status 1", 0},
                                         StatusRow{STOPPED, Call::Start, false, STOPPED, "", -4},
                                         StatusRow{STARTED, Call::Start, true, STARTED, "", 0},
                                         StatusRow{PAUSED, Call::Start, true, PAUSED, "", 0},
                                         StatusRow{STARTED, Call::Pause, true, PAUSED, "status 3", 0},
                                         StatusRow{PAUSED, Call::Pause, true, PAUSED, "", 0},
                                         StatusRow{STOPPED, Call::Pause, true, STOPPED, "", -1},
                                         StatusRow{PAUSED, Call::Resume, true, STARTED, "status 1", 0},
                                         StatusRow{STARTED, Call::Resume, true, STARTED, "", 0},
                                         StatusRow{STOPPED, Call::Resume, true, STOPPED, "", -1},
                                         StatusRow{STARTED, Call::Stop, true, STOPPED, "status 2", 0},
                                         StatusRow{PAUSED, Call::Stop, true, STOPPED, "status 2", 0},
                                         StatusRow{STOPPED, Call::Stop, true, STOPPED, "", 0}));

TEST(ShareCaptureEngineStatus, MayBeStartedAgainAfterStop) {
    CEngineBench<> bench;
    for (int round = 0; round < 3; ++round) {
        bench.Start();
        bench.Tick();
        EXPECT_EQ(bench.engine->Stop(), 0);
    }
    EXPECT_EQ(bench.sink.FrameCount(), 3u);
    EXPECT_EQ(bench.sink.Notices(),
              (Lines{"status 1", "status 2", "status 1", "status 2", "status 1", "status 2"}));
}

TEST(ShareCaptureEngineStatus, GoesFromPauseToStopWithOneNoticeAndCannotBeResumedThen) {
    CEngineBench<> bench;
    bench.Start();
    EXPECT_EQ(bench.engine->Pause(), 0);
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.sink.Notices(), (Lines{"status 1", "status 3", "status 2"}));
    EXPECT_EQ(bench.engine->Resume(), -1);
    EXPECT_EQ(bench.engine->GetCaptureStatus(), STOPPED);
}

TEST(ShareCaptureEngineStatus, TellsOnlyChanges) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.engine->_UpdateShareStatus(STOPPED);
    bench.engine->_UpdateShareStatus(PAUSED);
    bench.engine->_UpdateShareStatus(PAUSED);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{"status 3"});
    EXPECT_EQ(bench.trace.LinesContaining("OnCaptureStatusChanged"),
              Lines{Info("[CShareCaptureEngine::OnCaptureStatusChanged]>> status=3")});
    bench.engine->_UpdateShareStatus(STOPPED);
}

TEST(ShareCaptureEngineStatus, KeepsTheStatisticOverAPauseAndForgetsItAtStop) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick(2);
    EXPECT_EQ(bench.engine->Pause(), 0);
    bench.Tick(2);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 2);
    EXPECT_EQ(bench.engine->Resume(), 0);
    bench.Tick();
    EXPECT_EQ(bench.Statistic().nTotalFrames, 3);
    EXPECT_EQ(bench.engine->Stop(), 0);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 0);
    EXPECT_EQ(bench.Statistic().nCaptureWidth, 0);
}

TEST(ShareCaptureEngineStatus, ForgetsTheFailureWindowWhenItIsResumed) {
    CEngineBench<> bench;
    Reach(PAUSED, bench);
    bench.engine->m_tickFailureStart = 5;
    bench.engine->m_nFailureCount = 6;
    bench.engine->m_tickDragStart = 7;
    EXPECT_EQ(bench.engine->Resume(), 0);
    EXPECT_EQ(bench.engine->m_tickFailureStart, 0u);
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
    EXPECT_EQ(bench.engine->m_tickDragStart, 7u);
}

TEST(ShareCaptureEngineStatus, KeepsTheFailureWindowWhenThereIsNothingToResume) {
    CEngineBench<> bench;
    Reach(STARTED, bench);
    bench.engine->m_tickFailureStart = 5;
    bench.engine->m_nFailureCount = 6;
    EXPECT_EQ(bench.engine->Resume(), 0);
    EXPECT_EQ(bench.engine->m_tickFailureStart, 5u);
    EXPECT_EQ(bench.engine->m_nFailureCount, 6);
}

TEST(ShareCaptureEngineConstruction, GivesEveryFieldItsFirstValue) {
    const CEngineProbe<CShareCaptureEngine> engine;
    EXPECT_FALSE(engine.m_sinkPort->HasSink());
    EXPECT_EQ(engine.m_eSHARE_CAPTURE_ENGINE_TYPE, SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    EXPECT_NE(engine.m_spShareCapturerContext, nullptr);
    EXPECT_EQ(engine._GetOwnCapturer(), nullptr);
    EXPECT_EQ(engine.m_pIShareCapturerExternal, nullptr);
    EXPECT_FALSE(engine.m_bUseExternalPoint);
    EXPECT_EQ(engine.m_pCursorImg, nullptr);
    EXPECT_EQ(engine.m_nPointX, 0);
    EXPECT_EQ(engine.m_nPointY, 0);
    EXPECT_EQ(engine.m_eSHARE_CAPTURE_ENGINE_STATUS, STOPPED);
    EXPECT_EQ(TVLSize(engine.m_sizeShareDisplay), (TVLSize{0, 0}));
    EXPECT_EQ(TVLRect(engine.m_rcSharePosition), (TVLRect{0, 0, 0, 0}));
    EXPECT_EQ(engine._GetWorker(), nullptr);
    EXPECT_EQ(engine._GetAssistThread(), nullptr);
    EXPECT_EQ(engine.m_tickLastCapture, 0u);
    EXPECT_TRUE(engine.m_bFirstError);
    EXPECT_EQ(engine.m_eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(engine.m_nUnavailableTimes, 0);
    EXPECT_TRUE(engine.m_bFallbackEnabled);
    EXPECT_EQ(engine.m_tickFailureStart, 0u);
    EXPECT_EQ(engine.m_nFailureCount, 0);
    EXPECT_EQ(engine.m_nFailureWindowMs, 5000u);
    EXPECT_EQ(engine.m_tickDragStart, 0u);
    EXPECT_EQ(engine.m_tickFpsStart, 0u);
    EXPECT_EQ(engine.m_nFpsFrames, 0u);
    EXPECT_EQ(engine.m_nFpsWindowMs, 1000u);
    EXPECT_EQ(TVLSize(engine.m_sizeCaptureMax), (TVLSize{0, 0}));
    EXPECT_EQ(TVLSize(engine.m_sizeCurCaptureMax), (TVLSize{0, 0}));
    EXPECT_EQ(engine.m_tickDupStart, 0u);
    EXPECT_FALSE(engine.m_bCheckDupFrame);
    EXPECT_TRUE(engine.m_vecCapturedWindows.empty());
    EXPECT_EQ(engine.m_rcLastUpdate, (TVLRect{0, 0, 0, 0}));
    EXPECT_FALSE(engine.m_bForceFrame);
    EXPECT_FALSE(engine.m_bDisplayGone);
}

TEST(ShareCaptureEngineConstruction, MakesTwoFramesWithOneReferenceEachAndWritesIntoTheFirst) {
    const CEngineProbe<CShareCaptureEngine> engine;
    ASSERT_NE(engine.m_pShareFrameA, nullptr);
    ASSERT_NE(engine.m_pShareFrameB, nullptr);
    EXPECT_NE(engine.m_pShareFrameA, engine.m_pShareFrameB);
    EXPECT_EQ(engine.m_pShareFrameA->GetReference(), 1u);
    EXPECT_EQ(engine.m_pShareFrameB->GetReference(), 1u);
    EXPECT_EQ(engine.m_pCurShareFrame, engine.m_pShareFrameA);
}

TEST(ShareCaptureEngineConstruction, StartsWithAnEmptyStatisticInTheDefaultMode) {
    CEngineBench<> bench;
    SHARE_CAPTURE_STATISTIC statistic;
    std::memset(&statistic, 0x55, sizeof statistic);
    EXPECT_EQ(bench.engine->GetShareCaptureStatistic(statistic), 0);
    EXPECT_EQ(statistic.nTotalFrames, 0);
    EXPECT_EQ(statistic.m_nMsAverageCaptureTime, 0);
    EXPECT_EQ(statistic.m_nMsAverageDeliverCapabilityTime, 0);
    EXPECT_EQ(statistic.m_nMsAverageCaptureCapabilityTime, 0u);
    EXPECT_EQ(statistic.nCaptureWidth, 0);
    EXPECT_EQ(statistic.nCaptureHeight, 0);
    EXPECT_EQ(statistic.nCaptureFps, 0);
    EXPECT_EQ(statistic.nDuplicateFrames, 0);
    EXPECT_EQ(statistic.nFlags, 0u);
    EXPECT_EQ(statistic.eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST(ShareCaptureEngineConstruction, PutsTheWholeProcessIntoTheDefaultCaptureMode) {
    const CEngineProbe<CShareCaptureEngine> first;
    AppShareConfig::Instance()->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_CGS_GCD;
    const CEngineProbe<CShareCaptureEngine> second;
    EXPECT_EQ(AppShareConfig::Instance()->GetScreenCapturerType(), SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST(ShareCaptureEngineDestruction, LetsGoOfCapturerPointerAndLibraryInThatOrder) {
    CEngineBench<> bench(true);
    auto* const image = new CFakePointingImg(bench.calls, nullptr, 0, 0);
    image->AddRef();
    bench.engine->OnPointingImgChanged(image);
    EXPECT_EQ(image->Release(), 1u);
    bench.Forget();
    EXPECT_EQ(DestroyShareCaptureEngine(bench.engine), 0);
    bench.engine = nullptr;
    EXPECT_EQ(bench.calls.Calls(), (Lines{"capturer RemoveSink", "pointing RemoveSink", "pointing Stop",
                                          "image deleted", "pointing deleted"}));
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 3u);
    EXPECT_THAT(lines[1], testing::StartsWith(Info("DestroySharePointing(0x")));
    EXPECT_EQ(lines[2], Info("UninitShareLib"));
}

TEST(ShareCaptureEngineDestruction, GivesUpItsReferencesOnTheFrames) {
    CEngineBench<> bench;
    IShareFrame* const a = bench.engine->m_pShareFrameA;
    IShareFrame* const b = bench.engine->m_pShareFrameB;
    a->AddRef();
    b->AddRef();
    EXPECT_EQ(DestroyShareCaptureEngine(bench.engine), 0);
    bench.engine = nullptr;
    EXPECT_EQ(a->Release(), 0u);
    EXPECT_EQ(b->Release(), 0u);
}

TEST(ShareCaptureEngineSink, IsStoredWithATraceAndMayBeNone) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    EXPECT_TRUE(bench.engine->m_sinkPort->HasSink());
    EXPECT_EQ(bench.engine->SetSink(nullptr), 0);
    EXPECT_FALSE(bench.engine->m_sinkPort->HasSink());
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 2u);
    EXPECT_THAT(lines[0],
                testing::StartsWith(Debug("[CShareCaptureEngine::SetSink]>>m_pIShareCaptureEngineSink=0x")));
    EXPECT_EQ(lines[1], Debug("[CShareCaptureEngine::SetSink]>>m_pIShareCaptureEngineSink=0x0"));
}

TEST(ShareCaptureEngineSink, HearsEventsBeforeStart) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    ASSERT_NE(bench.engine->_GetAssistThread(), nullptr);
    bench.engine->OnCaptureError(-204);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{"error -204"});
}

TEST(ShareCaptureEngineSink, StartsNoThreadWhenItIsNone) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetSink(nullptr), 0);
    EXPECT_EQ(bench.engine->_GetAssistThread(), nullptr);
}

TEST(ShareCaptureEngineExternalCapturer, IsAskedForItsSizeWhichTheFramesFollow) {
    CEngineBench<> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.sourceSize = {640, 480};
        answers.sourcePosition = {10, 20, 640, 480};
    });
    EXPECT_EQ(bench.engine->SetSink(&bench.sink), 0);
    bench.Forget();
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(&bench.capturer), 0);
    EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, &bench.capturer);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"GetCurrentCaptureSourceSize", "GetCurrentCaptureSourcePosition"}));
    for (IShareFrame* const frame : {bench.engine->m_pShareFrameA, bench.engine->m_pShareFrameB}) {
        TVLSize size{};
        frame->GetFrameSize(size);
        EXPECT_EQ(size, (TVLSize{640, 480}));
    }
    TVLSize size{};
    bench.engine->GetCaptureSize(size);
    EXPECT_EQ(size, (TVLSize{640, 480}));
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), (Lines{"size 640x480", "position 10,20 640x480"}));
    const Lines traced = bench.trace.LinesContaining("StSetExternalIShareCapturerart");
    ASSERT_EQ(traced.size(), 1u);
    EXPECT_EQ(traced[0].find(Info(
                  "[CShareCaptureEngine::StSetExternalIShareCapturerart]>>m_pIShareCapturerExternal=0x")),
              0u);
}

TEST(ShareCaptureEngineExternalCapturer, MayBeTakenAway) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), 0);
    EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, nullptr);
    EXPECT_EQ(
        bench.trace.Lines(),
        Lines{Info("[CShareCaptureEngine::StSetExternalIShareCapturerart]>>m_pIShareCapturerExternal=0x0")});
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST(ShareCaptureEngineExternalCapturer, IsRefusedOnceTheEngineHasStarted) {
    for (const bool paused : {false, true}) {
        CEngineBench<> bench;
        Reach(paused ? PAUSED : STARTED, bench);
        CFakeCapturer other(bench.calls);
        EXPECT_EQ(bench.engine->SetExternalIShareCapturer(&other), -1);
        EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, &bench.capturer);
        const Lines lines = bench.trace.Lines();
        ASSERT_EQ(lines.size(), 1u);
        EXPECT_TRUE(
            IsLineAt(lines[0],
                     Error("[CShareCaptureEngine::StSetExternalIShareCapturerart] cannot set external "
                           "capturer after started"),
                     IMPL));
    }
}

TEST(ShareCaptureEngineExternalCapturer, IsRefusedOnAnotherKind) {
    CEngineBench<> bench;
    bench.engine->m_eSHARE_CAPTURE_ENGINE_TYPE = SHARE_CAPTURE_ENGINE_TYPE_WINDOW;
    CFakeCapturer other(bench.calls);
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(&other), -1);
    EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, &bench.capturer);
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0],
                         Error("[CShareCaptureEngine::StSetExternalIShareCapturerart] "
                               "m_eSHARE_CAPTURE_ENGINE_TYPE is not "
                               "SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION"),
                         IMPL));
    bench.engine->m_eSHARE_CAPTURE_ENGINE_TYPE = SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION;
}

TEST(ShareCaptureEngineExternalCapturer, IsNeverDestroyedByTheEngine) {
    CEngineBench<> bench;
    bench.Start();
    bench.Tick();
    EXPECT_EQ(DestroyShareCaptureEngine(bench.engine), 0);
    bench.engine = nullptr;
    EXPECT_EQ(bench.calls.Count("capturer deleted"), 0u);
}

TEST(ShareCaptureEngineExternalPointing, IsStoredWithATrace) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->EnableExternalISharePointing(true), 0);
    EXPECT_TRUE(bench.engine->m_bUseExternalPoint);
    EXPECT_EQ(bench.engine->EnableExternalISharePointing(false), 0);
    EXPECT_FALSE(bench.engine->m_bUseExternalPoint);
    EXPECT_EQ(bench.trace.Lines(),
              (Lines{Info("[CShareCaptureEngine::EnableExternalISharePointing]>>m_bUseExternalPoint=1"),
                     Info("[CShareCaptureEngine::EnableExternalISharePointing]>>m_bUseExternalPoint=0")}));
}

TEST(ShareCaptureEngineInterface, RefusesASwitchWhereAnEngineOffersNone) {
    CShareCaptureEngine engine;
    bool on = true;
    EXPECT_EQ(engine.IShareCaptureEngine::Config(SHARE_CAPTURE_ENGINE_CONFIG_FORCE_FRAME, &on, sizeof on),
              -1);
}
