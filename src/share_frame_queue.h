// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_types.h>

#include <chrono>
#include <cstddef>
#include <cstdint>
#include <mutex>
#include <vector>

class IShareFrame;

/// What a picture was begun under. Once any of it has changed, the picture may show what must not be seen by
/// now.
struct ShareCaptureTerms {
    std::uint64_t withdrawals = 0; ///< Of the share's context, as are the next.
    std::uint64_t interruptions = 0;
    std::uint64_t displayChanges = 0; ///< How often the back-end was given another display.
    SHARE_TYPE type = SHARE_TYPE_DESKTOP;

    bool operator==(const ShareCaptureTerms&) const = default;
};

/// A few frames that go round between captures, which overlap, and the one who shows them. It bounds how many
/// are on their way, and lets no picture through that was begun before one that is there already.
///
/// Frames:   a pointer that is given out or taken in carries the frame's single reference along. What is out
///           when the queue ends belongs to whoever has it.
/// Threads:  any; the lock is held for moves of pointers only.
/// Memory:   all of it is taken at the construction, so a frame can always be put back.
/// Time:     readings of CmSteadyNow.
class ShareFrameQueue {
public:
    /// Throws std::bad_alloc.
    explicit ShareFrameQueue(std::size_t capacity);
    ~ShareFrameQueue();
    ShareFrameQueue(const ShareFrameQueue&) = delete;
    ShareFrameQueue& operator=(const ShareFrameQueue&) = delete;

    /// A frame to capture into. Without a free one, the oldest picture that nobody has fetched is given up
    /// for it; null without that, too.
    IShareFrame* popFreeFrame();
    /// The oldest picture; null without any.
    IShareFrame* popCapturedFrame();
    /// The oldest picture of those terms. Older ones of other terms are given up on the way.
    IShareFrame* popCapturedFrame(const ShareCaptureTerms& terms);

    /// `start` is when the capture began and `usedMS` how long it took. One that began before the newest
    /// picture is not kept: its frame is free again.
    void pushCapturedFrame(IShareFrame* frame, std::chrono::nanoseconds start, long usedMS,
                           const ShareCaptureTerms& terms = {});
    void pushFreeFrame(IShareFrame* frame);

    std::size_t freeFrameCount() const;

private:
    struct CapturedFrame {
        IShareFrame* frame = nullptr;
        ShareCaptureTerms terms;
    };

    mutable std::mutex m_mutex;
    // Guarded by m_mutex.
    std::chrono::nanoseconds m_lastEnqueueTime{0}; // start of the newest picture that was kept
    long m_lastCaptureUsedMS = 0;                  // of that one
    std::vector<IShareFrame*> m_free_frames;       // oldest first, as are the captured ones
    std::vector<CapturedFrame> m_captured_frames;
};
