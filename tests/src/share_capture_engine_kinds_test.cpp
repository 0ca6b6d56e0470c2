// SPDX-License-Identifier: Apache-2.0
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <memory>
#include <string>
#include <vector>

/// What each kind of engine binds, opens and closes.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned ALL_BITS = 0xFFFFFFFFu;
constexpr unsigned NO_PROCESS = 0x80000000u;

/// An engine as the library makes it, with what it traces on the way.
template <class Engine>
struct Fresh {
    CTraceLog trace;
    CEngineProbe<Engine> engine;
};

template <class Bench>
void ExpectClosed(Bench& bench) {
    IShareCapturer* const before = bench.engine->m_pIShareCapturerExternal;
    CFakeCapturer other(bench.calls);
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(&other), -1);
    EXPECT_EQ(bench.engine->SetExternalIShareCapturer(nullptr), -1);
    EXPECT_EQ(bench.engine->EnableExternalISharePointing(true), -1);
    EXPECT_EQ(bench.engine->m_pIShareCapturerExternal, before);
    EXPECT_FALSE(bench.engine->m_bUseExternalPoint);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
    EXPECT_TRUE(bench.calls.Calls().empty());
}

} // namespace

TEST(ShareCaptureDesktopEngine, BindsKindShareTypeAndCapturer) {
    Fresh<CShareCaptureDesktopEngine> fresh;
    EXPECT_EQ(fresh.engine.GetCaptureEngineType(), SHARE_CAPTURE_ENGINE_TYPE_DESKTOP);
    EXPECT_EQ(fresh.engine.m_spShareCapturerContext->GetShareType(), SHARE_TYPE_DESKTOP);
    EXPECT_TRUE(fresh.trace.Contains(Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=1")));
}

TEST(ShareCaptureAppEngine, BindsKindShareTypeAndCapturer) {
    Fresh<CShareCaptureAppEngine> fresh;
    EXPECT_EQ(fresh.engine.GetCaptureEngineType(), SHARE_CAPTURE_ENGINE_TYPE_APP);
    EXPECT_EQ(fresh.engine.m_spShareCapturerContext->GetShareType(), SHARE_TYPE_APP);
    EXPECT_TRUE(fresh.trace.Contains(Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=2")));
}

TEST(ShareCaptureWindowEngine, BindsKindShareTypeAndCapturer) {
    Fresh<CShareCaptureWindowEngine> fresh;
    EXPECT_EQ(fresh.engine.GetCaptureEngineType(), SHARE_CAPTURE_ENGINE_TYPE_WINDOW);
    EXPECT_EQ(fresh.engine.m_spShareCapturerContext->GetShareType(), SHARE_TYPE_WINDOW);
    EXPECT_TRUE(fresh.trace.Contains(Info("[CreateShareCapture]>>eSHARE_CAPTURER_TYPE=3")));
}

TEST(ShareCaptureEngine, OfTheUserCustomisationKindMakesNoCapturer) {
    Fresh<CShareCaptureEngine> fresh;
    EXPECT_EQ(fresh.engine.GetCaptureEngineType(), SHARE_CAPTURE_ENGINE_TYPE_USER_CUSTOMIZATION);
    EXPECT_FALSE(fresh.trace.Contains("[CreateShareCapture]"));
    EXPECT_FALSE(fresh.trace.Contains("SetShareType"));
    EXPECT_EQ(fresh.engine.EnableExternalISharePointing(true), 0);
}

TEST(ShareCaptureDesktopEngine, IsClosedToAClientsCapturerAndPointer) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    ExpectClosed(bench);
}

TEST(ShareCaptureAppEngine, IsClosedToAClientsCapturerAndPointer) {
    CEngineBench<CShareCaptureAppEngine> bench;
    ExpectClosed(bench);
}

TEST(ShareCaptureWindowEngine, IsClosedToAClientsCapturerAndPointer) {
    CEngineBench<CShareCaptureWindowEngine> bench;
    ExpectClosed(bench);
}

TEST(ShareCaptureDesktopEngine, DestroysItsCapturerBeforeTheRestOfItself) {
    CCallLog calls;
    auto* const engine = new CEngineProbe<CShareCaptureDesktopEngine>;
    engine->GivePointing(new CFakePointing(calls));
    engine->GiveOwnCapturer(std::shared_ptr<IShareCapturer>(new CFakeCapturer(calls), DestroyShareCapture));
    calls.Clear();
    const CTraceLog trace;
    EXPECT_EQ(DestroyShareCaptureEngine(engine), 0);
    EXPECT_EQ(calls.Calls(), (Lines{"capturer RemoveSink", "capturer deleted", "pointing RemoveSink",
                                    "pointing Stop", "pointing deleted"}));
    EXPECT_EQ(trace.CountContaining("[DestroyShareCapture]>>pIShareCapturer=0x"), 1u);
}

TEST(ShareCaptureDesktopEngine, SelectsADisplayAndReportsItsSize) {
    CEngineBench<CShareCaptureDesktopEngine> bench(true);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.sourceSize = {1280, 720};
        answers.display = 7;
    });
    EXPECT_EQ(bench.engine->SelectSharedDisplay(7), 0);
    EXPECT_EQ(bench.trace.Lines().front(), Info("[CShareCaptureEngine::SelectSharedDisplay]>> displayId=7"));
    EXPECT_EQ(bench.calls.Count("SelectSharedDisplay 7"), 1u);
    TVLSize size{};
    bench.engine->GetCaptureSize(size);
    EXPECT_EQ(size, (TVLSize{1280, 720}));
    EXPECT_EQ(bench.pointing->baseDisplay, 7u);
}

TEST(ShareCaptureDesktopEngine, ReportsNoSizeForADisplayThatTheCapturerRefuses) {
    CEngineBench<CShareCaptureDesktopEngine> bench(true);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.controlResult = -1; });
    EXPECT_EQ(bench.engine->SelectSharedDisplay(0), -1);
    EXPECT_EQ(bench.calls.Calls(), Lines{"SelectSharedDisplay 0"});
}

