// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/dispatch.h"
#include "src/mac/share_capturer_cgs.h"
#include "src/share_frame_queue.h"

#include <atomic>
#include <cstdint>
#include <memory>

/// The queued back-end: a capture hands over the oldest picture that is finished, and has another one begun
/// on a dispatch queue. Captures that take longer than a tick overlap, five of them at most; what is handed
/// over lags a tick or more behind.
///
/// What is withdrawn from the share is not handed over afterwards: a picture that was begun before counts as
/// none.
/// Lifetime: only by std::shared_ptr. A capture on its way keeps the back-end, so the last share may go on a
///           thread of the queue; nothing waits there.
/// Threads:  those of the protocol, and the queue's for the captures.
class ShareCapturerCGSGCD : public ShareCapturerCGS,
                            public std::enable_shared_from_this<ShareCapturerCGSGCD> {
public:
    ShareCapturerCGSGCD() : ShareCapturerCGS("ShareCapturerCGSGCD") {}
    ~ShareCapturerCGSGCD() override;

    using ShareCapturerCGS::init;
    bool init(const std::shared_ptr<ShareCapturerContext>& context) override;

    unsigned captureToIShareFrame(IShareFrame* frame) override;
    bool setCaptureDisplay(unsigned display) override;
    int onDisplayPlugout(unsigned display) override;
    /// Of the capture that ended last.
    unsigned char pointerCaptured() override { return m_bPointerCaptured ? 1 : 0; }

private:
    static constexpr std::size_t FRAMES = 5;

    ShareCaptureTerms TermsInForce() const;
    /// Gives one picture up that was finished before windows began to move.
    void DropOldest();
    int TakeFinished(IShareFrame& frame);
    /// What the queue runs.
    void CaptureIntoQueue(const ShareCaptureTerms& terms);
    int _captureToIShareFrame(IShareFrame* frame);

    platform::dispatch_queue_t m_captureQueue;
    ShareFrameQueue m_frameQueue{FRAMES};
    std::atomic<std::uint64_t> m_nDisplayChanges{0};
    ShareRelaxed<bool> m_bPointerCaptured{false};
};
