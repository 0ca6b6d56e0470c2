// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <stdexcept>
#include <string>
#include <vector>

/// The step of a pass that asks the capturer: size, capture, exceptions, windows, scale, and its lock.

namespace {

using Lines = std::vector<std::string>;

constexpr auto MODE_7 = SCREEN_CAPTURER_TYPE_AVFOUNDATION;

class ShareCaptureStep : public testing::Test {
protected:
    ~ShareCaptureStep() override {
        AppShareConfig& config = *AppShareConfig::Instance();
        config.m_bCaptureResampleFixSizeEnable = false;
        config.m_nResampleScreenCaptureWidth = 1920;
        config.m_nResampleScreenCaptureHeight = 1080;
        config.m_nShareConfigFlags = 0u;
        config.SetCurrentScale(1.0F);
    }

    float ScaleOfPass() {
        bench.Pass(3);
        return bench.pointing->polledScale;
    }

    CEngineBench<> bench{true};
};

} // namespace

TEST_F(ShareCaptureStep, TellsTheCapturerTheSizeLimitBeforeEveryCapture) {
    bench.BeginInline();
    bench.Pass();
    EXPECT_EQ(bench.engine->SetCaptureMaxFrameSize(640, 480), 0);
    bench.Pass();
    bench.Pass();
    EXPECT_EQ(bench.calls.Count("SetCaptureMaxSize 2880x1800"), 1u);
    EXPECT_EQ(bench.calls.Count("SetCaptureMaxSize 640x480"), 2u);
    EXPECT_EQ(bench.calls.Count("Capture"), 3u);
}

TEST_F(ShareCaptureStep, TellsTheFixedSizeWhenThatIsOnAndNeverBelowItsFloor) {
    AppShareConfig& config = *AppShareConfig::Instance();
    config.m_bCaptureResampleFixSizeEnable = true;
    bench.BeginInline();
    bench.Pass();
    config.m_nResampleScreenCaptureWidth = 799;
    config.m_nResampleScreenCaptureHeight = 0;
    bench.Pass();
    EXPECT_EQ(bench.calls.Count("SetCaptureMaxSize 1920x1080"), 1u);
    EXPECT_EQ(bench.calls.Count("SetCaptureMaxSize 800x600"), 1u);
}

TEST_F(ShareCaptureStep, GoesOnWithoutACaptureWhenTheSizeIsRefused) {
    bench.BeginInline();
    bench.engine->m_eCaptureMode = MODE_7;
    bench.engine->m_tickDragStart = 5;
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.maxSizeResult = -2; });
    bench.Pass(3);
    EXPECT_EQ(bench.calls.Count("Capture"), 0u);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 1u) << "the pointer still goes into the stale frame";
    EXPECT_TRUE(
        bench.trace.Contains("[CShareCaptureEngine::_CaptureProcess]>>Fail Capture Content, ret=4294967295"));
    // The refusal is no result: neither failures nor drags are counted by it.
    EXPECT_EQ(bench.engine->m_tickFailureStart, 0u);
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
    EXPECT_EQ(bench.engine->m_tickDragStart, 5u);
}

TEST_F(ShareCaptureStep, AsksForNothingWhenThePassWantsNoContent) {
    bench.BeginInline();
    bench.Pass(SHARE_CAPTURE_MASK_POINTER);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"GetScaleFactor", "CapturePoint"}));
    EXPECT_TRUE(bench.trace.Contains("Fail Capture Content, ret=4294967295"));
}

TEST_F(ShareCaptureStep, CountsAnExceptionAsAFailedCapture) {
    bench.BeginInline();
    bench.engine->m_eCaptureMode = MODE_7;
    bench.capturer.SetHook([](IShareFrame*) { throw std::runtime_error("no camera"); });
    bench.Pass(3);
    bench.capturer.SetHook([](IShareFrame*) { throw 42; });
    bench.Pass(3);
    EXPECT_EQ(bench.engine->m_nFailureCount, 2);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_EQ(bench.calls.Count("CapturePoint"), 0u);
    EXPECT_TRUE(bench.trace.Contains("[CShareCaptureEngine::_CaptureProcess]>>Capture threw no camera"));
    bench.capturer.SetHook(nullptr);
    bench.Pass(3);
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST_F(ShareCaptureStep, TellsTheFailureAccountingOfEveryResult) {
    bench.BeginInline();
    bench.engine->m_eCaptureMode = MODE_7;
    bench.capturer.ScriptResults({-1, -304, 0, -303, -302, -1});
    bench.Passes(2);
    EXPECT_EQ(bench.engine->m_nFailureCount, 2);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
    EXPECT_EQ(bench.engine->m_tickFailureStart, 0u);
    bench.Pass();
    EXPECT_NE(bench.engine->m_tickDragStart, 0u);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_tickDragStart, 0u);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_nFailureCount, 1);
    bench.capturer.ScriptResults({-203});
    bench.Pass();
    EXPECT_EQ(bench.engine->m_tickFailureStart, 0u);
}

TEST_F(ShareCaptureStep, TracesItsTimeWhenThatIsAskedFor) {
    bench.BeginInline();
    bench.capturer.SetHook([&](IShareFrame*) { bench.Advance(12); });
    bench.Pass();
    EXPECT_FALSE(bench.trace.Contains("[Performance]"));
    AppShareConfig::Instance()->m_nShareConfigFlags = SHARE_CONFIG_FLAG_PERFORMANCE_TRACE;
    bench.Pass();
    bench.capturer.SetResult(-1);
    bench.Pass();
    EXPECT_EQ(bench.trace.LinesContaining("[Performance]"),
              (Lines(2, Info("[Performance] _CaptureProcess Capture(pShareFrame) time =12"))));
}

