// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_tovel.h"

#include "platform/core_graphics_images.h"
#include "src/app_share_config.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <cstdint>

ShareCapturerTovel::~ShareCapturerTovel() {
    CmTraceDebug("[ShareCapturerTovel::dealloc]");
}

bool ShareCapturerTovel::init(const std::shared_ptr<ShareCapturerContext>& context) {
    return CmCallGuarded("[ShareCapturerTovel::init]>>fail>>", [&] {
        KeepContext(context);
        m_cgsCapturer = std::make_unique<CShareCGSCapturer>(context);
        m_nRgbValue = static_cast<unsigned>(int{AppShareConfig::Instance()->m_nAppShareBackgroundColor});
        BeginOnMainDisplay();
    });
}

unsigned ShareCapturerTovel::captureToIShareFrame(IShareFrame* frame) {
    if (frame == nullptr || m_cgsCapturer == nullptr)
        return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    int result = SHARE_CAPTURE_FAILED;
    CmCallGuarded("[ShareCapturerTovel::captureToIShareFrame]>>fail>>",
                  [&] { result = CaptureShort(*frame) ? SHARE_CAPTURE_OK : CaptureAnew(*frame); });
    return static_cast<unsigned>(result);
}

/// As far as nothing has changed since the last picture. False when a whole capture has to be made.
bool ShareCapturerTovel::CaptureShort(IShareFrame& frame) {
    const std::optional<ShareStandingPicture::Terms> terms = TermsInForce();
    if (!terms || !m_standing.IsOf(*terms))
        return false;
    const std::lock_guard<std::mutex> lock(m_bmpContextLock);
    bool isDone = false;
    if (platform::CGWindowServerGetMoment() == m_standing.Moment())
        isDone = m_standing.PutInto(frame) || m_cgsCapturer->captureAgain(frame);
    if (!isDone)
        isDone = CaptureSameWindows(frame, *terms);
    if (isDone)
        frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    return isDone;
}

/// Something has been painted, or the pointer has moved; the windows stand where they stood.
bool ShareCapturerTovel::CaptureSameWindows(IShareFrame& frame, const ShareStandingPicture::Terms& terms) {
    m_standing.Forget();
    if (!Context()->DoesLastWalkStand() || !m_cgsCapturer->captureSameWindows(frame))
        return false;
    Keep(frame, terms);
    return true;
}

int ShareCapturerTovel::CaptureAnew(IShareFrame& frame) {
    m_standing.Forget();
    if (IsDraging())
        return SHARE_CAPTURE_DRAGGING;
    const std::lock_guard<std::mutex> lock(m_bmpContextLock);
    const std::optional<ShareStandingPicture::Terms> terms = TermsInForce();
    const int result = CaptureWith(*m_cgsCapturer, frame);
    if (result == SHARE_CAPTURE_OK)
        Keep(frame, terms);
    return result;
}

/// What the walk went by, before the windows' picture was taken, must be true still.
void ShareCapturerTovel::Keep(IShareFrame& frame, const std::optional<ShareStandingPicture::Terms>& terms) {
    const std::uint64_t moment = m_cgsCapturer->DrawnMoment();
    if (moment != 0 && terms && Context()->DoesLastWalkStand())
        m_standing.Keep(frame, *terms, moment);
}

std::optional<ShareStandingPicture::Terms> ShareCapturerTovel::TermsInForce() {
    if (Context() == nullptr)
        return std::nullopt;
    std::optional<ShareStandingPicture::Terms> terms = ShareStandingPicture::TermsOf(*Context());
    if (!terms)
        return std::nullopt;
    const Target target = CurrentTarget();
    terms->display = target.display;
    terms->sizes = {target.bitmap, target.capture, target.max};
    return terms;
}

unsigned char ShareCapturerTovel::pointerCaptured() {
    return m_cgsCapturer != nullptr && m_cgsCapturer->PointerCaptured() ? 1 : 0;
}
