// SPDX-License-Identifier: Apache-2.0
#include "src/share_common_util.h"

#include "util/cm_clock.h"

#include <chrono>

void TvlCommonUtil::TvlSleep(int microseconds) {
    const std::chrono::nanoseconds deadline = CmSteadyNow() + std::chrono::microseconds(microseconds);
    CCmWaitPoint place;
    CCmWaitPoint::Lock lock = place.Acquire();
    while (CmSteadyNow() < deadline)
        place.WaitUntil(lock, deadline);
}

unsigned TvlCommonUtil::GetCurTickCount() {
    using std::chrono::milliseconds;
    return static_cast<unsigned>(
        std::chrono::duration_cast<milliseconds>(CmCurrentClock().WallNow()).count());
}

long long TvlCommonUtil::TickNowMS() {
    return low_tick_policy::now() / 1000;
}
