// SPDX-License-Identifier: Apache-2.0
#include "src/app_share_config.h"
#include "src/share_capture_engine_pass.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <limits>
#include <string>
#include <vector>

/// The arithmetic of the statistic, and the lines about progress.

namespace {

using Lines = std::vector<std::string>;

class ShareCaptureStatistic : public testing::Test {
protected:
    ShareCaptureStatistic() {
        bench.BeginInline();
        bench.capturer.SetHook([this](IShareFrame*) { bench.Advance(m_captureTime); });
        bench.sink.SetFrameHook([this](IShareFrame*) { bench.Advance(m_deliverTime); });
    }
    ~ShareCaptureStatistic() override {
        AppShareConfig& config = *AppShareConfig::Instance();
        config.m_nTraceOneByFrames = 100;
        config.m_bRecreateCapturer = false;
        config.m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_DEFAULT;
    }

    void PassTaking(int captureTime, int deliverTime) {
        m_captureTime = captureTime;
        m_deliverTime = deliverTime;
        bench.Pass();
    }

    CEngineBench<> bench;

private:
    int m_captureTime = 0;
    int m_deliverTime = 0;
};

} // namespace

TEST_F(ShareCaptureStatistic, HalvesTheMeanOfCaptureTimesFromFrameToFrame) {
    PassTaking(10, 0);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 10u);
    PassTaking(20, 0);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 15u);
    PassTaking(8, 0);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 11u);
    PassTaking(0, 0);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 5u);
}

TEST_F(ShareCaptureStatistic, TakesTheNextCaptureTimeWholeWhenTheMeanIsZero) {
    PassTaking(0, 0);
    PassTaking(30, 0);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 30u);
}

TEST_F(ShareCaptureStatistic, NeverRestartsTheMeanOfCaptureTimes) {
    for (int frame = 1; frame < 50; ++frame)
        PassTaking(100, 0);
    PassTaking(0, 0);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 50);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 50u);
}

TEST_F(ShareCaptureStatistic, LeavesTheSinksTimeOutOfTheCaptureTime) {
    PassTaking(10, 500);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureCapabilityTime, 10u);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 500);
}

TEST_F(ShareCaptureStatistic, HalvesTheMeanOfDeliveryTimesAndRestartsItEachFiftiethFrame) {
    PassTaking(0, 10);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 10);
    PassTaking(0, 21);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 15);
    for (int frame = 3; frame < 50; ++frame)
        PassTaking(0, 100);
    const int before = bench.Statistic().m_nMsAverageDeliverCapabilityTime;
    EXPECT_GT(before, 90);
    PassTaking(0, 7);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 50);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 7);
    PassTaking(0, 9);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 8);
}

TEST_F(ShareCaptureStatistic, TakesTheNextDeliveryTimeWholeWhenTheMeanIsZero) {
    PassTaking(0, 0);
    PassTaking(0, 40);
    EXPECT_EQ(bench.Statistic().m_nMsAverageDeliverCapabilityTime, 40);
}

TEST_F(ShareCaptureStatistic, MeasuresTheTimeBetweenDeliveredFramesAndRestartsItEachFiftiethFrame) {
    bench.Pass();
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 0) << "one frame has no gap";
    bench.Advance(200);
    bench.Pass();
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 200);
    bench.Advance(101);
    bench.Pass();
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 150);
    for (int frame = 4; frame < 50; ++frame) {
        bench.Advance(200);
        bench.Pass();
    }
    bench.Advance(30);
    bench.Pass();
    EXPECT_EQ(bench.Statistic().nTotalFrames, 50);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 30);
}

TEST_F(ShareCaptureStatistic, CountsTheTimeOfFailedPassesIntoTheGap) {
    bench.Pass();
    bench.capturer.SetResult(-1);
    bench.Advance(200);
    bench.Pass();
    bench.capturer.SetResult(0);
    bench.Advance(200);
    bench.Pass();
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 400);
}

