// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Small timing helpers. All follow the clock in force. Threads: any.
class TvlCommonUtil {
public:
    /// Comes back when that much time has passed, at once below 1.
    static void TvlSleep(int microseconds);

    /// Milliseconds of the wall clock, cut to 32 bits.
    static unsigned GetCurTickCount();

    /// Milliseconds of the monotonic clock.
    static long long TickNowMS();
};
