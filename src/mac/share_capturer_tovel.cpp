// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_tovel.h"

#include "platform/app_kit.h"
#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <functional>

namespace {

constexpr TVLSize FIRST_MAX_SIZE{2880, 1800};

} // namespace

ShareCapturerTovel::~ShareCapturerTovel() {
    CmTraceDebug("[ShareCapturerTovel::dealloc]");
    m_cgsCapturer.reset();
    uninstallProcessMonitor();
}

bool ShareCapturerTovel::init() {
    CmTraceInfo("[ShareCapturerTovel::init] without context");
    bool isReady = false;
    CmCallGuarded("[ShareCapturerTovel::init]>>fail>>", [&] { isReady = init(MakeShareCapturerContext()); });
    return isReady;
}

bool ShareCapturerTovel::init(const std::shared_ptr<ShareCapturerContext>& context) {
    return CmCallGuarded("[ShareCapturerTovel::init]>>fail>>", [&] {
        m_capturerContext = context;
        shareUtilMacMonitorDraging.SetContext(context);
        if (context != nullptr)
            context->SetFilterSelf(true);
        m_cgsCapturer = std::make_unique<CShareCGSCapturer>(context);
        m_nCapturedDisplayId = platform::CGMainDisplayID();
        m_szMaxCapture = FIRST_MAX_SIZE;
        m_nRgbValue = static_cast<unsigned>(int{AppShareConfig::Instance()->m_nAppShareBackgroundColor});
        initCapturer();
        installProcessMonitor();
    });
}

// ---- Sizes

void ShareCapturerTovel::initScreenSize() {
    const unsigned display = m_nCapturedDisplayId;
    platform::CGRect rect;
    TVLSize bitmap{};
    TVLSize capture{};
    CShareCGSCapturer::calcScreenSize(display, m_szMaxCapture, rect, bitmap, capture);
    m_rectCapturedDisplay = rect;
    m_sizeBmpContext = bitmap;
    m_sizeCaptureContext = capture;
    // A display that is gone has no points, and no scale either.
    const auto points = static_cast<double>(platform::CGDisplayPixelsWide(display));
    if (points > 0)
        AppShareConfig::Instance()->SetCurrentScale(static_cast<float>(bitmap.cx / points));
}

void ShareCapturerTovel::initCapturer() {
    const unsigned display = m_nCapturedDisplayId;
    if (display == SHARE_INVALID_DISPLAY)
        return;
    {
        const std::lock_guard<std::mutex> lock(m_bmpContextLock);
        initScreenSize();
    }
    const platform::CGRect rect = m_rectCapturedDisplay;
    CmTraceInfo("[ShareCapturerTovel::initBmpContext] displayid=", display, " left = ", rect.origin.x,
                " top = ", rect.origin.y, " width = ", rect.size.width, " height = ", rect.size.height);
}

bool ShareCapturerTovel::FollowScreenSize() {
    const TVLSize before = m_sizeBmpContext;
    initScreenSize();
    const TVLSize now = m_sizeBmpContext;
    if (now == before)
        return false;
    initCapturer();
    return true;
}

void ShareCapturerTovel::setMaxSize(TVLSize size) {
    const TVLSize before = m_szMaxCapture;
    if (size == before)
        return;
    CmTraceInfo("[ShareCapturerTovel::setMaxSize],m_szMaxCapture:x=", before.cx, ",y=", before.cy,
                ",nMaxSize:x=", size.cx, ",y=", size.cy);
    m_szMaxCapture = size;
    if (!FollowScreenSize())
        CmTraceInfo("[ShareCapturerTovel::setMaxSize] no change");
}

// ---- The display

bool ShareCapturerTovel::setCaptureDisplay(unsigned display) {
    if (display == m_nCapturedDisplayId)
        return true;
    m_nCapturedDisplayId = display;
    initCapturer();
    return true;
}

int ShareCapturerTovel::onDisplayPlugin(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[ShareCapturerTovel::onDisplayPlugin] m_nCapturedDisplayId is plugout");
    // While it was away it had no size, and it may come back with another one.
    initScreenSize();
    return 1;
}

int ShareCapturerTovel::onDisplayPlugout(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[ShareCapturerTovel::onDisplayPlugout] m_nCapturedDisplayId is plugout");
    return 1;
}

int ShareCapturerTovel::onScreenResolutionChanged(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    if (FollowScreenSize())
        return 1;
    CmTraceInfo("[ShareCapturerTovel::onScreenResolutionChanged] no change");
    return 0;
}

// ---- Captures

unsigned ShareCapturerTovel::captureToIShareFrame(IShareFrame* frame) {
    if (frame == nullptr || m_cgsCapturer == nullptr)
        return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    int result = SHARE_CAPTURE_FAILED;
    CmCallGuarded("[ShareCapturerTovel::captureToIShareFrame]>>fail>>", [&] {
        std::function<void()> update;
        if (m_capturerContext != nullptr)
            update = [this] { m_capturerContext->UpdateShareCapturerContext(); };
        if (shareUtilMacMonitorDraging.IsDraging(update)) {
            result = SHARE_CAPTURE_DRAGGING;
            return;
        }
        const std::lock_guard<std::mutex> lock(m_bmpContextLock);
        const TVLSize bitmap = m_sizeBmpContext;
        const TVLSize capture = m_sizeCaptureContext;
        m_cgsCapturer->setMaxSize(m_szMaxCapture);
        result = m_cgsCapturer->capture(frame, m_nCapturedDisplayId, bitmap, capture);
        frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    });
    return static_cast<unsigned>(result);
}

unsigned char ShareCapturerTovel::pointerCaptured() {
    return m_cgsCapturer != nullptr && m_cgsCapturer->PointerCaptured() ? 1 : 0;
}

unsigned ShareCapturerTovel::getSharedAppCount() {
    return m_capturerContext != nullptr ? static_cast<unsigned>(m_capturerContext->GetSharedAppCount()) : 0;
}

unsigned ShareCapturerTovel::setCaptureThreadCount(unsigned) {
    return static_cast<unsigned>(SHARE_RESULT_NOT_SUPPORTED);
}

bool ShareCapturerTovel::IsWindowAreaBaseContentSupport() {
    return m_capturerContext != nullptr && m_capturerContext->GetShareType() != SHARE_TYPE_DESKTOP;
}

// ---- Ends of applications

void ShareCapturerTovel::installProcessMonitor() {
    platform::NSWorkspace::sharedWorkspace()->notificationCenter()->addObserver(
        this, [this](const platform::NSNotification& notification) { appTerminated(notification); },
        platform::NSWorkspaceDidTerminateApplicationNotification);
}

void ShareCapturerTovel::uninstallProcessMonitor() {
    platform::NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(this);
}

void ShareCapturerTovel::appTerminated(const platform::NSNotification& notification) {
    if (m_capturerContext != nullptr && m_capturerContext->GetShareType() != SHARE_TYPE_DESKTOP)
        m_capturerContext->RemoveSharedApp(
            static_cast<unsigned>(notification.userInfo.NSApplicationProcessIdentifier));
}
