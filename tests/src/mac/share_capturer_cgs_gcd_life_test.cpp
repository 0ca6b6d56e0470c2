// SPDX-License-Identifier: Apache-2.0
#include "src/share_source.h"
#include "tests/src/mac/desktop_share_bench.h"
#include "tests/src/mac/queued_backend_bench.h"
#include "tests/support/engine_bench.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cstddef>
#include <memory>
#include <optional>

// The ends of queued back-ends, with captures on their way.

using namespace platform;

namespace {

/// Gives the test's share of the back-end up.
class QueuedEnds : public QueuedBackEnd {
protected:
    std::weak_ptr<ShareCapturerCGSGCD> GiveUp() {
        const std::weak_ptr<ShareCapturerCGSGCD> watched = backEnd;
        backEnd = nullptr;
        return watched;
    }
};

/// A back-end that tells on which thread it ends.
class WatchedBackEnd final : public ShareCapturerCGSGCD {
public:
    explicit WatchedBackEnd(std::shared_ptr<CTally> ends, std::shared_ptr<std::thread::id> where)
        : m_ends(std::move(ends)),
          m_where(std::move(where)) {}
    ~WatchedBackEnd() override {
        *m_where = std::this_thread::get_id();
        m_ends->Add();
    }

private:
    const std::shared_ptr<CTally> m_ends;
    const std::shared_ptr<std::thread::id> m_where;
};

} // namespace

TEST_F(QueuedEnds, ComeAtOnceWithNothingOnItsWay) {
    EXPECT_EQ(Tick(), NOT_READY);
    ASSERT_TRUE(Settles());
    EXPECT_TRUE(GiveUp().expired());
}

TEST_F(QueuedEnds, WaitForCapturesOnTheirWayAndLeaveNothing) {
    for (int i = 0; i < 5; ++i)
        BeginPicture(300);
    const std::weak_ptr<ShareCapturerCGSGCD> watched = GiveUp();
    EXPECT_EQ(watched.use_count(), 5) << "each has one";
    const std::weak_ptr<ShareCapturerContext> contextWatched = context;
    context = nullptr;
    Advance(300);
    EXPECT_TRUE(Comes([&] { return watched.expired(); }));
    EXPECT_TRUE(Comes([&] { return contextWatched.expired(); }));
    EXPECT_EQ(Pictures(), 5u);
}

TEST_F(QueuedEnds, ComeOnAThreadOfTheQueueWithoutWaitingForIt) {
    const auto ends = std::make_shared<CTally>();
    const auto where = std::make_shared<std::thread::id>();
    backEnd = std::make_shared<WatchedBackEnd>(ends, where);
    ASSERT_TRUE(backEnd->init(context));
    BeginPicture(300);
    GiveUp();
    EXPECT_EQ(ends->Count(), 0);
    Advance(300);
    ASSERT_TRUE(ends->Reaches(1));
    EXPECT_NE(*where, std::this_thread::get_id());
    platform::Rest();
}

TEST_F(QueuedEnds, ComeAfterCapturesThatHaveNotBegun) {
    std::optional<CClog> clog(std::in_place);
    for (int i = 0; i < 3; ++i)
        EXPECT_EQ(Tick(), NOT_READY);
    const std::weak_ptr<ShareCapturerCGSGCD> watched = GiveUp();
    EXPECT_EQ(watched.use_count(), 3);
    clog.reset();
    EXPECT_TRUE(Comes([&] { return watched.expired(); }));
}

TEST_F(QueuedEnds, LeaveNoThread) {
    platform::Rest();
    const std::ptrdiff_t threads = CountThreadsOfProcess();
    for (int i = 0; i < 3; ++i)
        BeginPicture(300);
    GiveUp();
    Advance(300);
    platform::Rest();
    EXPECT_LE(WaitForThreadsOfProcess(threads), threads);
}

TEST_F(QueuedEnds, LetNoNoticeThroughAfterwards) {
    ShareApp();
    GiveUp();
    desktop->EndApplication(EDITOR);
    platform::Rest();
    EXPECT_EQ(context->GetSharedAppCount(), 1) << "nobody is there to forget it";
}

// ---- Engines

namespace {

class QueuedShare : public testing::Test {
protected:
    static constexpr unsigned SIDE = 2;
    static constexpr std::uint32_t GREEN = 0x00FF00;

