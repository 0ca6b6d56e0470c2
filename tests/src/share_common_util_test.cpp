// SPDX-License-Identifier: Apache-2.0
#include "src/share_common_util.h"

#include "tests/support/call_on_thread.h"
#include "tests/support/threads.h"

#include <gtest/gtest.h>

#include <chrono>

using std::chrono::hours;
using std::chrono::microseconds;
using std::chrono::milliseconds;

TEST(CommonUtil, TickIsTheMonotonicClockInWholeMilliseconds) {
    CManualClockScope clock;
    EXPECT_EQ(TvlCommonUtil::TickNowMS(), 3'600'000);
    clock->Advance(microseconds(1999));
    EXPECT_EQ(TvlCommonUtil::TickNowMS(), 3'600'001);
    clock->Advance(hours(24 * 60));
    EXPECT_EQ(TvlCommonUtil::TickNowMS(), 3'600'001 + 60LL * 86'400'000) << "the tick has 64 bits";
}

TEST(CommonUtil, TickCountIsTheWallClockCutTo32Bits) {
    CManualClockScope clock;
    constexpr long long START = 30LL * 365 * 86'400'000;
    EXPECT_EQ(TvlCommonUtil::GetCurTickCount(), static_cast<unsigned>(START % 0x100000000LL));
    clock->Advance(microseconds(2999));
    EXPECT_EQ(TvlCommonUtil::GetCurTickCount(), static_cast<unsigned>((START + 2) % 0x100000000LL));
}

TEST(CommonUtil, SleepsUntilTheTimeHasPassed) {
    CManualClockScope clock;
    CCallOnThread sleeper([] { TvlCommonUtil::TvlSleep(1500); });
    sleeper.UntilItWaits();
    clock->Advance(microseconds(1499));
    sleeper.UntilItWaits();
    EXPECT_FALSE(sleeper.HasReturned());
    clock->Advance(microseconds(1));
    // The end of the sleeper waits for it to return.
}

TEST(CommonUtil, DoesNotSleepForNoTimeAtAll) {
    const CManualClockScope clock;
    TvlCommonUtil::TvlSleep(0);
    TvlCommonUtil::TvlSleep(-1);
}
