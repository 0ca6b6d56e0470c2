// SPDX-License-Identifier: Apache-2.0
#pragma once

/// Small timing helpers.
class TvlCommonUtil {
public:
    /// Milliseconds of the monotonic clock.
    static long long TickNowMS();
};
