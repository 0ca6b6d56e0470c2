// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_pass.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <memory>
#include <vector>

// How the engine tells failures that pass from a capture mode that can't work.

namespace {

constexpr unsigned FELL_BACK = 2;

/// An engine in mode 7 whose failures are told to it directly; the fallback shows in its mode and flags.
class FailureWindow : public testing::Test {
protected:
    void SetUp() override { bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_AVFOUNDATION; }
    ~FailureWindow() override {
        AppShareConfig::Instance()->m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    }

    void ResultAfter(int milliseconds, int result) {
        bench.Advance(milliseconds);
        bench.engine->ProcessCaptureResult(result);
    }
    bool HasFallenBack() { return bench.engine->m_eCaptureMode == SCREEN_CAPTURER_TYPE_DEFAULT; }
    bool IsWindowOpen() { return bench.engine->m_tickFailureStart != 0u; }

    CEngineBench<> bench;
};

} // namespace

TEST_F(FailureWindow, FallsBackOnceWhenFailuresLastLongerThanFiveSeconds) {
    ResultAfter(0, SHARE_CAPTURE_FAILED);
    ResultAfter(5000, SHARE_CAPTURE_FAILED);
    EXPECT_FALSE(HasFallenBack());
    ResultAfter(1, SHARE_CAPTURE_FAILED);
    EXPECT_TRUE(HasFallenBack());
    EXPECT_EQ(bench.Statistic().nFlags, FELL_BACK);
    EXPECT_EQ(bench.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(AppShareConfig::Instance()->GetScreenCapturerType(), 1);
    ResultAfter(6000, SHARE_CAPTURE_FAILED);
    ResultAfter(6000, SHARE_CAPTURE_FAILED);
    EXPECT_EQ(bench.trace.CountContaining("[CShareCaptureEngine::ProcessCapturingFailure]>> old="), 1u);
    EXPECT_TRUE(bench.trace.Contains(Info("[CShareCaptureEngine::ProcessCapturingFailure]>> old=7,new=1")));
}

TEST_F(FailureWindow, FallsBackAtOnceForAFatalResult) {
    ResultAfter(0, SHARE_CAPTURE_FATAL);
    EXPECT_TRUE(HasFallenBack());
    EXPECT_EQ(bench.Statistic().nFlags, FELL_BACK);
}

TEST_F(FailureWindow, NeverOpensInTheDefaultMode) {
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_DEFAULT;
    for (const int result :
         std::vector<int>{SHARE_CAPTURE_FAILED, SHARE_CAPTURE_FATAL, SHARE_CAPTURE_NOT_READY, 42}) {
        ResultAfter(10000, result);
        EXPECT_FALSE(IsWindowOpen());
    }
    EXPECT_EQ(bench.Statistic().nFlags, 0u);
    EXPECT_FALSE(bench.trace.Contains("ProcessCapturingFailure"));
}

TEST_F(FailureWindow, OpensForEveryResultThatIsNoSuccess) {
    for (const int result : std::vector<int>{SHARE_CAPTURE_FAILED, SHARE_CAPTURE_NOT_READY, -5, 1, 42}) {
        bench.engine->ProcessCaptureResult(SHARE_CAPTURE_OK);
        ASSERT_FALSE(IsWindowOpen());
        ResultAfter(1, result);
        EXPECT_TRUE(IsWindowOpen()) << result;
        EXPECT_EQ(bench.engine->m_nFailureCount, 1);
    }
}

TEST_F(FailureWindow, ClosesOnASuccessAndWhenThereIsNoData) {
    for (const int good : {SHARE_CAPTURE_OK, SHARE_CAPTURE_NO_DATA}) {
        ResultAfter(0, SHARE_CAPTURE_FAILED);
        ResultAfter(4000, SHARE_CAPTURE_FAILED);
        EXPECT_EQ(bench.engine->m_nFailureCount, 2);
        ResultAfter(0, good);
        EXPECT_FALSE(IsWindowOpen());
        EXPECT_EQ(bench.engine->m_nFailureCount, 0);
        ResultAfter(4000, SHARE_CAPTURE_FAILED);
        ResultAfter(4000, SHARE_CAPTURE_FAILED);
        EXPECT_FALSE(HasFallenBack());
        ResultAfter(0, SHARE_CAPTURE_OK);
    }
}

TEST_F(FailureWindow, LengthensByTheTimeOfADrag) {
    ResultAfter(0, SHARE_CAPTURE_FAILED);
    ResultAfter(1000, SHARE_CAPTURE_DRAGGING);
    ResultAfter(2000, SHARE_CAPTURE_DRAGGING);
    ResultAfter(1000, SHARE_CAPTURE_FAILED); // the drag took 3000 of the 4000
    ResultAfter(4000, SHARE_CAPTURE_FAILED); // 5000 of failures
    EXPECT_FALSE(HasFallenBack());
    ResultAfter(1, SHARE_CAPTURE_FAILED);
    EXPECT_TRUE(HasFallenBack());
}

TEST_F(FailureWindow, StartsAfreshWhenTheDragHadBegunBeforeTheFailures) {
    bench.engine->m_tickFailureStart = ShareTickNow();
    bench.engine->m_tickDragStart = ShareTickNow() - 500u;
    ResultAfter(100, SHARE_CAPTURE_FAILED);
    EXPECT_FALSE(IsWindowOpen());
    EXPECT_FALSE(HasFallenBack()) << "which would have closed it, too";
    EXPECT_EQ(bench.engine->m_tickDragStart, 0u);
}

TEST_F(FailureWindow, StaysOpenWhenTheDragBeganWithTheFailures) {
    ResultAfter(10000, SHARE_CAPTURE_FAILED);
    ResultAfter(0, SHARE_CAPTURE_DRAGGING);
    ResultAfter(100, SHARE_CAPTURE_FAILED);
    EXPECT_TRUE(IsWindowOpen());
    EXPECT_EQ(bench.engine->m_nFailureCount, 2);
}

TEST_F(FailureWindow, KeepsTheFirstTickOfADrag) {
    ResultAfter(0, SHARE_CAPTURE_DRAGGING);
    const unsigned begun = bench.engine->m_tickDragStart;
    EXPECT_NE(begun, 0u);
    ResultAfter(700, SHARE_CAPTURE_DRAGGING);
    EXPECT_EQ(bench.engine->m_tickDragStart, begun);
    ResultAfter(0, SHARE_CAPTURE_OK);
    EXPECT_EQ(bench.engine->m_tickDragStart, 0u);
}

TEST_F(FailureWindow, ForgetsADragWithoutFailures) {
    ResultAfter(0, SHARE_CAPTURE_DRAGGING);
    ResultAfter(9000, SHARE_CAPTURE_FAILED);
    EXPECT_TRUE(IsWindowOpen());
    EXPECT_EQ(bench.engine->m_tickDragStart, 0u);
    ResultAfter(5000, SHARE_CAPTURE_FAILED);
    EXPECT_FALSE(HasFallenBack());
}

TEST_F(FailureWindow, StaysClosedWhileTheDisplayIsGone) {
    EXPECT_EQ(bench.engine->OnCapturedDisplayChanged(false), 0);
    ResultAfter(0, SHARE_CAPTURE_FAILED);
    ResultAfter(6000, SHARE_CAPTURE_FATAL);
    EXPECT_FALSE(IsWindowOpen());
    EXPECT_FALSE(HasFallenBack());
    ResultAfter(0, SHARE_CAPTURE_NO_DATA);
    EXPECT_FALSE(bench.engine->m_bDisplayGone);
    ResultAfter(0, SHARE_CAPTURE_FAILED);
    EXPECT_TRUE(IsWindowOpen());
}

TEST_F(FailureWindow, ClosesOnTheDisplayGoneResultAndKeepsTheCount) {
    ResultAfter(0, SHARE_CAPTURE_FAILED);
    ResultAfter(1, SHARE_CAPTURE_DRAGGING);
    ResultAfter(1, SHARE_CAPTURE_DISPLAY_GONE);
    EXPECT_FALSE(IsWindowOpen());
    EXPECT_EQ(bench.engine->m_tickDragStart, 0u);
    EXPECT_EQ(bench.engine->m_nFailureCount, 1);
}

TEST_F(FailureWindow, IsClearedByStartAndByResumeWhileADragSurvivesStart) {
    bench.engine->m_tickFailureStart = 7u;
    bench.engine->m_nFailureCount = 3;
    bench.engine->m_tickDragStart = 9u;
    bench.engine->m_bDisplayGone = true;
    bench.Start();
    EXPECT_FALSE(IsWindowOpen());
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
    EXPECT_FALSE(bench.engine->m_bDisplayGone);
    EXPECT_EQ(bench.engine->m_tickDragStart, 9u);
    EXPECT_EQ(bench.engine->Pause(), 0);
    bench.engine->m_tickFailureStart = 7u;
    bench.engine->m_nFailureCount = 3;
    EXPECT_EQ(bench.engine->Resume(), 0);
    EXPECT_FALSE(IsWindowOpen());
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
}

TEST_F(FailureWindow, DoesNothingWithTheFallbackSwitchedOff) {
    bench.engine->m_bFallbackEnabled = false;
    ResultAfter(0, SHARE_CAPTURE_FATAL);
    EXPECT_FALSE(HasFallenBack());
    EXPECT_FALSE(IsWindowOpen());
}

TEST(FailureOfAPass, FallsBackInsideThePassAndTellsNobody) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_CGS_GCD;
    bench.capturer.SetResult(SHARE_CAPTURE_FATAL);
    bench.Pass();
    bench.SettleEvents();
    EXPECT_EQ(bench.Statistic().nFlags, FELL_BACK);
    EXPECT_TRUE(bench.sink.Notices().empty());
    bench.capturer.SetResult(SHARE_CAPTURE_OK);
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 1u);
}

TEST(FailureOfAPass, DestroysAnOwnCapturerAndGoesOnWithoutOne) {
    CEngineBench<CShareCaptureAppEngine> bench;
    bench.BeginInline();
    auto* const own = new CFakeCapturer(bench.calls);
    bench.engine->GiveOwnCapturer(std::shared_ptr<IShareCapturer>(own));
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_AVFOUNDATION;
    own->SetResult(SHARE_CAPTURE_FATAL);
    bench.Pass();
    EXPECT_EQ(bench.calls.Count("capturer deleted"), 1u);
    EXPECT_EQ(bench.engine->m_eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    bench.Pass();
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
}
