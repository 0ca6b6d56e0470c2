// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"
#include "tests/support/threads.h"

#include <algorithm>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <vector>

/// Keeps what a window server tells. Threads: any.
class CNoticeLog final : public platform::NoticeReceiver {
public:
    using Choice = std::function<bool(const platform::Notice&)>;

    void OnNotice(const platform::Notice& notice) override {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_notices.push_back(notice);
        m_came.notify_all();
    }

    std::vector<platform::Notice> Notices() const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return m_notices;
    }

    std::size_t Count(const Choice& choice) const {
        const std::lock_guard<std::mutex> lock(m_mutex);
        return CountLocked(choice);
    }

    std::size_t Count(platform::NoticeKind kind) const { return Count(Of(kind)); }

    /// False when there are fewer after PATIENCE.
    [[nodiscard]] bool WaitFor(const Choice& choice, std::size_t count = 1) const {
        std::unique_lock<std::mutex> lock(m_mutex);
        return m_came.wait_for(lock, PATIENCE, [&] { return CountLocked(choice) >= count; });
    }

    [[nodiscard]] bool WaitFor(platform::NoticeKind kind, std::size_t count = 1) const {
        return WaitFor(Of(kind), count);
    }

    void Clear() {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_notices.clear();
    }

    static Choice Of(platform::NoticeKind kind) {
        return [kind](const platform::Notice& notice) { return notice.kind == kind; };
    }

    /// With at least those flags.
    static Choice OfDisplay(platform::CGDirectDisplayID display, unsigned flags) {
        return [display, flags](const platform::Notice& notice) {
            return notice.kind == platform::NoticeKind::DisplayChanged && notice.display == display &&
                   (notice.flags & flags) == flags;
        };
    }

    static Choice OfApplication(platform::NoticeKind kind, pid_t pid) {
        return
            [kind, pid](const platform::Notice& notice) { return notice.kind == kind && notice.pid == pid; };
    }

    static Choice OfStream(std::uint64_t stream) {
        return [stream](const platform::Notice& notice) {
            return notice.kind == platform::NoticeKind::StreamPicture && notice.stream == stream;
        };
    }

private:
    std::size_t CountLocked(const Choice& choice) const {
        return static_cast<std::size_t>(std::count_if(m_notices.begin(), m_notices.end(), choice));
    }

    mutable std::mutex m_mutex;
    mutable std::condition_variable m_came;
    std::vector<platform::Notice> m_notices; // guarded by m_mutex
};
