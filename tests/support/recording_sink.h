// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "tests/support/call_log.h"
#include "tests/support/threads.h"
#include "util/cm_thread.h"

#include <screenshare/share_capture_engine.h>

#include <chrono>
#include <condition_variable>
#include <cstddef>
#include <functional>
#include <mutex>
#include <string>
#include <vector>

/// A sink that remembers what it was told. Threads: any.
class CRecordingSink final : public IShareCaptureEngineSink {
public:
    struct Frame {
        IShareFrame* frame; // only to tell frames apart
        TVLSize size;
        unsigned timestamp;
        TVLRect update;
        int firstByte; // -1 for a frame without pixels
        bool pointerCaptured;
        CmThreadId thread;
    };
    /// Everything but frames, as text: "status 1", "error -203", "event 1001 -303", "size 8x4",
    /// "position 1,2 3x4", "windows 5,6," ("windows null" for none).
    struct Notice {
        std::string text;
        CmThreadId thread;
    };
    using FrameHook = std::function<void(IShareFrame*)>;
    using NoticeHook = std::function<void(const std::string&)>;

    explicit CRecordingSink(CCallLog& calls) : m_calls(calls) {}

    /// Run inside the callbacks, after they were noted; may throw or block.
    void SetFrameHook(FrameHook hook);
    void SetNoticeHook(NoticeHook hook);

    std::vector<Frame> Frames() const;
    std::size_t FrameCount() const;
    std::vector<std::string> Notices() const;
    std::size_t CountNotices(const std::string& text) const;
    CmThreadId ThreadOfNotice(const std::string& text) const;

    /// True as soon as there are that many, false when the limit has passed in real time.
    bool WaitForFrames(std::size_t count, std::chrono::seconds limit = PATIENCE) const;
    bool WaitForNotice(const std::string& text, std::size_t count = 1,
                       std::chrono::seconds limit = PATIENCE) const;

    void Clear();

    void OnCaptureDisplaySizeChanged(TVLSize size) override;
    void OnCapturedWindowListChanged(const unsigned* windows, int count) override;
    void OnCaptureStatusChanged(int status) override;
    void OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) override;
    void OnCaptureError(int code) override;
    void OnCapturePositionChanged(int x, int y, int width, int height) override;
    void OnCaptureEvent(int type, int value, void* data) override;

private:
    void Note(const std::string& text);
    std::size_t CountNoticesLocked(const std::string& text) const;

    CCallLog& m_calls;
    mutable std::mutex m_mutex;
    mutable std::condition_variable m_told;
    // Guarded by m_mutex.
    std::vector<Frame> m_frames;
    std::vector<Notice> m_notices;
    FrameHook m_frameHook;
    NoticeHook m_noticeHook;
};
