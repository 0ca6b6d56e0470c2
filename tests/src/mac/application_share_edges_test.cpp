// SPDX-License-Identifier: Apache-2.0
#include "tests/src/mac/busy_desk.h"
#include "tests/src/mac/desktop_share_client.h"
#include "tests/src/mac/no_back_end.h"
#include "tests/support/engine_bench.h"
#include "tests/support/test_effort.h"

#include <gtest/gtest.h>

#include <atomic>
#include <chrono>
#include <cstddef>
#include <iostream>
#include <string>
#include <thread>
#include <vector>

// Shares of applications and windows where it comes to exact times, and to what becomes of a share whose
// capturer is replaced.

using namespace platform;

namespace {

constexpr unsigned EDITOR = 5'000'100;
constexpr CGWindowID TEXT = 1;
constexpr CGWindowID NOTES = 2;
constexpr std::uint32_t GREEN = 0x00FF00;
constexpr std::uint32_t BLUE = 0x0000FF;
constexpr int TEXT_PIXELS = 60 * 40;

/// Text and notes of an editor on two displays, the text in front.
Scene EditorOnTwoDisplays() {
    return Scene()
        .Display(0, 0, 200, 120)
        .Display(200, 0, 100, 60)
        .App(static_cast<pid_t>(EDITOR), "Editor")
        .Window(NOTES)
        .At(210, 10, 50, 30)
        .Colour(BLUE)
        .Window(TEXT)
        .At(20, 30, 60, 40)
        .Colour(GREEN)
        .Pointer(1000, 1000);
}

class FollowedShareEdges : public testing::TestWithParam<SHARE_CAPTURE_ENGINE_TYPE> {
protected:
    void Share() {
        if (GetParam() == SHARE_CAPTURE_ENGINE_TYPE_APP) {
            EXPECT_EQ(client->AddSharedProcess(EDITOR), 0);
        } else {
            EXPECT_EQ(client->AddSharedWindow(NOTES), 0);
            EXPECT_EQ(client->AddSharedWindow(TEXT), 0);
        }
    }
    void ShareAndStart() {
        Share();
        client.Start();
    }
    /// A period of 200 ms, the rate of an engine that nobody has told another.
    void Tick() {
        clock->Advance(std::chrono::milliseconds(200));
        Settle(*WorkerOf(*client));
    }
    void Ticks(int count) {
        for (int i = 0; i < count; ++i)
            Tick();
    }
    /// The text, for as long as the capturer stays with the main display.
    [[nodiscard]] bool TickUntilTextIsShown() {
        const std::size_t before = client.sink.FrameCount();
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (client.sink.FrameCount() == before || client.Last().Count(GREEN) != TEXT_PIXELS) {
            if (std::chrono::steady_clock::now() > deadline)
                return false;
            Tick();
        }
        return true;
    }
    bool IsTextShared() {
        return GetParam() == SHARE_CAPTURE_ENGINE_TYPE_APP ? client->IsAppShared(EDITOR)
                                                           : client->IsWindowShared(TEXT);
    }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{EditorOnTwoDisplays()};
    CShareClient client{GetParam()};
};

std::string KindName(const testing::TestParamInfo<SHARE_CAPTURE_ENGINE_TYPE>& each) {
    return each.param == SHARE_CAPTURE_ENGINE_TYPE_APP ? "application" : "window";
}

class ApplicationShareEdges : public FollowedShareEdges {};

} // namespace

TEST_P(FollowedShareEdges, TellsOfACrossingAtTheFirstPassMoreThanASecondLater) {
    ShareAndStart();
    const CTraceLog trace;
    const std::string told = "[CShareCaptureEngine::OnCaptureEvent, eventType=1";
    // The first pass walks, the second one sees what it has found: five more are just a second later.
    Ticks(7);
    EXPECT_FALSE(trace.Contains(told));
    Tick();
    EXPECT_EQ(trace.CountContaining(told), 1u);
    EXPECT_TRUE(client.sink.WaitForNotice("event 1 1"));
    Ticks(10);
    EXPECT_EQ(trace.CountContaining(told), 1u);
}

TEST_P(FollowedShareEdges, TellsNothingOfWhatMovesOnTheSameDisplay) {
    ShareAndStart();
    ASSERT_TRUE(TickUntilTextIsShown());
    Ticks(10);
    const CTraceLog trace;
    desktop->MoveWindow(TEXT, {100, 50});
    Ticks(10);
    EXPECT_EQ(client.Last().At(100, 50), Rgb(GREEN));
    EXPECT_EQ(trace.CountContaining("OnCaptureEvent, eventType=1"), 0u);
    EXPECT_FALSE(trace.Contains("OnCapturePositionChanged"));
    EXPECT_FALSE(trace.Contains("AddSharedDisplay"));
}

