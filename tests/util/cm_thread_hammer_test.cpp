// SPDX-License-Identifier: Apache-2.0
#include "tests/support/test_effort.h"
#include "tests/support/threads.h"
#include "util/cm_thread.h"

#include <gtest/gtest.h>

#include <array>
#include <atomic>
#include <cstdio>
#include <thread>
#include <vector>

using namespace std::chrono_literals;

namespace {

constexpr int POSTERS = 4;

/// Runs `fn(index)` on as many threads as there are posters, and joins them.
template <class F>
void RunPosters(F fn) {
    std::vector<std::thread> posters;
    for (int poster = 0; poster < POSTERS; ++poster)
        posters.emplace_back([&fn, poster] { fn(poster); });
    for (std::thread& poster : posters)
        poster.join();
}

/// Lets a little time pass without giving up the processor: some nanoseconds a step.
void Spin(int steps) {
    std::atomic<int> idle{0};
    while (idle < steps)
        ++idle;
}

} // namespace

TEST(ComTaskThreadHammer, FiresTheEventsOfEachPosterInTheirOrder) {
    const int events = 25000 * TestEffort();
    std::printf("%d posters, %d events each\n", POSTERS, events);
    CRunningThread thread;
    std::array<int, POSTERS> next{}; // touched on that thread only
    int misplaced = 0;
    RunPosters([&](int poster) {
        for (int number = 0; number < events; ++number) {
            const auto fire = [&, poster, number] {
                int& expected = next[static_cast<std::size_t>(poster)];
                misplaced += expected != number;
                expected = number + 1;
            };
            ASSERT_EQ(Post(*thread, fire), 0);
        }
    });
    Send(*thread, [&] {
        EXPECT_EQ(misplaced, 0);
        for (const int count : next)
            EXPECT_EQ(count, events);
    });
}

TEST(ComTaskThreadHammer, FiresExactlyWhatItAcceptedWhenStoppedAmongSends) {
    const int rounds = 200 * TestEffort();
    std::printf("%d rounds\n", rounds);
    int accepted = 0;
    for (int round = 0; round < rounds; ++round) {
        CRunningThread thread;
        int fired = 0; // touched on that thread only
        std::atomic<int> taken{0};
        CTally begun;
        std::thread stopper([&] {
            EXPECT_TRUE(begun.Reaches(round % 40));
            thread->Stop(nullptr);
        });
        RunPosters([&](int poster) {
            int result = 0;
            while (result == 0) {
                begun.Add();
                const auto fire = [&fired] { ++fired; };
                result = poster % 2 == 0 ? Send(*thread, fire) : Post(*thread, fire);
                taken += result == 0;
            }
            EXPECT_EQ(result, -1);
        });
        stopper.join();
        EXPECT_EQ(thread->Join(), 0);
        ASSERT_EQ(fired, taken);
        accepted += taken;
    }
    EXPECT_GT(accepted, 0) << "everything was refused: nothing was tried";
}

TEST(ComTaskThreadHammer, StartsOrNotButNeverHangsWhenStoppedDuringItsStart) {
    const int rounds = 200 * TestEffort();
    std::printf("%d rounds\n", rounds);
    int started = 0;
    for (int round = 0; round < rounds; ++round) {
        const auto thread = std::make_shared<KRNUTIL::ComTaskThread>();
        CGate starting;
        std::thread stopper([&] {
            EXPECT_TRUE(starting.Passes());
            Spin(round % 20 * 1000);
            thread->Stop(nullptr);
        });
        starting.Open();
        Spin((19 - round % 20) * 1000);
        started += thread->Create("stopped", 1, 1) == 0;
        stopper.join();
        EXPECT_EQ(thread->Join(), 0);
        if (thread->GetEventQueue() != nullptr) {
            EXPECT_EQ(Send(*thread, [] {}), -1);
        }
    }
    std::printf("%d of them started\n", started);
}
