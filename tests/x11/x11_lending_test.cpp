// SPDX-License-Identifier: Apache-2.0
#include "tests/support/call_on_thread.h"
#include "tests/support/test_effort.h"
#include "tests/x11/x11_fixture.h"

#include <algorithm>
#include <atomic>
#include <chrono>
#include <fstream>
#include <list>
#include <string>

/// Pictures that are taken on the asker's own thread, while the server's thread sleeps.
namespace {

using namespace platform;
using namespace std::chrono_literals;

/// How often a thread of this process with that name has gone to sleep.
long SleepsOf(const std::string& name) {
    for (const auto& task : std::filesystem::directory_iterator("/proc/self/task")) {
        std::string comm;
        std::ifstream(task.path() / "comm") >> comm;
        if (comm != name)
            continue;
        std::ifstream status(task.path() / "status");
        for (std::string word; status >> word;) {
            long count = 0;
            if (word == "voluntary_ctxt_switches:" && status >> count)
                return count;
        }
    }
    return -1;
}

class X11Lending : public X11Test {
protected:
    PictureOutcome TakeFor(std::chrono::nanoseconds patience) {
        WindowPictureRequest request;
        request.rect = {{0, 0}, {4000, 4000}};
        const auto windows = Server().GetWindows();
        for (const WindowInfo& window : windows->Windows())
            request.windows.push_back(window.id);
        request.deadline = CmSteadyNow() + patience;
        return Server().TakeWindowPicture(request).outcome;
    }

    bool Becomes(Life life) {
        return ComesTrue([this, life] { return Server().GetLife().life == life; });
    }
};

TEST_F(X11Lending, LeavesTheServersThreadAsleep) {
    if (!Begin())
        return;
    const CGWindowID window = Add("w", "10 10 200 100 00ff00");
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    const long atFirst = SleepsOf("scn-x11");
    EXPECT_GE(atFirst, 0);
    // A thread that a broken pipe would end has it woken.
    EXPECT_TRUE(ComesTrue([&] {
        EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
        return SleepsOf("scn-x11") > atFirst + 10;
    }));
    const CBrokenPipeBlocked blocked;
    const long before = SleepsOf("scn-x11");
    for (int i = 0; i < 50; ++i)
        EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
    EXPECT_LT(SleepsOf("scn-x11") - before, 10);
}

TEST_F(X11Lending, LeavesItAsleepWhileWindowsPaintToo) {
    if (!Begin())
        return;
    const CGWindowID window = Add("w", "10 10 200 100 00ff00");
    const CBrokenPipeBlocked blocked;
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    // A machine that is too busy may let the lease end.
    EXPECT_TRUE(ComesTrue([&] {
        const long before = SleepsOf("scn-x11");
        for (int i = 0; i < 40; ++i) {
            EXPECT_TRUE(Application().Tell("recolour w " + std::string(i % 2 == 0 ? "0000ff" : "00ff00")));
            EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
        }
        return SleepsOf("scn-x11") - before < 10;
    }));
    // Once nobody looks any more, it does.
    ASSERT_TRUE(Application().Create("more", "50 50 70 70 0000ff"));
    EXPECT_TRUE(ComesTrue([&] {
        const auto windows = Server().GetWindows();
        return std::any_of(windows->Windows().begin(), windows->Windows().end(),
                           [](const WindowInfo& each) { return each.frame.size.width == 70; });
    }));
}

TEST_F(X11Lending, KeepsTheViewTrue) {
    if (!Begin())
        return;
    const CBrokenPipeBlocked blocked;
    for (int i = 0; i < 20; ++i) {
        const std::string name = "w" + std::to_string(i);
        ASSERT_TRUE(Application().Create(name, "10 10 200 100 00ff00"));
        const std::size_t expected = static_cast<std::size_t>(i) + 1;
        EXPECT_TRUE(ComesTrue([&] {
            EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
            std::size_t ours = 0;
            const auto windows = Server().GetWindows();
            for (const WindowInfo& each : windows->Windows())
                ours += each.owner == Pid() && each.frame.size.width == 200 ? 1 : 0;
            return ours == expected;
        })) << i;
    }
}

TEST_F(X11Lending, EndsWithTheDeadlineOnADisplayThatStandsStill) {
    if (!Begin())
        return;
    const CBrokenPipeBlocked blocked;
    ASSERT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
    for (int i = 0; i < 3; ++i) {
        Desk().Rig().Stop();
        PictureOutcome outcome = PictureOutcome::Ok; // at first it hasn't been asked
        EXPECT_TRUE(ComesTrue([&] {
            outcome = TakeFor(50ms);
            return outcome != PictureOutcome::Ok;
        }));
        EXPECT_EQ(outcome, PictureOutcome::Timeout);
        EXPECT_EQ(Server().GetLife().life, Life::Stalled);
        EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Lost);
        Desk().Rig().Continue();
        ASSERT_TRUE(Becomes(Life::Alive));
        EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Ok);
    }
}