TEST_F(ShareCaptureStep, ForgetsTheUnavailablePassesWithAGoodCapture) {
    bench.BeginInline();
    bench.engine->m_nUnavailableTimes = 9;
    bench.capturer.ScriptResults({-1, 0});
    bench.Pass();
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 9);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 0);
}

TEST_F(ShareCaptureStep, TellsTheSinkOfAChangedWindowListOnce) {
    bench.BeginInline();
    bench.engine->m_vecCapturedWindows = {5, 6};
    bench.capturer.ScriptResults({-1});
    bench.Pass();
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{}) << "only a good capture looks at the windows";
    bench.Passes(2);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{"windows null"});
    EXPECT_TRUE(bench.engine->m_vecCapturedWindows.empty());
}

TEST_F(ShareCaptureStep, TellsNothingOfWindowsOnADesktopEngine) {
    CEngineBench<CShareCaptureDesktopEngine> desktop;
    desktop.BeginInline();
    desktop.engine->m_vecCapturedWindows = {5, 6};
    desktop.Pass();
    desktop.SettleEvents();
    EXPECT_EQ(desktop.sink.FrameCount(), 1u);
    EXPECT_EQ(desktop.sink.Notices(), Lines{});
    EXPECT_EQ(desktop.engine->m_vecCapturedWindows, (std::vector<unsigned>{5, 6}));
}

TEST_F(ShareCaptureStep, TellsOfWindowsOnApplicationAndWindowEngines) {
    CEngineBench<CShareCaptureWindowEngine> window;
    window.BeginInline();
    window.engine->m_vecCapturedWindows = {5};
    window.Pass();
    window.SettleEvents();
    EXPECT_EQ(window.sink.Notices(), Lines{"windows null"});
}

TEST_F(ShareCaptureStep, TakesTheScaleFromWhatTheFrameSaysItShows) {
    bench.BeginInline();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.size = {8, 4};
        answers.rectCapture = {100, 50, 105, 53};
        answers.scaleFactor = 3.0F;
    });
    EXPECT_EQ(ScaleOfPass(), 8.0F / 5.0F);
    EXPECT_EQ(bench.calls.Count("GetScaleFactor"), 0u);
}

TEST_F(ShareCaptureStep, TakesTheScaleFromTheCapturerWhenTheFrameDoesNotSay) {
    bench.BeginInline();
    bench.capturer.Change([](CFakeCapturer::Answers& answers) {
        answers.rectCapture = {100, 50, 100, 53}; // no width
        answers.scaleFactor = 2.5F;
    });
    EXPECT_EQ(ScaleOfPass(), 2.5F);
    EXPECT_EQ(bench.calls.Count("GetScaleFactor"), 1u);
}

TEST_F(ShareCaptureStep, TakesTheScaleOfTheProcessWhenTheCapturerHasGoneByThen) {
    CEngineBench<CShareCaptureDesktopEngine> desktop(true);
    desktop.BeginInline();
    desktop.capturer.SetHook([&](IShareFrame*) { desktop.engine->GiveOwnCapturer(nullptr); });
    AppShareConfig::Instance()->SetCurrentScale(1.5F);
    desktop.Pass(3);
    EXPECT_EQ(desktop.pointing->polledScale, 1.5F);
    EXPECT_EQ(desktop.sink.FrameCount(), 1u);
    desktop.engine->GiveOwnCapturer(Borrow(desktop.capturer));
    AppShareConfig::Instance()->SetCurrentScale(0.05F);
    desktop.Pass(3);
    EXPECT_EQ(desktop.pointing->polledScale, 0.1F);
}

TEST_F(ShareCaptureStep, GoesOnAfterAFallbackThatLeftNoCapturer) {
    CEngineBench<CShareCaptureDesktopEngine> desktop(true);
    desktop.BeginInline();
    desktop.engine->m_eCaptureMode = MODE_7;
    desktop.engine->m_eSHARE_CAPTURE_ENGINE_TYPE = static_cast<SHARE_CAPTURE_ENGINE_TYPE>(0); // has none
    desktop.capturer.SetResult(-7);
    desktop.Pass(3);
    EXPECT_EQ(desktop.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(desktop.Statistic().nFlags, 2u);
    EXPECT_EQ(desktop.engine->_GetOwnCapturer(), nullptr);
    EXPECT_TRUE(desktop.trace.Contains("Fail Capture Content, ret=4294967289"));
    desktop.Pass(3);
    EXPECT_EQ(desktop.calls.Count("Capture"), 1u);
}

TEST_F(ShareCaptureStep, AsksForTheScaleWhateverTheResultWas) {
    bench.BeginInline();
    bench.capturer.SetResult(-1);
    bench.Pass();
    EXPECT_EQ(bench.calls.Count("GetScaleFactor"), 1u);
}

TEST_F(ShareCaptureStep, KeepsOtherCallsAwayFromAnExternalCapturerUntilItHasCaptured) {
    CGate gate;
    CTally inside;
    bench.capturer.SetHook([&](IShareFrame*) {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    bench.Start();
    bench.Advance(200);
    ASSERT_TRUE(inside.Reaches(1));
    const CCallOnThread ask([&] { EXPECT_EQ(bench.engine->GetCaptureShareSourceCount(), 0); });
    ask.UntilItWaits();
    EXPECT_FALSE(ask.HasReturned());
    gate.Open();
}

TEST_F(ShareCaptureStep, HasLetGoOfTheCapturerWhenTheFrameIsDelivered) {
    bench.sink.SetFrameHook([&](IShareFrame*) {
        const CCallOnThread ask([&] { EXPECT_EQ(bench.engine->GetCaptureShareSourceCount(), 0); });
    });
    bench.Start();
    bench.Tick();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}
