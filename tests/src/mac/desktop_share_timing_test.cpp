// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/desktop_share_bench.h"
#include "tests/src/mac/no_back_end.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <ostream>
#include <string>

// What a desktop share does at which tick.

using namespace platform;

namespace {

using namespace std::chrono_literals;

class DesktopShareTiming : public DesktopShareBench {};

/// The ways of capturing that may turn out not to be there.
class DesktopShareFallback : public DesktopShareBench,
                             public testing::WithParamInterface<SCREEN_CAPTURER_TYPE> {
protected:
    const CNoBackEndScope noBackEnd;
};

} // namespace

// ---- Drags

TEST_F(DesktopShareTiming, HoldsThePictureBackDuringADragAndThenGoesOn) {
    ShareSideWithoutSecrets();
    Tick();
    client.sink.Clear();
    desktop->MoveWindow(SECRET_WINDOW, {215, 15}); // what is seen of the share changes with it
    Tick();
    EXPECT_TRUE(client.sink.WaitForNotice("event 1001 -303"));
    EXPECT_EQ(client.sink.FrameCount(), 0u);
    Tick(2);
    EXPECT_EQ(client.sink.FrameCount(), 0u) << "600 ms are not over";
    EXPECT_TRUE(client.sink.WaitForNotice("event 1001 -303", 3));
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), 1u);
    EXPECT_EQ(client.Last().Count(RED), 0);
    EXPECT_EQ(client.Last().Count(GREEN), 40 * 20);
}

TEST_F(DesktopShareTiming, SendsTheLastPictureAgainAboutEachSecondOfALongDrag) {
    ShareSideWithoutSecrets();
    Tick();
    const CRecordingSink::Frame first = client.sink.Frames().back();
    client.sink.Clear();
    for (int i = 0; i < 12; ++i) {
        desktop->MoveWindow(SECRET_WINDOW, {215, i % 2 == 0 ? 15.0F : 16.0F});
        Tick();
    }
    const std::vector<CRecordingSink::Frame> again = client.sink.Frames();
    ASSERT_EQ(again.size(), 2u) << "after 1200 and 2400 ms";
    for (const CRecordingSink::Frame& frame : again) {
        EXPECT_EQ(frame.frame, first.frame);
        EXPECT_EQ(frame.size, first.size);
        EXPECT_EQ(frame.update, (TVLRect{0, 0, 100, 60}));
    }
    EXPECT_EQ(again[0].timestamp - first.timestamp, 1200u);
    EXPECT_EQ(again[1].timestamp - again[0].timestamp, 1200u);
    EXPECT_TRUE(client.sink.WaitForNotice("event 1001 -303", 10));
    EXPECT_EQ(client.Last().Count(RED), 0);
}

TEST_F(DesktopShareTiming, TakesAChangeOfWhatIsKeptOutForADrag) {
    client.ShareMonitor(SIDE);
    desktop->CloseWindow(WALLPAPER);
    client.Start();
    Tick();
    client.sink.Clear();
    KeepSecrets();
    SettleWorker();
    Tick(3);
    EXPECT_EQ(client.sink.FrameCount(), 0u);
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), 1u);
    EXPECT_EQ(client.Last().Count(RED), 0);
}

// ---- Rates

TEST_F(DesktopShareTiming, TakesItsRateFromTheEngineSinceTheBackEndHasNone) {
    ShareSideWithoutSecrets();
    Tick();
    EXPECT_EQ(client->SetCaptureFps(10), 0);
    SettleWorker();
    client.sink.Clear();
    for (int i = 0; i < 10; ++i)
        Advance(100ms);
    EXPECT_EQ(client.sink.FrameCount(), 10u);
    EXPECT_EQ(client->SetCaptureFps(2), 0);
    SettleWorker();
    client.sink.Clear();
    for (int i = 0; i < 20; ++i)
        Advance(100ms);
    EXPECT_EQ(client.sink.FrameCount(), 4u);
}

