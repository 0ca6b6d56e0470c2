// SPDX-License-Identifier: Apache-2.0
#include "tests/support/trace_log.h"

#include <algorithm>
#include <utility>

namespace {

bool IsNumber(const std::string& text) {
    // Nine digits are more than any file has lines, and fit an int.
    return !text.empty() && text.size() <= 9 &&
           std::all_of(text.begin(), text.end(), [](char c) { return c >= '0' && c <= '9'; });
}

} // namespace

CTraceLog::CTraceLog(int threshold) : m_thresholdBefore(CmGetTraceThreshold()) {
    CmSetTraceReceiver(Receive, this);
    CmSetTraceThreshold(threshold);
}

CTraceLog::~CTraceLog() {
    CmSetTraceThreshold(m_thresholdBefore);
    CmSetTraceReceiver(nullptr, nullptr);
}

std::vector<CTraceLog::Entry> CTraceLog::Entries() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_entries;
}

std::vector<std::string> CTraceLog::Lines() const {
    return LinesContaining("");
}

std::vector<std::string> CTraceLog::LinesContaining(const std::string& text) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    std::vector<std::string> lines;
    for (const Entry& entry : m_entries) {
        if (entry.line.find(text) != std::string::npos)
            lines.push_back(entry.line);
    }
    return lines;
}

bool CTraceLog::Contains(const std::string& text) const {
    return CountContaining(text) != 0;
}

std::size_t CTraceLog::CountContaining(const std::string& text) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return CountLocked(text);
}

bool CTraceLog::WaitUntilContains(const std::string& text, std::size_t count,
                                  std::chrono::seconds limit) const {
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_arrived.wait_for(lock, limit, [&] { return CountLocked(text) >= count; });
}

void CTraceLog::Clear() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_entries.clear();
}

void CTraceLog::Receive(void* context, int level, const char* tag, const char* text, int length) {
    CTraceLog& log = *static_cast<CTraceLog*>(context);
    Entry entry{level, std::nullopt, std::string(text, static_cast<std::size_t>(length))};
    if (tag != nullptr)
        entry.tag = tag;
    const std::lock_guard<std::mutex> lock(log.m_mutex);
    log.m_entries.push_back(std::move(entry));
    log.m_arrived.notify_all();
}

std::size_t CTraceLog::CountLocked(const std::string& text) const {
    const auto holdsText = [&](const Entry& entry) { return entry.line.find(text) != std::string::npos; };
    return static_cast<std::size_t>(std::count_if(m_entries.begin(), m_entries.end(), holdsText));
}

std::optional<PlacedLine> SplitSourcePlace(const std::string& line) {
    const std::size_t open = line.rfind('[');
    const std::size_t colon = line.rfind(':');
    if (open == std::string::npos || colon == std::string::npos || colon < open || line.back() != ']')
        return std::nullopt;
    const std::string path = line.substr(open + 1, colon - open - 1);
    const std::string digits = line.substr(colon + 1, line.size() - colon - 2);
    if (path.empty() || !IsNumber(digits))
        return std::nullopt;
    return PlacedLine{line.substr(0, open), path, std::stoi(digits)};
}

std::string WithoutSourcePlace(const std::string& line) {
    const std::optional<PlacedLine> placed = SplitSourcePlace(line);
    return placed ? placed->text : line;
}

testing::AssertionResult IsLineAt(const std::string& line, const std::string& text, const std::string& path) {
    const std::optional<PlacedLine> placed = SplitSourcePlace(line);
    if (placed && placed->text == text && placed->path == path)
        return testing::AssertionSuccess();
    return testing::AssertionFailure()
           << "expected: " << text << "[" << path << ":<digits>]\n  actual: " << line;
}
