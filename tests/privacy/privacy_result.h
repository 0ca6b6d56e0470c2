// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/delivered_counts.h"
#include "tests/privacy/privacy_options.h"

#include <cstddef>
#include <optional>
#include <string>

enum class PrivacyOutcome {
    Begun, ///< No result yet; what a process that dies was at.
    Clean,
    Leak,
    Dead,   ///< It didn't show what it may.
    Broken, ///< Something else failed that must not: a call, a wait, the process.
};

/// What became of one history.
struct PrivacyResult {
    std::size_t kind = 0; ///< Among those of the options.
    unsigned seed = 0;
    PrivacyOutcome outcome = PrivacyOutcome::Begun;
    int step = 0; ///< The last one up to which it was clean or, if it isn't, the first after which it wasn't.
    DeliveredCounts counts;
    std::string lastSteps; ///< Up to there, of one that isn't clean.
};

PrivacyResult RunPrivacyHistory(const PrivacyOptions& options, std::size_t kind, unsigned seed);

/// What one process tells another.
std::string ToMessage(PrivacyResult result);
/// Takes the first message off a text; nothing while it isn't there as a whole.
std::optional<PrivacyResult> TakeMessage(std::string& text);

/// For whoever has to find out why, with the command that repeats it. For what is not clean.
std::string ToString(const PrivacyResult& result, const PrivacyOptions& options);
