// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_avf_capturer.h"

#include "tests/src/mac/avfoundation/avf_capturer_rig.h"
#include "tests/support/call_on_thread.h"
#include "tests/support/test_effort.h"

#include <malloc.h>
#include <atomic>
#include <iostream>
#include <utility>

/// Who keeps a capturer for how long, and its operations on several threads at once.

namespace {

using namespace platform;

class AVFLife : public CAVFCapturerRig {
protected:
    static std::size_t BytesInUse() {
        const struct mallinfo2 info = mallinfo2();
        return info.uordblks + info.hblkhd;
    }

    /// A whole round, with a picture in it.
    void Round() {
        Start();
        ASSERT_TRUE(TakesPicture());
        ASSERT_EQ(capturer->stopRun(), 0);
        while (Capture() == OK)
            ;
        ASSERT_TRUE(Shares(1));
    }
};

/// A frame that holds back whoever stamps it.
class CSlowFrame final : public CShareFrame {
public:
    void SetTimestamp(unsigned timestamp) override {
        reached.Add();
        EXPECT_TRUE(gate.Passes());
        CShareFrame::SetTimestamp(timestamp);
    }

    CTally reached;
    CGate gate;
};

} // namespace

TEST_F(AVFLife, LastsWhileItsSessionIsRunningWhoeverLetsItGo) {
    StartAndTake();
    ShareAVFCapturer* const raw = capturer.get();
    const std::weak_ptr<ShareAVFCapturer> watched = std::exchange(capturer, nullptr);
    EXPECT_FALSE(watched.expired());
    EXPECT_TRUE(raw->isRunning());
    capturer = watched.lock();
    ASSERT_NE(capturer, nullptr);
    Paint(GREEN);
    ASSERT_TRUE(TakesPicture()) << "and takes samples in";
    EXPECT_EQ(capturer->stopRun(), 0);
    capturer = nullptr;
    EXPECT_TRUE(Comes([&] { return watched.expired(); }));
}

TEST_F(AVFLife, EndsWithItsQueueAfterTheOwnerHasLetItGo) {
    Init();
    EXPECT_EQ(capturer->createVideoInputAndOutput(), 0);
    const CTraceLog trace;
    const std::weak_ptr<ShareAVFCapturer> watched = capturer;
    End();
    EXPECT_TRUE(Comes([&] { return watched.expired(); }));
    EXPECT_TRUE(trace.WaitUntilContains("[ShareAVFCapturer dealloc]"));
    EXPECT_TRUE(trace.Contains("[ShareAVFCapturer captureCleanup]"));
}

TEST_F(AVFLife, OfASessionThatDiedIsEndedByDestroyingInputAndOutput) {
    StartAndTake();
    Die();
    const std::weak_ptr<ShareAVFCapturer> watched = capturer;
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_EQ(capturer.use_count(), 2);
    EXPECT_EQ(capturer->destroyVideoInputAndOutput(), 0);
    capturer = nullptr;
    EXPECT_TRUE(Comes([&] { return watched.expired(); }));
}

TEST_F(AVFLife, EndsARunningSessionThatHasNoQueue) {
    Init();
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    EXPECT_TRUE(capturer->isRunning());
    EXPECT_EQ(capturer.use_count(), 1);
    const auto threads = CountThreadsOfProcess();
    capturer = nullptr;
    EXPECT_EQ(WaitForThreadsOfProcess(threads - 1), threads - 1);
}

TEST_F(AVFLife, IsToldNothingAfterItsEnd) {
    StartAndTake();
    EXPECT_EQ(capturer->stopRun(), 0);
    EXPECT_TRUE(Shares(1));
    capturer = nullptr;
    const CTraceLog trace;
    desktop->Lose();
    Advance(1000);
    EXPECT_EQ(trace.LinesContaining("[ShareAVFCapturer"), Lines{});
}

