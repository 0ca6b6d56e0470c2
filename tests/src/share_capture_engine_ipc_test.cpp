// SPDX-License-Identifier: Apache-2.0
#include "src/share_capture_engine_pass.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

/// The pass of an engine whose capturer lives in another process.

namespace {

using Lines = std::vector<std::string>;

constexpr unsigned BOTH = SHARE_CAPTURE_MASK_CONTENT | SHARE_CAPTURE_MASK_POINTER;

class ShareIpcPass : public testing::Test {
protected:
    ShareIpcPass() { bench.BeginInline(); }

    CEngineBench<CIpcEngine> bench{true};
};

} // namespace

TEST_F(ShareIpcPass, RunsOnNoneOfTheLibrarysEngines) {
    EXPECT_FALSE(CShareCaptureEngine().IsIpcCapturer());
    EXPECT_FALSE(CShareCaptureDesktopEngine().IsIpcCapturer());
    EXPECT_FALSE(CShareCaptureAppEngine().IsIpcCapturer());
    EXPECT_FALSE(CShareCaptureWindowEngine().IsIpcCapturer());
}

TEST_F(ShareIpcPass, AsksForNeitherPointerNorScale) {
    bench.Pass(BOTH);
    EXPECT_EQ(bench.calls.Calls(), (Lines{"SetCaptureMaxSize 2880x1800", "Capture", "OnCaptureData"}));
}

TEST_F(ShareIpcPass, DeliversTheCurrentFrameAndExchangesTheTwo) {
    IShareFrame* const a = bench.engine->m_pShareFrameA;
    IShareFrame* const b = bench.engine->m_pShareFrameB;
    bench.engine->m_bForceFrame = true;
    bench.engine->m_nUnavailableTimes = 3;
    bench.Pass(BOTH);
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.size = {16, 9}; });
    bench.Pass(BOTH);
    const std::vector<CRecordingSink::Frame> frames = bench.sink.Frames();
    ASSERT_EQ(frames.size(), 2u);
    EXPECT_EQ(frames[0].frame, a);
    EXPECT_EQ(frames[1].frame, b);
    EXPECT_EQ(frames[0].update, (TVLRect{0, 0, 8, 4}));
    EXPECT_EQ(frames[1].update, (TVLRect{0, 0, 16, 9}));
    EXPECT_EQ(bench.engine->m_pCurShareFrame, a);
    EXPECT_EQ(bench.engine->m_rcLastUpdate, (TVLRect{0, 0, 16, 9}));
    EXPECT_FALSE(bench.engine->m_bForceFrame);
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 0);
}

TEST_F(ShareIpcPass, ChecksNoDuplicatesAndKeepsNoStatistic) {
    bench.engine->m_bCheckDupFrame = true;
    bench.Passes(3, BOTH);
    EXPECT_EQ(bench.sink.FrameCount(), 3u);
    EXPECT_EQ(bench.Statistic().nTotalFrames, 0);
    EXPECT_EQ(bench.Statistic().nDuplicateFrames, 0);
    EXPECT_EQ(bench.Statistic().nCaptureWidth, 0);
    EXPECT_EQ(bench.engine->m_tickFpsStart, 0u);
    EXPECT_EQ(bench.engine->m_tickLastCapture, 0u);
    EXPECT_EQ(bench.trace.Lines(), Lines{});
}

TEST_F(ShareIpcPass, SendsThePreviousFrameAgainOnlyWhenAFrameIsForced) {
    for (const int result : {-302, -303, -304}) {
        SCOPED_TRACE(result);
        bench.capturer.SetResult(0);
        bench.Pass(BOTH);
        IShareFrame* const delivered = bench.sink.Frames().back().frame;
        IShareFrame* const current = bench.engine->m_pCurShareFrame;
        bench.capturer.SetResult(result);
        bench.Advance(5000);
        bench.sink.Clear();
        bench.Pass(BOTH);
        EXPECT_EQ(bench.sink.FrameCount(), 0u) << "no time makes a frame due here";
        bench.engine->m_bForceFrame = true;
        bench.engine->m_rcLastUpdate = {1, 1, 3, 2};
        bench.Pass(BOTH);
        ASSERT_EQ(bench.sink.FrameCount(), 1u);
        EXPECT_EQ(bench.sink.Frames()[0].frame, delivered);
        EXPECT_EQ(bench.sink.Frames()[0].timestamp, ShareTickNow());
        EXPECT_EQ(bench.sink.Frames()[0].update, (TVLRect{1, 1, 3, 2}));
        EXPECT_EQ(bench.engine->m_pCurShareFrame, current);
        EXPECT_FALSE(bench.engine->m_bForceFrame);
    }
}

