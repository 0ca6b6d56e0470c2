// SPDX-License-Identifier: Apache-2.0
#include "src/share_common_util.h"

#include "util/cm_clock.h"

long long TvlCommonUtil::TickNowMS() {
    return low_tick_policy::now() / 1000;
}
