// SPDX-License-Identifier: Apache-2.0
#include "src/share_frame_queue.h"

#include "src/share_frame.h"
#include "src/share_ref.h"
#include "util/cm_trace.h"

namespace {

using Guard = std::lock_guard<std::mutex>;

template <class Item>
Item PopFront(std::vector<Item>& items) {
    const Item front = items.front();
    items.erase(items.begin());
    return front;
}

} // namespace

ShareFrameQueue::ShareFrameQueue(std::size_t capacity) {
    m_free_frames.reserve(capacity);
    m_captured_frames.reserve(capacity);
    std::vector<ShareRef<IShareFrame>> frames;
    frames.reserve(capacity);
    for (std::size_t i = 0; i < capacity; ++i) {
        auto* const frame = new CShareFrame;
        frames.emplace_back(frame);
        frame->AllowNote(); // only the library writes to frames of a queue
    }
    for (const ShareRef<IShareFrame>& frame : frames) {
        frame.Get()->AddRef();
        m_free_frames.push_back(frame.Get());
    }
}

ShareFrameQueue::~ShareFrameQueue() {
    const Guard lock(m_mutex);
    for (IShareFrame* const frame : m_free_frames)
        frame->Release();
    for (const CapturedFrame& captured : m_captured_frames)
        captured.frame->Release();
}

IShareFrame* ShareFrameQueue::popFreeFrame() {
    const Guard lock(m_mutex);
    if (!m_free_frames.empty())
        return PopFront(m_free_frames);
    return m_captured_frames.empty() ? nullptr : PopFront(m_captured_frames).frame;
}

IShareFrame* ShareFrameQueue::popCapturedFrame() {
    const Guard lock(m_mutex);
    return m_captured_frames.empty() ? nullptr : PopFront(m_captured_frames).frame;
}

IShareFrame* ShareFrameQueue::popCapturedFrame(const ShareCaptureTerms& terms) {
    const Guard lock(m_mutex);
    while (!m_captured_frames.empty()) {
        const CapturedFrame oldest = PopFront(m_captured_frames);
        if (oldest.terms == terms)
            return oldest.frame;
        m_free_frames.push_back(oldest.frame);
    }
    return nullptr;
}

void ShareFrameQueue::pushCapturedFrame(IShareFrame* frame, std::chrono::nanoseconds start, long usedMS,
                                        const ShareCaptureTerms& terms) {
    if (frame == nullptr)
        return;
    std::chrono::nanoseconds newestStart{0};
    long newestUsedMS = 0;
    {
        const Guard lock(m_mutex);
        if (start >= m_lastEnqueueTime) {
            m_captured_frames.push_back({frame, terms});
            m_lastEnqueueTime = start;
            m_lastCaptureUsedMS = usedMS;
            return;
        }
        m_free_frames.push_back(frame);
        newestStart = m_lastEnqueueTime;
        newestUsedMS = m_lastCaptureUsedMS;
    }
    constexpr long long NANOSECONDS_PER_MS = 1'000'000;
    CmTraceInfo("pushCapturedFrame, disorder frame, disorder_ms=",
                static_cast<long long>((newestStart - start).count()) / NANOSECONDS_PER_MS,
                ", capture_ms=", usedMS, ", last_capture_ms=", newestUsedMS);
}

void ShareFrameQueue::pushFreeFrame(IShareFrame* frame) {
    if (frame == nullptr)
        return;
    const Guard lock(m_mutex);
    m_free_frames.push_back(frame);
}

std::size_t ShareFrameQueue::freeFrameCount() const {
    const Guard lock(m_mutex);
    return m_free_frames.size();
}