TEST_F(ShareIpcPass, SendsNothingForAnyOtherResult) {
    bench.Pass(BOTH);
    bench.Forget();
    bench.engine->m_bForceFrame = true;
    bench.capturer.ScriptResults({-1, -7, -203, 5});
    bench.Passes(4, BOTH);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{});
}

TEST_F(ShareIpcPass, SendsNothingAgainWithoutAPreviousFrame) {
    IShareFrame* const b = bench.engine->m_pShareFrameB;
    bench.engine->m_pShareFrameB = nullptr;
    bench.engine->m_bForceFrame = true;
    bench.capturer.SetResult(-303);
    bench.Pass(BOTH);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
    EXPECT_TRUE(bench.engine->m_bForceFrame);
    bench.engine->m_pShareFrameB = b;
}

TEST_F(ShareIpcPass, TellsNoEventOfMissingContent) {
    bench.capturer.SetResult(-303);
    bench.Passes(6, BOTH);
    bench.SettleEvents();
    EXPECT_EQ(bench.sink.Notices(), Lines{});
    EXPECT_EQ(bench.trace.Lines(), Lines{});
    EXPECT_EQ(bench.engine->m_nUnavailableTimes, 0);
}

TEST_F(ShareIpcPass, TellsTheFailureAccounting) {
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_AVFOUNDATION;
    bench.capturer.ScriptResults({-1, -304, -303, 0});
    bench.Passes(2, BOTH);
    EXPECT_EQ(bench.engine->m_nFailureCount, 2);
    bench.Pass(BOTH);
    EXPECT_NE(bench.engine->m_tickDragStart, 0u);
    bench.Pass(BOTH);
    EXPECT_EQ(bench.engine->m_nFailureCount, 0);
}

TEST_F(ShareIpcPass, EndsWithoutACaptureWhenTheSizeIsRefused) {
    bench.capturer.Change([](CFakeCapturer::Answers& answers) { answers.maxSizeResult = -1; });
    bench.engine->m_bForceFrame = true;
    bench.Pass(BOTH);
    EXPECT_EQ(bench.calls.Calls(), Lines{"SetCaptureMaxSize 2880x1800"});
    EXPECT_EQ(bench.trace.Lines(), Lines{});
}

TEST_F(ShareIpcPass, CountsAnExceptionAsAFailedCapture) {
    bench.engine->m_eCaptureMode = SCREEN_CAPTURER_TYPE_AVFOUNDATION;
    bench.capturer.SetHook([](IShareFrame*) { throw 42; });
    bench.Pass(BOTH);
    EXPECT_EQ(bench.engine->m_nFailureCount, 1);
    EXPECT_EQ(bench.sink.FrameCount(), 0u);
}

TEST_F(ShareIpcPass, MakesTheSameThreeChecksAsAnyPass) {
    bench.engine->m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_PAUSED;
    bench.Pass(BOTH);
    bench.engine->m_eSHARE_CAPTURE_ENGINE_STATUS = SHARE_CAPTURE_ENGINE_STATUS_STARTED;
    EXPECT_EQ(bench.engine->SetSink(nullptr), 0);
    bench.Pass(BOTH);
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST_F(ShareIpcPass, TracesAMissingFrame) {
    bench.engine->m_pCurShareFrame = nullptr;
    bench.Pass(BOTH);
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_TRUE(IsLineAt(lines[0], Error("[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=0x0"),
                         "src/share_capture_engine_ipc"));
    EXPECT_TRUE(bench.calls.Calls().empty());
}

TEST_F(ShareIpcPass, TracesAMissingCapturer) {
    bench.engine->m_pIShareCapturerExternal = nullptr;
    bench.Pass(BOTH);
    const Lines lines = bench.trace.Lines();
    ASSERT_EQ(lines.size(), 1u);
    EXPECT_EQ(lines[0].find(Error("[CShareCaptureEngine::_IpcCaptureProcess]>>pIShareFrame=0x")), 0u);
    const std::string end = ">>pIShareCapturer=0x0";
    const std::string text = WithoutSourcePlace(lines[0]);
    ASSERT_GE(text.size(), end.size());
    EXPECT_EQ(text.substr(text.size() - end.size()), end);
    EXPECT_EQ(SplitSourcePlace(lines[0])->path, "src/share_capture_engine_ipc");
}
