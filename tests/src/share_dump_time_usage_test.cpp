// SPDX-License-Identifier: Apache-2.0
#include "src/share_dump_time_usage.h"

#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <chrono>

// The stopwatch, on the manual clock.

namespace {

using namespace std::chrono_literals;

} // namespace

TEST(ShareDumpTimeUsage, GivesZeroWhenItIsReadTwiceAtOnce) {
    CManualClockScope clock;
    ShareDumpTimeUsage watch;
    clock->Advance(5ms);
    EXPECT_EQ(watch.Stop(), 5);
    EXPECT_EQ(watch.Stop(), 0);
}

TEST(ShareDumpTimeUsage, RunsFromItsConstruction) {
    CManualClockScope clock;
    clock->Advance(1s);
    ShareDumpTimeUsage watch;
    clock->Advance(1234ms);
    EXPECT_EQ(watch.Stop(), 1234);
}

TEST(ShareDumpTimeUsage, CutsToWholeMilliseconds) {
    CManualClockScope clock;
    ShareDumpTimeUsage watch;
    clock->Advance(1'999'999ns);
    EXPECT_EQ(watch.Stop(), 1);
    clock->Advance(2'000'000ns);
    EXPECT_EQ(watch.Stop(), 2);
    clock->Advance(999'999ns);
    EXPECT_EQ(watch.Stop(), 0);
}

TEST(ShareDumpTimeUsage, MeasuresConsecutiveStretches) {
    CManualClockScope clock;
    ShareDumpTimeUsage watch;
    for (const int milliseconds : {3, 40, 1, 500}) {
        clock->Advance(std::chrono::milliseconds(milliseconds));
        EXPECT_EQ(watch.Stop(), milliseconds);
    }
}

TEST(ShareDumpTimeUsage, StartsAgainOnRequest) {
    CManualClockScope clock;
    ShareDumpTimeUsage watch;
    clock->Advance(70ms);
    watch.Start();
    clock->Advance(7ms);
    EXPECT_EQ(watch.Stop(), 7);
}
