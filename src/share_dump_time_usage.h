// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <chrono>

/// The stopwatch of the [Performance] traces. Runs from its construction.
class ShareDumpTimeUsage {
public:
    ShareDumpTimeUsage();

    void Start();

    /// Whole milliseconds since the last start, and starts again.
    int Stop();

private:
    std::chrono::nanoseconds m_start;
    [[maybe_unused]] int m_nReserved = 0;
};