TEST_P(FollowedShareEdges, KeepsWhatIsSharedWhenItFallsBackToTheModeThatWorks) {
    ShareAndStart();
    ASSERT_TRUE(TickUntilTextIsShown());
    const CNoBackEndScope noBackEnd;
    EXPECT_EQ(client->SetCaptureMode(CNoBackEndScope::MODE), 0);
    Ticks(20);
    EXPECT_EQ(client.Statistic().eCaptureMode, CNoBackEndScope::MODE);
    EXPECT_TRUE(IsTextShared());
    ASSERT_TRUE(TickUntilTextIsShown());
    EXPECT_EQ(client.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_EQ(client.Statistic().nFlags, 2u);
    EXPECT_TRUE(IsTextShared());
    EXPECT_EQ(client.Last().Size(), (TVLSize{200, 120}));
    EXPECT_EQ(client.Last().Count(BLUE), 0) << "that is on the other display";
}

TEST_P(FollowedShareEdges, FollowsAgainOnceItsCapturerWasReplaced) {
    ShareAndStart();
    ASSERT_TRUE(TickUntilTextIsShown());
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION), 0);
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    ASSERT_TRUE(TickUntilTextIsShown());
    desktop->RaiseWindow(NOTES);
    Ticks(10);
    EXPECT_EQ(client.Last().Size(), (TVLSize{100, 60}));
    EXPECT_EQ(client.Last().Count(BLUE), 50 * 30);
}

INSTANTIATE_TEST_SUITE_P(Kinds, FollowedShareEdges,
                         testing::Values(SHARE_CAPTURE_ENGINE_TYPE_APP, SHARE_CAPTURE_ENGINE_TYPE_WINDOW),
                         KindName);

TEST_P(ApplicationShareEdges, FallsBackFromAModeThatHasNoApplicationToShow) {
    EXPECT_EQ(client->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD), 0);
    ShareAndStart();
    ASSERT_TRUE(TickUntilTextIsShown());
    EXPECT_EQ(client->RemoveSharedProcess(EDITOR), 0);
    Settle(*WorkerOf(*client)); // which does it
    Tick();
    EXPECT_TRUE(client.sink.WaitForNotice("error -204"));
    const std::size_t before = client.sink.FrameCount();
    Ticks(25);
    EXPECT_EQ(client.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_CGS_GCD) << "that was 5 s";
    EXPECT_EQ(client.sink.FrameCount(), before);
    Ticks(2);
    EXPECT_EQ(client.Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
    EXPECT_TRUE(client.sink.WaitForNotice("error -204", 26)) << "one at each pass";
}

INSTANTIATE_TEST_SUITE_P(Kinds, ApplicationShareEdges, testing::Values(SHARE_CAPTURE_ENGINE_TYPE_APP),
                         KindName);

// ---- Lives

namespace {

/// What a share of that kind has shown of red while its capturer was replaced now and then, on a desktop that
/// never rests.
struct Lives {
    std::size_t frames = 0;
    int leaks = 0;
};

void LiveOnce(SHARE_CAPTURE_ENGINE_TYPE type, CManualClockScope& clock, int life, Lives& lives) {
    CShareClient client(type);
    if (type == SHARE_CAPTURE_ENGINE_TYPE_APP) {
        client->AddSharedProcess(static_cast<unsigned>(busy_desk::KEPT));
    } else {
        client->AddSharedWindow(1);
        client->AddSharedWindow(2);
    }
    client.Start();
    for (int tick = 0; tick < 12; ++tick) {
        clock->Advance(std::chrono::milliseconds(501));
        Settle(*WorkerOf(*client));
        if (tick % 4 == life % 4)
            client->SetCaptureMode(SCREEN_CAPTURER_TYPE_AVFOUNDATION);
        if (tick % 4 == (life + 1) % 4)
            client->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT);
        lives.leaks += client.Last().Count(0xFF0000);
    }
    lives.frames += client.sink.FrameCount();
}

} // namespace

TEST(ApplicationShareHammer, EndsCleanlyWhileDisplaysChangeAndCapturersAreReplaced) {
    constexpr unsigned SEED = 815;
    const int count = TestRounds(20);
    CManualClockScope clock;
    const CSettingsScope settings;
    const CServedScene desktop(busy_desk::BusyDesk());
    std::atomic<bool> isOver{false};
    std::thread other([&] {
        busy_desk::CUnrest unrest(*desktop.operator->(), SEED);
        while (!isOver)
            unrest.Step();
    });
    Lives lives;
    for (int life = 0; life < count; ++life) {
        LiveOnce(SHARE_CAPTURE_ENGINE_TYPE_APP, clock, life, lives);
        LiveOnce(SHARE_CAPTURE_ENGINE_TYPE_WINDOW, clock, life, lives);
    }
    isOver = true;
    other.join();
    std::cout << 2 * count << " lives, seed " << SEED << ": " << lives.frames << " frames\n";
    EXPECT_EQ(lives.leaks, 0);
    EXPECT_GT(lives.frames, static_cast<std::size_t>(count));
}
