// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/avfoundation/session_bench.h"
#include "tests/src/mac/desktop_share_bench.h"
#include "tests/support/sanitizer.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>

// Shares in the modes of sessions where it comes to exact times, or to failures that no other desktop can be
// made to have.

using namespace platform;

namespace {

using namespace std::chrono_literals;

class SessionShareEdges : public DesktopShareBench, public testing::WithParamInterface<SCREEN_CAPTURER_TYPE> {
protected:
    void ShareSideInMode() {
        client.ShareMonitor(SIDE);
        KeepSecrets();
        EXPECT_EQ(client->SetCaptureMode(GetParam()), 0);
        client.Start();
    }
    void TickAndAwait() {
        Tick();
        AwaitAllSamples();
    }
    void TickWithSample() {
        Repaint();
        TickAndAwait();
    }
    /// A pass that finds just the sample of the tick before: the next one is made behind it.
    void TickWithOneSample() {
        Repaint();
        const auto gate = std::make_shared<CGate>();
        desktop->DoAt(SimulatedOperation::TakeNewest, 1, [gate] { EXPECT_TRUE(gate->Passes()); });
        Tick();
        gate->Open();
        AwaitAllSamples();
    }
    void TicksWithOneSample(int count) {
        for (int i = 0; i < count; ++i)
            TickWithOneSample();
    }
    /// From here on there are frames, and no sample is waiting.
    void ShowSide() {
        ShareSideInMode();
        Repaint();
        const int text = GetParam() == SCREEN_CAPTURER_TYPE_AVFOUNDATION ? 40 * 20 - 20 * 10 : 40 * 20;
        for (int i = 0; i < 20 && client.Last().Count(m_colour) != text; ++i)
            TickAndAwait();
        ASSERT_EQ(client.Last().Count(m_colour), text);
        EXPECT_EQ(client.Last().Count(RED), 0);
    }
    void Repaint() {
        m_colour ^= 1;
        EXPECT_TRUE(desktop->SetContent(EDITOR_WINDOW, SimulatedContent::Colour(m_colour)));
    }

    CSessionScriptScope script;

private:
    std::uint32_t m_colour = GREEN;
};

INSTANTIATE_TEST_SUITE_P(Modes, SessionShareEdges,
                         testing::Values(SCREEN_CAPTURER_TYPE_AVFOUNDATION,
                                         SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX),
                         [](const auto& each) { return "Mode" + std::to_string(each.param); });

} // namespace

TEST_P(SessionShareEdges, FallBackAfterFiveSecondsOfSamplesThatCannotBeOpened) {
    ShowSide();
    TickWithOneSample(); // which waits then
    script->Fail(AVCaptureOperation::LockBaseAddress, 1, AVCaptureScript::ALL);
    const std::size_t before = client.sink.FrameCount();
    TickWithOneSample();
    TicksWithOneSample(25); // five seconds
    EXPECT_EQ(client.Statistic().eCaptureMode, GetParam());
    EXPECT_EQ(client.sink.FrameCount(), before);
    TickWithSample(); // ends the session, which must not be held up then
    EXPECT_EQ(client.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(client.Statistic().nFlags & 2u, 2u);
    Tick();
    EXPECT_EQ(client.sink.FrameCount(), before + 1);
    EXPECT_EQ(client.Last().meta.rectCapture, (TVLRect{200, 0, 300, 60})) << "of the same monitor";
    EXPECT_EQ(client.Last().Count(RED), 0) << "with the same kept out";
}

TEST_P(SessionShareEdges, StayInTheirModeWhenASampleOpensWithinFiveSeconds) {
    ShowSide();
    TickWithOneSample(); // which waits then
    for (int i = 0; i < 2; ++i) {
        script->Fail(AVCaptureOperation::LockBaseAddress, 1, AVCaptureScript::ALL);
        TicksWithOneSample(20);
        script->Heal(AVCaptureOperation::LockBaseAddress);
        const std::size_t before = client.sink.FrameCount();
        TickWithOneSample();
        EXPECT_EQ(client.sink.FrameCount(), before + 1);
    }
    EXPECT_EQ(client.Statistic().eCaptureMode, GetParam());
    EXPECT_EQ(client.Statistic().nFlags, 0u);
}

TEST_P(SessionShareEdges, StayWithASessionThatDoesNotStart) {
    script->Fail(AVCaptureOperation::StartRunning, 1, AVCaptureScript::ALL);
    ShareSideInMode();
    for (int i = 0; i < 40; ++i)
        TickAndAwait();
    EXPECT_EQ(client.sink.FrameCount(), 0u);
    EXPECT_EQ(client.Statistic().eCaptureMode, GetParam()) << "nothing new is no failure";
    EXPECT_EQ(client.Statistic().nFlags, 0u);
}

TEST_P(SessionShareEdges, SendTheLastPictureAgainAboutEachSecondWhileNothingChanges) {
    ShowSide();
    client.sink.Clear();
    for (int i = 0; i < 12; ++i)
        TickAndAwait();
    EXPECT_EQ(client.sink.FrameCount(), 2u) << "after 1200 and 2400 ms";
    EXPECT_EQ(client.Last().Count(RED), 0);
}

TEST_P(SessionShareEdges, HaveSamplesMadeAtTheRateOfTheirClient) {
    ShowSide();
    EXPECT_EQ(client->SetCaptureFps(10), 0);
    SettleWorker();
    TickAndAwait();
    const unsigned before = desktop->CallsOf(SimulatedOperation::TakeNewest);
    for (int i = 0; i < 40; ++i) {
        clock->Advance(50ms);
        AwaitAllSamples();
    }
    const unsigned looks = desktop->CallsOf(SimulatedOperation::TakeNewest) - before;
    EXPECT_GE(looks, 19u);
    EXPECT_LE(looks, 21u) << "in two seconds";
}

TEST_P(SessionShareEdges, ShowNoSecretWhicheverCallToTheWindowServerFails) {
    // Each call, or each fifth where a sanitizer makes all of them take too long.
    constexpr unsigned STRIDE = SCREENSHARE_TEST_SANITIZED != 0 ? 5 : 1;
    ShowSide();
    int shown = 0;
    for (const SimulatedOperation operation :
         {SimulatedOperation::GetLife, SimulatedOperation::GetWindows, SimulatedOperation::GetDisplays,
          SimulatedOperation::GetPointerPosition, SimulatedOperation::TakeWindowPicture}) {
        for (unsigned nth = 1; nth <= 40; nth += STRIDE) {
            const std::size_t before = client.sink.FrameCount();
            desktop->FailNth(operation, nth, PictureOutcome::Failed);
            TickWithSample();
            desktop->Heal(operation);
            ASSERT_EQ(client.Last().Count(RED), 0) << static_cast<int>(operation) << " call " << nth;
            shown += client.sink.FrameCount() > before ? 1 : 0;
            for (int i = 0; i < 4; ++i)
                TickWithSample();
        }
    }
    EXPECT_GT(shown, static_cast<int>(50 / STRIDE));
    EXPECT_EQ(client.Statistic().eCaptureMode, GetParam());
}
