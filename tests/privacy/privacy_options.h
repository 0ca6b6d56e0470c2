// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/delivered_counts.h"
#include "tests/privacy/delivered_fault.h"

#include <chrono>
#include <optional>
#include <string>
#include <vector>

struct PrivacyOptions {
    long histories = 240;
    unsigned seed = 1;
    int steps = 60;
    int jobs = 1;
    std::chrono::minutes limit{0}; ///< No history begins later; 0 is no limit.
    std::vector<DeliveredKind> kinds;
    DeliveredFault fault = DeliveredFault::None;
};

/// Understands --histories N, --seed S, --steps N, --jobs N, --minutes M, --kind NAME and --fault NAME.
/// Nothing where help is asked for. Throws std::invalid_argument for anything else.
std::optional<PrivacyOptions> ReadPrivacyOptions(int count, const char* const* arguments);

std::string PrivacyUsage();

/// All twelve, those of one mode next to each other.
std::vector<DeliveredKind> AllDeliveredKinds();
