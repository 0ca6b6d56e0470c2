// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/sanitizer.h"

#include <algorithm>
#include <cstdlib>

/// How often random and hammer tests repeat themselves: 1 where a developer waits, more for the long form.
inline int TestEffort() {
    const char* const effort = std::getenv("SCREENSHARE_TEST_EFFORT");
    return effort != nullptr ? std::max(1, std::atoi(effort)) : 1;
}

/// Rounds of a test that would keep a developer waiting if a sanitizer had it do as many as others.
inline int TestRounds(int count) {
    constexpr int SANITIZED_SHARE = 6;
    const int share = SCREENSHARE_TEST_SANITIZED != 0 ? SANITIZED_SHARE : 1;
    return std::max(1, count * TestEffort() / share);
}
