// SPDX-License-Identifier: Apache-2.0
#include "tests/privacy/privacy_jobs.h"
#include "tests/privacy/privacy_options.h"
#include "tests/privacy/privacy_report.h"

#include <gtest/gtest.h>

#include <chrono>
#include <cstdio>
#include <exception>

/// Thousands of random histories of a simulated desktop, every delivered frame and thumbnail before the
/// privacy oracle: ./dev privacy. Ends with 0 when nothing was seen that must not be, with 1 when something
/// was or when a kind of share shows nothing, with 2 when it couldn't run.

namespace {

using Clock = std::chrono::steady_clock;

void Print(const std::string& text) {
    std::fputs(text.c_str(), stdout);
    std::fflush(stdout);
}

int Minutes(Clock::time_point start) {
    return static_cast<int>(std::chrono::duration_cast<std::chrono::minutes>(Clock::now() - start).count());
}

/// Tells each history that isn't clean, the first ones in full.
class Teller {
public:
    explicit Teller(const PrivacyOptions& options) : m_options(options) {}

    void Tell(const PrivacyResult& result) {
        constexpr int IN_FULL = 5;
        if (result.outcome == PrivacyOutcome::Clean)
            return;
        const std::string text = ToString(result, m_options);
        Print(++m_told <= IN_FULL ? text : text.substr(0, text.find('\n') + 1));
    }

private:
    const PrivacyOptions& m_options;
    int m_told = 0;
};

int Run(const PrivacyOptions& options) {
    const Clock::time_point start = Clock::now();
    std::printf("%ld histories of %d steps from seed %u on, %d at a time\n", options.histories, options.steps,
                options.seed, options.jobs);
    PrivacyReport report(options);
    Teller teller(options);
    int minutes = 0;
    PrivacyJobs jobs(options);
    jobs.Collect(
        [&](const PrivacyResult& result) {
            report.Take(result);
            teller.Tell(result);
        },
        [&] {
            if (Minutes(start) == minutes)
                return;
            minutes = Minutes(start);
            Print("after " + std::to_string(minutes) + " min: " + report.Progress() + "\n");
        });
    Print("after " + std::to_string(Minutes(start)) + " min: " + report.Progress() + "\n\n" + report.Table());
    for (const std::string& kind : report.DeadKinds())
        Print("DEAD: no history of " + kind + " shows anything\n");
    return report.IsGood() ? 0 : 1;
}

} // namespace

int main(int count, char** arguments) {
    try {
        testing::InitGoogleTest();
        const std::optional<PrivacyOptions> options = ReadPrivacyOptions(count, arguments);
        if (!options) {
            Print(PrivacyUsage());
            return 0;
        }
        return Run(*options);
    } catch (const std::exception& failure) {
        std::fprintf(stderr, "privacy_program: %s\n", failure.what());
        return 2;
    }
}
