// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <algorithm>
#include <cstdlib>

/// How often random and hammer tests repeat themselves: 1 where a developer waits, more for the long form.
inline int TestEffort() {
    const char* const effort = std::getenv("SCREENSHARE_TEST_EFFORT");
    return effort != nullptr ? std::max(1, std::atoi(effort)) : 1;
}
