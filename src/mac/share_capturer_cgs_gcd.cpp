// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_cgs_gcd.h"

#include "src/share_capturer_context.h"
#include "util/cm_clock.h"
#include "util/cm_guarded_call.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <chrono>
#include <utility>

namespace {

/// A frame on its way: it is free again at the end, unless it has been handed on.
class FrameOnItsWay {
public:
    FrameOnItsWay(ShareFrameQueue& queue, IShareFrame* frame) : m_queue(queue), m_frame(frame) {}
    ~FrameOnItsWay() { m_queue.pushFreeFrame(m_frame); }
    FrameOnItsWay(const FrameOnItsWay&) = delete;
    FrameOnItsWay& operator=(const FrameOnItsWay&) = delete;

    IShareFrame* Get() const { return m_frame; }
    IShareFrame* HandOn() { return std::exchange(m_frame, nullptr); }

private:
    ShareFrameQueue& m_queue;
    IShareFrame* m_frame;
};

} // namespace

ShareCapturerCGSGCD::~ShareCapturerCGSGCD() {
    platform::dispatch_release(m_captureQueue);
}

bool ShareCapturerCGSGCD::init(const std::shared_ptr<ShareCapturerContext>& context) {
    return CmCallGuarded("[ShareCapturerCGSGCD::init]>>fail>>", [&] {
        KeepContext(context);
        BeginOnMainDisplay();
        m_captureQueue =
            platform::dispatch_queue_create("qvn.ShareCapturerCGSGCD", platform::DISPATCH_QUEUE_CONCURRENT);
    });
}

bool ShareCapturerCGSGCD::setCaptureDisplay(unsigned display) {
    const bool isAnother = display != getCaptureDisplay();
    const bool isDone = ShareCapturerCGS::setCaptureDisplay(display);
    // After it: what is begun before this is not known to be of the new display.
    if (isAnother)
        ++m_nDisplayChanges;
    return isDone;
}

/// A picture of a display that has gone would count as a success, and the failures after it against the mode.
int ShareCapturerCGSGCD::onDisplayPlugout(unsigned display) {
    const int isMine = ShareCapturerCGS::onDisplayPlugout(display);
    if (isMine != 0)
        ++m_nDisplayChanges;
    return isMine;
}

ShareCaptureTerms ShareCapturerCGSGCD::TermsInForce() const {
    ShareCaptureTerms terms;
    terms.displayChanges = m_nDisplayChanges;
    if (Context() != nullptr) {
        terms.withdrawals = Context()->Withdrawals();
        terms.interruptions = Context()->Interruptions();
        terms.type = Context()->GetShareType();
    }
    return terms;
}

// ---- On the capture thread

unsigned ShareCapturerCGSGCD::captureToIShareFrame(IShareFrame* frame) {
    if (frame == nullptr || m_captureQueue == nullptr)
        return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    int result = SHARE_CAPTURE_FAILED;
    CmCallGuarded("[ShareCapturerCGSGCD::captureToIShareFrame]>>fail>>", [&] {
        // Before the walk: a capture of an application goes by what the walk found, whenever it runs.
        const ShareCaptureTerms terms = TermsInForce();
        if (IsOfWindows() && IsDraging()) {
            DropOldest();
            result = SHARE_CAPTURE_DRAGGING;
            return;
        }
        result = TakeFinished(*frame);
        if (m_frameQueue.freeFrameCount() != 0)
            platform::dispatch_async(m_captureQueue,
                                     [self = shared_from_this(), terms] { self->CaptureIntoQueue(terms); });
    });
    return static_cast<unsigned>(result);
}

void ShareCapturerCGSGCD::DropOldest() {
    m_frameQueue.pushFreeFrame(m_frameQueue.popCapturedFrame());
}

int ShareCapturerCGSGCD::TakeFinished(IShareFrame& frame) {
    const FrameOnItsWay finished(m_frameQueue, m_frameQueue.popCapturedFrame(TermsInForce()));
    if (finished.Get() == nullptr)
        return SHARE_CAPTURE_NOT_READY;
    const IShareFrame::MetaInfo meta = finished.Get()->GetMetaInfo();
    frame.SwapOrCopy(finished.Get());
    frame.SetMetaInfo(meta); // a copy leaves it behind
    return SHARE_CAPTURE_OK;
}

// ---- On a thread of the queue

void ShareCapturerCGSGCD::CaptureIntoQueue(const ShareCaptureTerms& terms) {
    FrameOnItsWay frame(m_frameQueue, m_frameQueue.popFreeFrame());
    if (frame.Get() == nullptr)
        return;
    const std::chrono::nanoseconds start = CmSteadyNow();
    if (_captureToIShareFrame(frame.Get()) != SHARE_CAPTURE_OK)
        return;
    const auto used = std::chrono::duration_cast<std::chrono::milliseconds>(CmSteadyNow() - start);
    m_frameQueue.pushCapturedFrame(frame.HandOn(), start, static_cast<long>(used.count()), terms);
}

/// One picture. Each has a composition of its own, so that overlapping ones share no bitmap context.
int ShareCapturerCGSGCD::_captureToIShareFrame(IShareFrame* frame) {
    if (frame == nullptr)
        return SHARE_CAPTURE_FAILED;
    CShareCGSCapturer composition(Context());
    const int result = CaptureWith(composition, *frame);
    m_bPointerCaptured = composition.PointerCaptured();
    return result;
}
