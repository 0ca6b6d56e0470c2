// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_dummy_mac.h"

#include "src/mac/share_capturer_context_mac.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>

bool ShareCapturerDummy::init() {
    CmTraceInfo("[ShareCapturerDummy::init] without context");
    bool ready = false;
    CmCallGuarded("[ShareCapturerDummy::init]>>fail>>", [&] { ready = init(MakeShareCapturerContext()); });
    return ready;
}

bool ShareCapturerDummy::init(const std::shared_ptr<ShareCapturerContext>&) {
    CmTraceInfo("[ShareCapturerDummy::init]");
    return true;
}

unsigned ShareCapturerDummy::captureToIShareFrame(IShareFrame*) {
    return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
}

bool ShareCapturerDummy::setCaptureDisplay(unsigned display) {
    m_nCapturedDisplayId = display;
    return true;
}

void ShareCapturerDummy::setMaxSize(TVLSize size) {
    if (size == m_szMaxCapture)
        return;
    // The line of the back-end that this one stands in for: who follows a trace finds it under one name.
    CmTraceInfo("[ShareCapturerAVFoundation::setMaxSize],m_szMaxCapture:x=", m_szMaxCapture.cx,
                ",y=", m_szMaxCapture.cy, ",nMaxSize:x=", size.cx, ",y=", size.cy);
    m_szMaxCapture = size;
}

unsigned ShareCapturerDummy::setCaptureThreadCount(unsigned) {
    return static_cast<unsigned>(SHARE_RESULT_NOT_SUPPORTED);
}
