// SPDX-License-Identifier: Apache-2.0
#include "src/share_dump_time_usage.h"

#include "util/cm_clock.h"
#include "util/cm_numeric.h"

ShareDumpTimeUsage::ShareDumpTimeUsage() {
    Start();
}

void ShareDumpTimeUsage::Start() {
    m_start = CmSteadyNow();
}

int ShareDumpTimeUsage::Stop() {
    const std::chrono::nanoseconds now = CmSteadyNow();
    const auto elapsed = static_cast<double>((now - m_start).count());
    m_start = now;
    return CmTruncate(elapsed / 1000000.0);
}