TEST(ShareCaptureDesktopEngine, RefusesTheDisplayThatIsNoneBeforeItLooksForACapturer) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    EXPECT_EQ(bench.engine->SelectSharedDisplay(ALL_BITS), -2);
    bench.engine->GiveOwnCapturer(nullptr);
    bench.Forget();
    EXPECT_EQ(bench.engine->SelectSharedDisplay(ALL_BITS), -2);
    EXPECT_EQ(bench.engine->SelectSharedDisplay(1), -4);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST(ShareCaptureDesktopEngine, RefusesProcesses) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    for (const unsigned pid : {1u, NO_PROCESS}) {
        EXPECT_EQ(bench.engine->AddSharedProcess(pid), -3);
        EXPECT_EQ(bench.engine->RemoveSharedProcess(pid), -3);
    }
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST(ShareCaptureDesktopEngine, PostsTheSelectionOnceItRuns) {
    CEngineBench<CShareCaptureDesktopEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.display = 1;
        answers.controlResult = -1;
    });
    bench.Start();
    EXPECT_EQ(bench.engine->SelectSharedDisplay(2), 0) << "the real result is the worker's";
    Settle(*bench.engine->_GetWorker());
    EXPECT_EQ(bench.calls.Count("SelectSharedDisplay 2"), 1u);
}

TEST(ShareCaptureAppEngine, AddsAProcessAndReportsTheSize) {
    CEngineBench<CShareCaptureAppEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.sourceSize = {300, 200}; });
    EXPECT_EQ(bench.engine->AddSharedProcess(42), 0);
    EXPECT_EQ(bench.trace.Lines().front(), Info("[CShareCaptureEngine::AddSharedProcess]>> pid=42"));
    EXPECT_EQ(bench.calls.Calls().front(), "AddSharedProcess 42");
    TVLSize size{};
    bench.engine->GetCaptureSize(size);
    EXPECT_EQ(size, (TVLSize{300, 200}));
}