TEST_F(ShareCaptureStatistic, CountsTheDeliveryIntoTheGapOfItsOwnFrame) {
    PassTaking(0, 5);
    bench.Advance(100);
    PassTaking(0, 50);
    EXPECT_EQ(bench.Statistic().m_nMsAverageCaptureTime, 150);
}

TEST_F(ShareCaptureStatistic, KeepsTheSizeOfTheLastFrameAndTracesEachChange) {
    const auto passOf = [this](int width, int height) {
        bench.capturer.Change([=](CFakeCapturer::Answers& answers) { answers.size = {width, height}; });
        bench.Pass();
        EXPECT_EQ(bench.Statistic().nCaptureWidth, width);
        EXPECT_EQ(bench.Statistic().nCaptureHeight, height);
    };
    const auto line = [](const std::string& size) {
        return Info("[CShareCaptureEngine::_CaptureProcess]>>new capture size " + size + ",[Checkpoint]");
    };
    passOf(8, 4);
    passOf(8, 4);
    passOf(9, 4);
    passOf(9, 5);
    passOf(9, 5);
    EXPECT_EQ(bench.trace.LinesContaining("new capture size"),
              (Lines{line("w=8,h=4"), line("w=9,h=4"), line("w=9,h=5")}));
}

TEST_F(ShareCaptureStatistic, TracesNothingAboutTheSizeOfAFrameThatIsEmptyFromTheStart) {
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.size = {0, 0}; });
    bench.Pass();
    EXPECT_FALSE(bench.trace.Contains("new capture size"));
    EXPECT_TRUE(bench.trace.Contains("Capture first Frame w=0,h=0,[Checkpoint]"));
}

TEST_F(ShareCaptureStatistic, TracesEachHundredthFrameAndNothingElseInTheSteadyState) {
    PassTaking(4, 6);
    bench.trace.Clear();
    for (int frame = 2; frame < 100; ++frame)
        PassTaking(4, 6);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
    PassTaking(4, 6);
    EXPECT_EQ(bench.trace.Lines(),
              Lines{Debug("[CShareCaptureEngine::_CaptureProcess]>>Captured TotalFrames=100  "
                          "m_nMsAverageDeliverCapabilityTime(ms)=6  m_nMsAverageCaptureCapabilityTime(ms)=4  "
                          "m_nMsAverageCaptureTime(ms)=10 [CheckPoint]")});
}

TEST_F(ShareCaptureStatistic, TracesAsOftenAsItIsTold) {
    AppShareConfig::Instance()->m_nTraceOneByFrames = 3;
    bench.Passes(10);
    EXPECT_EQ(bench.trace.CountContaining(">>Captured TotalFrames="), 3u);
    EXPECT_TRUE(bench.trace.Contains(">>Captured TotalFrames=9 "));
    EXPECT_EQ(bench.trace.CountContaining("Capture first Frame"), 1u);
}

TEST_F(ShareCaptureStatistic, TracesEveryFrameButTheFirstForAFrequencyOfZero) {
    AppShareConfig::Instance()->m_nTraceOneByFrames = 0;
    bench.Passes(4);
    EXPECT_EQ(bench.trace.CountContaining(">>Captured TotalFrames="), 3u);
    EXPECT_FALSE(bench.trace.Contains(">>Captured TotalFrames=1 "));
}

TEST_F(ShareCaptureStatistic, FlagsTheMagnificationPathOnceItWasSeen) {
    AppShareConfig& config = *AppShareConfig::Instance();
    config.m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_MAG;
    bench.Pass();
    EXPECT_EQ(bench.Statistic().nFlags, 0u);
    config.m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_CGS_GCD;
    config.m_bRecreateCapturer = true;
    bench.Pass();
    EXPECT_EQ(bench.Statistic().nFlags, 0u);
    config.m_nScreenCapturerType = SCREEN_CAPTURER_TYPE_MAG;
    bench.engine->m_statistic.nFlags = 2;
    bench.capturer.SetResult(-1); // a pass without content gets there, too
    bench.Pass();
    EXPECT_EQ(bench.Statistic().nFlags, 3u);
    config.m_bRecreateCapturer = false;
    bench.Pass();
    EXPECT_EQ(bench.Statistic().nFlags, 3u);
}