    void Begin() {
        client.emplace();
        EXPECT_EQ((*client)->SetCaptureMode(SCREEN_CAPTURER_TYPE_CGS_GCD), 0);
        client->ShareMonitor(SIDE);
        client->Start();
    }
    void Tick() {
        clock->Advance(std::chrono::milliseconds(200));
        Settle(*WorkerOf(**client));
    }
    bool Begins(unsigned pictures) const {
        const auto deadline = std::chrono::steady_clock::now() + PATIENCE;
        while (Pictures() < pictures && std::chrono::steady_clock::now() < deadline)
            std::this_thread::yield();
        return Pictures() >= pictures;
    }
    unsigned Pictures() const { return desktop->CallsOf(SimulatedOperation::TakeWindowPicture); }

    CManualClockScope clock;
    CSettingsScope settings;
    CServedScene desktop{Scene()
                             .Display(0, 0, 200, 120)
                             .Display(200, 0, 100, 60)
                             .App(5'000'100, "Editor")
                             .Window(1)
                             .At(210, 10, 40, 20)
                             .Colour(GREEN)
                             .Pointer(1000, 1000)};
    std::optional<CShareClient> client;
};

} // namespace

TEST_F(QueuedShare, DeliversFramesATickLate) {
    Begin();
    Tick();
    EXPECT_EQ(client->sink.FrameCount(), 0u);
    ASSERT_TRUE(Begins(1));
    platform::Rest(); // the picture is finished
    Tick();
    ASSERT_EQ(client->sink.FrameCount(), 1u);
    EXPECT_EQ(client->Last().Count(GREEN), 40 * 20);
    EXPECT_EQ(client->Last().meta.rectCapture, (TVLRect{200, 0, 300, 60}));
    EXPECT_EQ(client->Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_CGS_GCD);
}

TEST_F(QueuedShare, IsGivenUpAfterFiveSecondsWithoutAPicture) {
    desktop->FailAlways(SimulatedOperation::TakeWindowPicture);
    Begin();
    for (int i = 0; i < 26; ++i)
        Tick();
    EXPECT_EQ(settings->GetScreenCapturerType(), SCREEN_CAPTURER_TYPE_CGS_GCD);
    Tick();
    EXPECT_EQ(settings->GetScreenCapturerType(), SCREEN_CAPTURER_TYPE_DEFAULT);
    platform::Rest();
    desktop->Heal(SimulatedOperation::TakeWindowPicture);
    Tick();
    EXPECT_EQ(client->sink.FrameCount(), 1u) << "the default has its picture in the same pass";
    EXPECT_EQ(client->Statistic().eCaptureMode, SCREEN_CAPTURER_TYPE_DEFAULT);
}

TEST_F(QueuedShare, LeavesNothingBehindWhenItsEngineEndsWithCapturesOnTheirWay) {
    platform::Rest();
    const std::ptrdiff_t threads = CountThreadsAtRest();
    desktop->DelayAlways(SimulatedOperation::TakeWindowPicture, std::chrono::milliseconds(900));
    Begin();
    for (unsigned i = 1; i <= 3; ++i) {
        Tick();
        ASSERT_TRUE(Begins(i));
    }
    EXPECT_EQ((*client)->Stop(), 0); // or there would be more ticks
    // The last engine waits for what its captures do on threads of ours.
    std::atomic<bool> hasEnded{false};
    std::thread other([&] {
        client.reset();
        hasEnded = true;
    });
    while (!hasEnded) {
        clock->Advance(std::chrono::milliseconds(100));
        std::this_thread::yield();
    }
    other.join();
    EXPECT_LE(WaitForThreadsOfProcess(threads), threads);
    EXPECT_EQ(Pictures(), 3u);
}

TEST_F(QueuedShare, LeavesNothingBehindWhenTheModeChangesWithCapturesOnTheirWay) {
    desktop->DelayAlways(SimulatedOperation::TakeWindowPicture, std::chrono::milliseconds(900));
    Begin();
    for (unsigned i = 1; i <= 3; ++i) {
        Tick();
        ASSERT_TRUE(Begins(i));
    }
    EXPECT_EQ((*client)->SetCaptureMode(SCREEN_CAPTURER_TYPE_DEFAULT), 0);
    desktop->Heal(SimulatedOperation::TakeWindowPicture); // those on their way are not concerned
    Settle(*WorkerOf(**client));
    clock->Advance(std::chrono::milliseconds(900));
    platform::Rest();
    Settle(*WorkerOf(**client));
    EXPECT_GE(client->sink.FrameCount(), 1u);
    EXPECT_EQ(client->Last().Count(GREEN), 40 * 20);
}