TEST(ShareCaptureAppEngine, ReportsNoSizeForAProcessThatTheCapturerRefuses) {
    CEngineBench<CShareCaptureAppEngine> bench;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.controlResult = -5; });
    EXPECT_EQ(bench.engine->AddSharedProcess(42), -5);
    EXPECT_EQ(bench.calls.Calls(), Lines{"AddSharedProcess 42"});
}

TEST(ShareCaptureAppEngine, RemovesAProcessWithoutASizeReport) {
    CEngineBench<CShareCaptureAppEngine> bench;
    EXPECT_EQ(bench.engine->RemoveSharedProcess(42), 0);
    EXPECT_EQ(bench.trace.Lines(), Lines{Info("[CShareCaptureEngine::RemoveSharedProcess]>> pid=42")});
    EXPECT_EQ(bench.calls.Calls(), Lines{"RemoveSharedProcess 42"});
}

TEST(ShareCaptureAppEngine, RefusesTheProcessThatIsNoneBeforeItLooksForACapturer) {
    CEngineBench<CShareCaptureAppEngine> bench;
    EXPECT_EQ(bench.engine->AddSharedProcess(NO_PROCESS), -2);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(NO_PROCESS), -2);
    bench.engine->GiveOwnCapturer(nullptr);
    bench.Forget();
    EXPECT_EQ(bench.engine->AddSharedProcess(NO_PROCESS), -2);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(NO_PROCESS), -2);
    EXPECT_EQ(bench.engine->AddSharedProcess(1), -4);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(1), -4);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST(ShareCaptureAppEngine, RefusesADisplay) {
    CEngineBench<CShareCaptureAppEngine> bench;
    EXPECT_EQ(bench.engine->SelectSharedDisplay(1), -3);
    EXPECT_EQ(bench.engine->SelectSharedDisplay(ALL_BITS), -3);
}

TEST(ShareCaptureWindowEngine, RefusesProcessesAndDisplays) {
    CEngineBench<CShareCaptureWindowEngine> bench;
    EXPECT_EQ(bench.engine->SelectSharedDisplay(1), -3);
    EXPECT_EQ(bench.engine->AddSharedProcess(1), -3);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(1), -3);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
}

TEST(ShareCaptureEngine, OfTheUserCustomisationKindRefusesProcessesAndDisplays) {
    CEngineBench<> bench;
    EXPECT_EQ(bench.engine->SelectSharedDisplay(1), -3);
    EXPECT_EQ(bench.engine->AddSharedProcess(1), -3);
    EXPECT_EQ(bench.engine->RemoveSharedProcess(1), -3);
    EXPECT_TRUE(bench.calls.Calls().empty());
}

template <class Engine>
class ShareCaptureEngineOfAnyKind : public testing::Test {};

using EveryKind = testing::Types<CShareCaptureEngine, CShareCaptureDesktopEngine, CShareCaptureAppEngine,
                                 CShareCaptureWindowEngine>;
TYPED_TEST_SUITE(ShareCaptureEngineOfAnyKind, EveryKind);

TYPED_TEST(ShareCaptureEngineOfAnyKind, TakesUnsharedProcessesAndSharedWindows) {
    CEngineBench<TypeParam> bench;
    EXPECT_EQ(bench.engine->AddUnSharedProcess(9), 0);
    EXPECT_EQ(bench.engine->AddSharedWindow(8), 0);
    EXPECT_EQ(bench.calls.Count("AddUnSharedProcess 9"), 1u);
    EXPECT_EQ(bench.calls.Count("AddSharedWindow 8"), 1u);
    // Only a window share changes its size with its windows.
    const bool reportsSize = bench.engine->GetCaptureEngineType() == SHARE_CAPTURE_ENGINE_TYPE_WINDOW;
    EXPECT_EQ(bench.calls.Count("GetCurrentCaptureSourceSize"), reportsSize ? 1u : 0u);
}
