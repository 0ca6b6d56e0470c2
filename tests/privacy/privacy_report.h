// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/privacy/privacy_options.h"
#include "tests/privacy/privacy_result.h"

#include <string>
#include <vector>

/// The sum of all results of a run.
/// Threads: one.
class PrivacyReport {
public:
    explicit PrivacyReport(const PrivacyOptions& options);

    void Take(const PrivacyResult& result);

    long Histories() const;
    /// A line for whoever waits.
    std::string Progress() const;
    /// As Markdown, a line for each kind, by modes.
    std::string Table() const;
    /// Kinds of which so many histories showed nothing that the verdict on them says nothing.
    std::vector<std::string> DeadKinds() const;
    bool IsGood() const;

private:
    struct Row {
        long histories = 0;
        long bad = 0; ///< Those that are not clean.
        DeliveredCounts counts;
    };

    Row Sum() const;

    const PrivacyOptions m_options;
    std::vector<Row> m_rows; // as many as kinds
};
