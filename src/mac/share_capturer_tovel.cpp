// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_tovel.h"

#include "src/app_share_config.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>

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
    CmCallGuarded("[ShareCapturerTovel::captureToIShareFrame]>>fail>>", [&] {
        if (IsDraging()) {
            result = SHARE_CAPTURE_DRAGGING;
            return;
        }
        const std::lock_guard<std::mutex> lock(m_bmpContextLock);
        result = CaptureWith(*m_cgsCapturer, *frame);
    });
    return static_cast<unsigned>(result);
}

unsigned char ShareCapturerTovel::pointerCaptured() {
    return m_cgsCapturer != nullptr && m_cgsCapturer->PointerCaptured() ? 1 : 0;
}
