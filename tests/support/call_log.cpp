// SPDX-License-Identifier: Apache-2.0
#include "tests/support/call_log.h"

#include <algorithm>

void CCallLog::Add(const std::string& call) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_calls.push_back(call);
    m_added.notify_all();
}

std::vector<std::string> CCallLog::Calls() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_calls;
}

std::size_t CCallLog::Count(const std::string& call) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return CountLocked(call);
}

std::size_t CCallLog::CountStarting(const std::string& start) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto starts = [&](const std::string& call) { return call.starts_with(start); };
    return static_cast<std::size_t>(std::count_if(m_calls.begin(), m_calls.end(), starts));
}

bool CCallLog::WaitUntilCount(const std::string& call, std::size_t count, std::chrono::seconds limit) const {
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_added.wait_for(lock, limit, [&] { return CountLocked(call) >= count; });
}

void CCallLog::Clear() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_calls.clear();
}

std::size_t CCallLog::CountLocked(const std::string& call) const {
    return static_cast<std::size_t>(std::count(m_calls.begin(), m_calls.end(), call));
}
