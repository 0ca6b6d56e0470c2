// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_result.h"

#include "tests/privacy/delivered_history.h"

#include <gtest/gtest.h>

#include <sstream>
#include <utility>
#include <vector>

namespace {

/// Expectations that failed outside of a test, since the process began.
int FailedExpectations() {
    return testing::UnitTest::GetInstance()->ad_hoc_test_result().total_part_count();
}

PrivacyOutcome OutcomeOf(const DeliveredKind& kind, const DeliveredCounts& counts, int failed) {
    if (IsLeak(kind, counts))
        return PrivacyOutcome::Leak;
    if (IsDead(kind, counts))
        return PrivacyOutcome::Dead;
    return failed > 0 ? PrivacyOutcome::Broken : PrivacyOutcome::Clean;
}

/// All that is counted, in the order in which it is told.
std::vector<long*> NumbersOf(DeliveredCounts& counts) {
    PrivacyFindings& findings = counts.findings;
    ThumbnailFindings& thumbnails = counts.thumbnails;
    return {&findings.forbidden,    &findings.leaks,       &findings.redNearEdges,  &findings.redThroughKept,
            &findings.redElsewhere, &findings.keptInFront, &findings.keptShown,     &counts.frames,
            &counts.resent,         &counts.reshaped,      &counts.ofBefore,        &counts.ofNoMoment,
            &counts.givenUp,        &counts.framesForLife, &counts.keptThere,       &counts.keptShown,
            &counts.strange,        &thumbnails.images,    &thumbnails.failed,      &thumbnails.pixels,
            &thumbnails.foreign,    &thumbnails.unasked,   &thumbnails.wholePixels, &thumbnails.wholeShown};
}

} // namespace

PrivacyResult RunPrivacyHistory(const PrivacyOptions& options, std::size_t kind, unsigned seed) {
    PrivacyResult result;
    result.kind = kind;
    result.seed = seed;
    result.outcome = PrivacyOutcome::Clean;
    const int failedBefore = FailedExpectations();
    {
        DeliveredHistory history(options.kinds[kind], options.fault, seed);
        for (int step = 1; step <= options.steps; ++step) {
            history.Step();
            if (result.outcome != PrivacyOutcome::Clean)
                continue; // to see how long it lasts
            result.step = step;
            const int failed = FailedExpectations() - failedBefore;
            result.outcome = OutcomeOf(options.kinds[kind], history.Counts(), failed);
            if (result.outcome != PrivacyOutcome::Clean)
                result.lastSteps = history.LastSteps();
        }
        result.counts = history.End();
    }
    // Its end can fail, too.
    if (result.outcome == PrivacyOutcome::Clean && FailedExpectations() > failedBefore)
        result.outcome = PrivacyOutcome::Broken;
    return result;
}

std::string ToMessage(PrivacyResult result) {
    std::ostringstream line;
    line << result.kind << ' ' << result.seed << ' ' << static_cast<int>(result.outcome) << ' ' << result.step
         << ' ' << result.counts.longestExposure.count() << ' ';
    for (const long* number : NumbersOf(result.counts))
        line << *number << ' ';
    line << result.counts.firstLeak.size() << ' ' << result.lastSteps.size() << '\n';
    return line.str() + result.counts.firstLeak + result.lastSteps;
}

std::optional<PrivacyResult> TakeMessage(std::string& text) {
    const std::size_t end = text.find('\n');
    if (end == std::string::npos)
        return std::nullopt;
    PrivacyResult result;
    std::istringstream line(text.substr(0, end));
    int outcome = 0;
    long exposure = 0;
    line >> result.kind >> result.seed >> outcome >> result.step >> exposure;
    for (long* number : NumbersOf(result.counts))
        line >> *number;
    std::size_t leak = 0;
    std::size_t steps = 0;
    line >> leak >> steps;
    if (text.size() < end + 1 + leak + steps)
        return std::nullopt;
    result.outcome = static_cast<PrivacyOutcome>(outcome);
    result.counts.longestExposure = std::chrono::milliseconds(exposure);
    result.counts.firstLeak = text.substr(end + 1, leak);
    result.lastSteps = text.substr(end + 1 + leak, steps);
    text.erase(0, end + 1 + leak + steps);
    return result;
}

std::string ToString(const PrivacyResult& result, const PrivacyOptions& options) {
    constexpr const char* WORDS[] = {"DIED", "CLEAN", "LEAK", "DEAD", "BROKEN"};
    const char* const kind = options.kinds[result.kind].name;
    std::ostringstream text;
    text << WORDS[static_cast<int>(result.outcome)] << ": " << kind << ", seed " << result.seed << ", step "
         << result.step << ": " << ToString(result.counts) << result.lastSteps
         << "\n  once more: privacy_program --kind " << kind << " --seed " << result.seed
         << " --histories 1 --steps " << options.steps;
    if (options.fault != DeliveredFault::None)
        text << " --fault " << DELIVERED_FAULT_NAMES[static_cast<int>(options.fault)];
    text << '\n';
    return text.str();
}
