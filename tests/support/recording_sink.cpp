// SPDX-License-Identifier: Apache-2.0
#include "tests/support/recording_sink.h"

#include <algorithm>
#include <utility>

void CRecordingSink::SetFrameHook(FrameHook hook) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_frameHook = std::move(hook);
}

void CRecordingSink::SetNoticeHook(NoticeHook hook) {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_noticeHook = std::move(hook);
}

std::vector<CRecordingSink::Frame> CRecordingSink::Frames() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_frames;
}

std::size_t CRecordingSink::FrameCount() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return m_frames.size();
}

std::vector<std::string> CRecordingSink::Notices() const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    std::vector<std::string> texts;
    for (const Notice& notice : m_notices)
        texts.push_back(notice.text);
    return texts;
}

std::size_t CRecordingSink::CountNotices(const std::string& text) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    return CountNoticesLocked(text);
}

CmThreadId CRecordingSink::ThreadOfNotice(const std::string& text) const {
    const std::lock_guard<std::mutex> lock(m_mutex);
    const auto found = std::find_if(m_notices.begin(), m_notices.end(),
                                    [&](const Notice& notice) { return notice.text == text; });
    return found != m_notices.end() ? found->thread : 0;
}

bool CRecordingSink::WaitForFrames(std::size_t count, std::chrono::seconds limit) const {
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_told.wait_for(lock, limit, [&] { return m_frames.size() >= count; });
}

bool CRecordingSink::WaitForNotice(const std::string& text, std::size_t count,
                                   std::chrono::seconds limit) const {
    std::unique_lock<std::mutex> lock(m_mutex);
    return m_told.wait_for(lock, limit, [&] { return CountNoticesLocked(text) >= count; });
}

void CRecordingSink::Clear() {
    const std::lock_guard<std::mutex> lock(m_mutex);
    m_frames.clear();
    m_notices.clear();
}

void CRecordingSink::OnCaptureDisplaySizeChanged(TVLSize size) {
    Note("size " + std::to_string(size.cx) + "x" + std::to_string(size.cy));
}

void CRecordingSink::OnCapturedWindowListChanged(const unsigned* windows, int count) {
    std::string text = "windows ";
    if (windows == nullptr)
        text += "null";
    for (int i = 0; windows != nullptr && i < count; ++i)
        text += std::to_string(windows[i]) + ",";
    Note(text);
}

void CRecordingSink::OnCaptureStatusChanged(int status) {
    Note("status " + std::to_string(status));
}

void CRecordingSink::OnCaptureData(IShareFrame* frame, TVLRect& rcUpdate) {
    m_calls.Add("OnCaptureData");
    Frame noted{frame,
                {},
                frame->GetTimestamp(),
                rcUpdate,
                -1,
                frame->GetMetaInfo().bPointerCaptured,
                GetThreadSelfId()};
    frame->GetFrameSize(noted.size);
    if (frame->GetFrameData() != nullptr && frame->GetFrameDataLen() > 0)
        noted.firstByte = frame->GetFrameData()[0];
    FrameHook hook;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_frames.push_back(noted);
        m_told.notify_all();
        hook = m_frameHook;
    }
    if (hook)
        hook(frame);
}

void CRecordingSink::OnCaptureError(int code) {
    Note("error " + std::to_string(code));
}

void CRecordingSink::OnCapturePositionChanged(int x, int y, int width, int height) {
    Note("position " + std::to_string(x) + "," + std::to_string(y) + " " + std::to_string(width) + "x" +
         std::to_string(height));
}

void CRecordingSink::OnCaptureEvent(int type, int value, void* data) {
    Note("event " + std::to_string(type) + " " + std::to_string(value) + (data != nullptr ? " data" : ""));
}

void CRecordingSink::Note(const std::string& text) {
    NoticeHook hook;
    {
        const std::lock_guard<std::mutex> lock(m_mutex);
        m_notices.push_back({text, GetThreadSelfId()});
        m_told.notify_all();
        hook = m_noticeHook;
    }
    if (hook)
        hook(text);
}

std::size_t CRecordingSink::CountNoticesLocked(const std::string& text) const {
    return static_cast<std::size_t>(std::count_if(m_notices.begin(), m_notices.end(),
                                                  [&](const Notice& notice) { return notice.text == text; }));
}