TEST_F(DesktopShareTiming, HoldsEqualFramesBackExceptOneAboutEachSecond) {
    ShareSideWithoutSecrets();
    bool isOn = true;
    EXPECT_EQ(client->Config(SHARE_CAPTURE_ENGINE_CONFIG_CHECK_DUP_FRAME, &isOn, sizeof(isOn)), 0);
    SettleWorker();
    Tick();
    client.sink.Clear();
    Tick(6);
    EXPECT_EQ(client.sink.FrameCount(), 0u);
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), 1u) << "1001 ms after the first that was held back";
    desktop->SetContent(EDITOR_WINDOW, SimulatedContent::Colour(TEAL));
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), 2u) << "not equal";
    EXPECT_EQ(client.Last().Count(TEAL), 40 * 20);
}

// ---- Failures

TEST_P(DesktopShareFallback, GoesToTheDefaultAfterFiveSecondsWithoutAPicture) {
    ShareSideWithoutSecrets();
    Tick();
    EXPECT_EQ(client->SetCaptureMode(GetParam()), 0);
    SettleWorker();
    Tick();
    EXPECT_EQ(client.Statistic().eCaptureMode, GetParam());
    const std::size_t before = client.sink.FrameCount();
    EndEvents(*client);
    const std::vector<std::string> notices = client.sink.Notices();
    Tick(25); // five seconds
    EXPECT_EQ(client.sink.FrameCount(), before);
    EXPECT_EQ(settings->GetScreenCapturerType(), GetParam());
    Tick();
    EXPECT_EQ(settings->GetScreenCapturerType(), SCREEN_CAPTURER_TYPE_DEFAULT);
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), before + 1) << "one more pass of the new one";
    const SHARE_CAPTURE_STATISTIC statistic = client.Statistic();
    EXPECT_EQ(statistic.eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(statistic.nFlags & 2u, 2u);
    EndEvents(*client);
    EXPECT_EQ(client.sink.Notices(), notices) << "only the statistics tell of it";
    EXPECT_EQ(client.Last().Size(), (TVLSize{100, 60}));
    EXPECT_EQ(client.Last().meta.rectCapture, (TVLRect{200, 0, 300, 60})) << "of the same monitor";
    EXPECT_EQ(client.Last().Count(RED), 0) << "with the same kept out";
    EXPECT_EQ(client.Last().Count(GREEN), 40 * 20);
}

TEST_P(DesktopShareFallback, IsNotWaitedForByWhoGoesBackBefore) {
    ShareSideWithoutSecrets();
    Tick();
    EXPECT_EQ(client->SetCaptureMode(GetParam()), 0);
    SettleWorker();
    Tick(10);
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    SettleWorker();
    client.sink.Clear();
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), 1u);
    EXPECT_EQ(client.Statistic().nFlags, 0u);
    EXPECT_EQ(client.Last().meta.rectCapture, (TVLRect{200, 0, 300, 60}));
    EXPECT_EQ(client.Last().Count(RED), 0);
}

INSTANTIATE_TEST_SUITE_P(Modes, DesktopShareFallback,
                         testing::Values(SCREEN_CAPTURER_TYPE_AVFOUNDATION,
                                         SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX),
                         [](const auto& each) { return "Mode" + std::to_string(each.param); });

TEST_F(DesktopShareTiming, NeverLeavesTheDefaultHoweverLongItFails) {
    ShareSideWithoutSecrets();
    Tick();
    desktop->FailAlways(SimulatedOperation::TakeWindowPicture);
    const CTraceLog trace;
    const std::size_t before = client.sink.FrameCount();
    Tick(60); // twelve seconds
    EXPECT_EQ(client.sink.FrameCount(), before);
    EXPECT_EQ(client.Statistic().nFlags, 0u);
    EXPECT_EQ(trace.CountContaining("ProcessCapturingFailure"), 0u);
    desktop->Heal(SimulatedOperation::TakeWindowPicture);
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), before + 1);
    EXPECT_EQ(client.Last().Count(RED), 0);
}
