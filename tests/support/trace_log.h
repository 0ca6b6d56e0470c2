// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "util/cm_trace.h"

#include <gtest/gtest.h>

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

/// Collects what the library traces while it lives.
///
/// Takes the place of the receiver and the threshold; at its end there is no receiver and the threshold is
/// back at what it was. One at a time. Threads: any.
class CTraceLog {
public:
    struct Entry {
        int level;
        std::optional<std::string> tag;
        std::string line;
    };

    explicit CTraceLog(int threshold = CM_TRACE_DETAIL);
    ~CTraceLog();
    CTraceLog(const CTraceLog&) = delete;
    CTraceLog& operator=(const CTraceLog&) = delete;

    std::vector<Entry> Entries() const;
    /// In the order of arrival.
    std::vector<std::string> Lines() const;
    /// The lines that hold `text`, in the order of arrival.
    std::vector<std::string> LinesContaining(const std::string& text) const;
    bool Contains(const std::string& text) const;
    std::size_t CountContaining(const std::string& text) const;

    /// True as soon as at least `count` lines hold `text`, false when the limit has passed in real time.
    bool WaitUntilContains(const std::string& text, std::size_t count = 1,
                           std::chrono::seconds limit = std::chrono::seconds(30)) const;

    void Clear();

private:
    static void Receive(void* context, int level, const char* tag, const char* text, int length);
    std::size_t CountLocked(const std::string& text) const;

    const int m_thresholdBefore;
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_arrived;
    std::vector<Entry> m_entries; // guarded by m_mutex
};

/// A line that ends with a source place, taken apart.
struct PlacedLine {
    std::string text; ///< All before the place.
    std::string path; ///< "src/share_capture_engine_impl"
    int line;
};

/// Nothing when the line doesn't end with "[path:digits]".
std::optional<PlacedLine> SplitSourcePlace(const std::string& line);

/// The line without the source place at its end; the whole line when there is none.
std::string WithoutSourcePlace(const std::string& line);

/// Whether `line` is `text` followed by "[" path ":" digits "]".
testing::AssertionResult IsLineAt(const std::string& line, const std::string& text, const std::string& path);