TEST_F(X11Lending, EndsAtOnceWhenTheDisplayGoesOrTheServerRests) {
    if (!Begin())
        return;
    for (const bool rests : {false, true}) {
        ASSERT_TRUE(Becomes(Life::Alive));
        Desk().Rig().Stop();
        {
            CCallOnThread takes([&] {
                const CBrokenPipeBlocked blocked;
                EXPECT_EQ(TakeFor(PATIENCE), PictureOutcome::Lost) << rests;
            });
            takes.UntilItWaits();
            const auto begin = std::chrono::steady_clock::now();
            if (rests)
                Server().Rest();
            else
                Desk().Rig().Kill();
            while (!takes.HasReturned() && std::chrono::steady_clock::now() - begin < PATIENCE / 2)
                std::this_thread::yield();
            EXPECT_TRUE(takes.HasReturned());
        }
        if (rests)
            Desk().Rig().Continue();
        else
            Desk().Rig().Restart();
    }
    EXPECT_TRUE(Becomes(Life::Alive));
}

TEST_F(X11Lending, HasToldOfALossByTheTimeTheBorrowerHearsOfIt) {
    if (!Begin())
        return;
    const CBrokenPipeBlocked blocked;
    for (int i = 0; i < 5; ++i) {
        ASSERT_TRUE(Becomes(Life::Alive));
        EXPECT_NE(TakeFor(PATIENCE), PictureOutcome::Lost);
        Desk().Rig().Kill();
        // There are no windows any more after the first time.
        while (TakeFor(PATIENCE) != PictureOutcome::Lost)
            std::this_thread::yield();
        EXPECT_EQ(Server().GetLife().life, Life::Lost) << "round " << i;
        Desk().Rig().Restart();
    }
}

TEST_F(X11Lending, IsForOneAtATimeAmongManyAskers) {
    if (!Begin())
        return;
    const CGWindowID window = Add("w", "10 10 200 100 00ff00");
    ASSERT_NE(TakeWhenShown(window, GREEN), nullptr);
    std::atomic<bool> ended{false};
    std::atomic<int> pictures{0};
    std::list<CCallOnThread> askers;
    for (int i = 0; i < 4; ++i) {
        askers.emplace_back([&, isBlocked = i < 3] {
            std::optional<CBrokenPipeBlocked> blocked;
            if (isBlocked)
                blocked.emplace();
            while (!ended) {
                const PictureOutcome outcome = TakeFor(PATIENCE);
                EXPECT_TRUE(outcome == PictureOutcome::Ok || outcome == PictureOutcome::Lost ||
                            outcome == PictureOutcome::Stale)
                    << static_cast<int>(outcome);
                CGPoint pointer;
                Server().GetPointerPosition(pointer);
                pictures += outcome == PictureOutcome::Ok ? 1 : 0;
            }
        });
    }
    for (int i = 0; i < TestRounds(100); ++i) {
        ASSERT_TRUE(Application().Tell("recolour w " + std::string(i % 2 == 0 ? "0000ff" : "00ff00")));
        if (i % 10 == 9)
            Server().Rest();
    }
    EXPECT_TRUE(ComesTrue([&] { return pictures > 100; }));
    ended = true;
    askers.clear();
    EXPECT_NE(TakeWhenShown(window, TestRounds(100) % 2 == 0 ? GREEN : BLUE), nullptr);
}

} // namespace