TEST_F(AVFLife, LeavesNothingBehindHoweverOftenItIsStartedAndStopped) {
    constexpr int WARM_UP = 20;
    for (int i = 0; i < WARM_UP; ++i)
        Round();
    const auto threads = CountThreadsOfProcess();
    const std::size_t bytes = BytesInUse();
    const int rounds = TestRounds(500);
    for (int i = 0; i < rounds; ++i)
        Round();
    std::cout << rounds << " rounds, " << bytes << " bytes before, " << BytesInUse() << " after\n";
    EXPECT_TRUE(ThreadsComeDownTo(threads));
    constexpr std::size_t ROOM = 64 * 1024;
    EXPECT_LE(BytesInUse(), bytes + ROOM);
    const std::weak_ptr<ShareAVFCapturer> watched = std::exchange(capturer, nullptr);
    EXPECT_TRUE(watched.expired());
}

TEST_F(AVFLife, LeavesNothingBehindHoweverOftenItDies) {
    for (int i = 0; i < TestRounds(20); ++i) {
        const std::weak_ptr<ShareAVFCapturer> watched = capturer;
        StartAndTake();
        Die();
        End();
        ASSERT_TRUE(Comes([&] { return watched.expired(); }));
        desktop->FindAgain();
        capturer = std::make_shared<ShareAVFCapturer>();
    }
}

// ---- Several threads

TEST_F(AVFLife, StopsWhileASampleWaitsForTheCopyOfAnother) {
    Start();
    auto* const slow = new CSlowFrame;
    const FrameRef holder(slow);
    unsigned code = NO_DATA;
    CCallOnThread copy([&] {
        EXPECT_TRUE(Comes([&] {
            code = capturer->captureToIShareFrame(slow);
            return code != NO_DATA;
        }));
    });
    ASSERT_TRUE(slow->reached.Reaches(1));
    const unsigned looks = Looks();
    Paint(GREEN);
    ASSERT_TRUE(Comes([&] { return Looks() > looks; }));
    CCallOnThread stop([&] { EXPECT_EQ(capturer->stopRun(), 0); });
    stop.UntilItWaits();
    capturer->isRunning();
    slow->gate.Open();
    ASSERT_TRUE(Comes([&] { return stop.HasReturned() && copy.HasReturned(); }));
    EXPECT_EQ(code, OK);
    EXPECT_FALSE(capturer->isRunning());
}

TEST_F(AVFLife, TellsWhetherItRunsWhileItIsBeingStopped) {
    StartAndTake();
    CGate gate;
    CTally inside;
    script->Do(Operation::StopRunning, [&] {
        inside.Add();
        EXPECT_TRUE(gate.Passes());
    });
    const CCallOnThread stop([&] { EXPECT_EQ(capturer->setInputDisplay(SIDE), 0); });
    ASSERT_TRUE(inside.Reaches(1));
    EXPECT_TRUE(capturer->isRunning());
    CCallOnThread scale([&] { capturer->setScale({20, 15}); });
    scale.UntilItWaits();
    EXPECT_FALSE(scale.HasReturned()) << "a display change is one change";
    gate.Open();
}

TEST_F(AVFLife, EndsEveryChangeOnTwoThreadsWithPicturesOfTheLastDisplay) {
    const int rounds = TestRounds(600);
    Start();
    std::atomic<bool> isOver{false};
    // The notice thread's part; pictures, rates, sizes, starts and stops are the capture thread's.
    std::thread notices([&] {
        for (int i = 0; i < rounds; ++i)
            capturer->setInputDisplay(i % 2 == 0 ? SIDE : MAIN);
        isOver = true;
    });
    int passes = 0;
    for (; !isOver; ++passes) {
        Capture();
        capturer->setFPS(10 + passes % 50);
        capturer->setScale({20 + passes % 20, 20});
        if (passes % 7 == 0)
            capturer->beginAnew();
        if (passes % 11 == 0) {
            capturer->stopRun();
            capturer->startRun();
        }
        ASSERT_TRUE(
            desktop->SetContent(WINDOW, SimulatedContent::Colour(static_cast<std::uint32_t>(passes))));
        Advance(40);
    }
    notices.join();
    std::cout << rounds << " display changes, " << passes << " passes\n";
    capturer->stopRun();
    while (Capture() == OK)
        ;
    EXPECT_EQ(capturer->setInputDisplay(SIDE), 0);
    capturer->stopRun();
    while (Capture() == OK)
        ;
    Start();
    capturer->setScale({20, 20});
    ASSERT_TRUE(TakesPicture());
    EXPECT_EQ(Rgb(5, 5), BLUE);
    EXPECT_TRUE(Shares(2)) << "of all the queues one is left";
}