TEST_F(ShareCaptureStatistic, TellsTheCaptureModeAtTheMomentOfReading) {
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_CGS_GCD;
    EXPECT_EQ(bench.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_CGS_GCD);
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_DEFAULT;
    EXPECT_EQ(bench.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST_F(ShareCaptureStatistic, WrapsAroundLikeTheRestOfItsNumbers) {
    constexpr int LAST = std::numeric_limits<int>::max();
    SHARE_CAPTURE_STATISTIC told{};
    told.nTotalFrames = LAST;
    told.nDuplicateFrames = LAST;
    told.m_nMsAverageDeliverCapabilityTime = LAST;
    told.m_nMsAverageCaptureTime = LAST;
    bench.engine->OnCaptureStatistics(told); // a capturer may tell any
    bench.engine->m_tickLastCapture = ShareTickNow() - 10;
    PassTaking(0, 5);
    EXPECT_EQ(bench.Statistic().nTotalFrames, std::numeric_limits<int>::min());
    bench.engine->m_bCheckDupFrame = true;
    bench.Passes(2);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, std::numeric_limits<int>::min() + 1);
}

TEST(ShareCaptureFps, CountsPassesWithContentOverMoreThanASecondAndCutsTheRate) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Pass(); // opens the window, and is not counted
    EXPECT_EQ(bench.engine->m_tickFpsStart, ShareTickNow());
    EXPECT_EQ(bench.engine->m_nFpsFrames, 0u);
    for (int pass = 1; pass <= 10; ++pass) {
        bench.Advance(100);
        bench.Pass();
    }
    EXPECT_EQ(bench.engine->m_nFpsFrames, 10u) << "1000 ms are not more than a second";
    EXPECT_EQ(bench.Statistic().nCaptureFps, 0);
    bench.Advance(100);
    bench.Pass();                                // closes it, and is not counted either
    EXPECT_EQ(bench.Statistic().nCaptureFps, 9); // 10 in 1.1 s
    EXPECT_EQ(bench.engine->m_nFpsFrames, 0u);
    EXPECT_EQ(bench.engine->m_tickFpsStart, ShareTickNow());
}

TEST(ShareCaptureFps, ClosesItsWindowAfter1001Milliseconds) {
    CEngineBench<> bench;
    bench.engine->CaculateCaptureFps(true);
    for (int i = 0; i < 31; ++i)
        bench.engine->CaculateCaptureFps(true);
    bench.Advance(1001);
    bench.engine->CaculateCaptureFps(true);
    EXPECT_EQ(bench.Statistic().nCaptureFps, 30); // 30.97
    bench.Advance(1001);
    bench.engine->CaculateCaptureFps(false);
    EXPECT_EQ(bench.Statistic().nCaptureFps, 0);
}

TEST(ShareCaptureFps, CountsNoPassWithoutContent) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Pass();
    bench.capturer.ScriptResults({0, -1, -302, -303, -304, 0});
    bench.Passes(6);
    EXPECT_EQ(bench.engine->m_nFpsFrames, 2u);
}

TEST(ShareCaptureFps, CountsDroppedDuplicatesAndResentFrames) {
    CEngineBench<> bench;
    bench.BeginInline();
    bench.Passes(2);
    bench.engine->m_bCheckDupFrame = true;
    bench.engine->m_nFpsFrames = 0;
    bench.Passes(3); // nothing but duplicates
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 3);
    EXPECT_EQ(bench.engine->m_nFpsFrames, 3u);
    bench.engine->m_bForceFrame = true;
    bench.capturer.SetResult(-303);
    bench.Pass();
    EXPECT_EQ(bench.engine->m_nFpsFrames, 4u);
}
