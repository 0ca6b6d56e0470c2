// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_cgs.h"

#include "platform/app_kit.h"
#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <screenshare/share_frame.h>

#include <functional>

namespace {

constexpr TVLSize FIRST_MAX_SIZE{2880, 1800};

} // namespace

ShareCapturerCGS::~ShareCapturerCGS() {
    uninstallProcessMonitor();
}

bool ShareCapturerCGS::init() {
    CmTraceInfo("[", m_name, "::init] without context");
    bool isReady = false;
    CmCallGuarded("[ShareCapturerCGS::init]>>fail>>", [&] { isReady = init(MakeShareCapturerContext()); });
    return isReady;
}

void ShareCapturerCGS::KeepContext(const std::shared_ptr<ShareCapturerContext>& context) {
    m_capturerContext = context;
    shareUtilMacMonitorDraging.SetContext(context);
    if (context != nullptr)
        context->SetFilterSelf(true);
}

void ShareCapturerCGS::BeginOnMainDisplay() {
    m_nCapturedDisplayId = platform::CGMainDisplayID();
    m_szMaxCapture = FIRST_MAX_SIZE;
    initCapturer();
    installProcessMonitor();
}

// ---- Sizes

void ShareCapturerCGS::initScreenSize() {
    const std::lock_guard<std::mutex> lock(m_captureMutex);
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

void ShareCapturerCGS::initCapturer() {
    const unsigned display = m_nCapturedDisplayId;
    if (display == SHARE_INVALID_DISPLAY)
        return;
    initScreenSize();
    const platform::CGRect rect = m_rectCapturedDisplay;
    CmTraceInfo("[", m_name, "::initBmpContext] displayid=", display, " left = ", rect.origin.x,
                " top = ", rect.origin.y, " width = ", rect.size.width, " height = ", rect.size.height);
}

bool ShareCapturerCGS::FollowScreenSize() {
    const TVLSize before = m_sizeBmpContext;
    initScreenSize();
    const TVLSize now = m_sizeBmpContext;
    if (now == before)
        return false;
    initCapturer();
    return true;
}

void ShareCapturerCGS::setMaxSize(TVLSize size) {
    const TVLSize before = m_szMaxCapture;
    if (size == before)
        return;
    CmTraceInfo("[", m_name, "::setMaxSize],m_szMaxCapture:x=", before.cx, ",y=", before.cy,
                ",nMaxSize:x=", size.cx, ",y=", size.cy);
    m_szMaxCapture = size;
    if (!FollowScreenSize())
        CmTraceInfo("[", m_name, "::setMaxSize] no change");
}

// ---- The display

bool ShareCapturerCGS::setCaptureDisplay(unsigned display) {
    if (display == m_nCapturedDisplayId)
        return true;
    m_nCapturedDisplayId = display;
    initCapturer();
    return true;
}

int ShareCapturerCGS::onDisplayPlugin(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[", m_name, "::onDisplayPlugin] m_nCapturedDisplayId is plugout");
    // While it was away it had no size, and it may come back with another one.
    initScreenSize();
    return 1;
}

int ShareCapturerCGS::onDisplayPlugout(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[", m_name, "::onDisplayPlugout] m_nCapturedDisplayId is plugout");
    return 1;
}

int ShareCapturerCGS::onScreenResolutionChanged(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    if (FollowScreenSize())
        return 1;
    CmTraceInfo("[", m_name, "::onScreenResolutionChanged] no change");
    return 0;
}

// ---- Captures

bool ShareCapturerCGS::IsDraging() {
    std::function<void()> update;
    if (m_capturerContext != nullptr)
        update = [this] { m_capturerContext->UpdateShareCapturerContext(); };
    return shareUtilMacMonitorDraging.IsDraging(update);
}

ShareCapturerCGS::Target ShareCapturerCGS::CurrentTarget() {
    const std::lock_guard<std::mutex> lock(m_captureMutex);
    return {m_nCapturedDisplayId, m_sizeBmpContext, m_sizeCaptureContext, m_szMaxCapture};
}

int ShareCapturerCGS::CaptureWith(CShareCGSCapturer& composition, IShareFrame& frame) {
    const Target target = CurrentTarget();
    composition.setMaxSize(target.max);
    const int result = composition.capture(&frame, target.display, target.bitmap, target.capture);
    frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    return result;
}

unsigned ShareCapturerCGS::getSharedAppCount() {
    return m_capturerContext != nullptr ? static_cast<unsigned>(m_capturerContext->GetSharedAppCount()) : 0;
}

unsigned ShareCapturerCGS::setCaptureThreadCount(unsigned) {
    return static_cast<unsigned>(SHARE_RESULT_NOT_SUPPORTED);
}

bool ShareCapturerCGS::IsOfWindows() const {
    return m_capturerContext != nullptr && m_capturerContext->GetShareType() != SHARE_TYPE_DESKTOP;
}

// ---- Ends of applications

void ShareCapturerCGS::installProcessMonitor() {
    platform::NSWorkspace::sharedWorkspace()->notificationCenter()->addObserver(
        this, [this](const platform::NSNotification& notification) { appTerminated(notification); },
        platform::NSWorkspaceDidTerminateApplicationNotification);
}

void ShareCapturerCGS::uninstallProcessMonitor() {
    platform::NSWorkspace::sharedWorkspace()->notificationCenter()->removeObserver(this);
}

void ShareCapturerCGS::appTerminated(const platform::NSNotification& notification) {
    if (IsOfWindows())
        m_capturerContext->RemoveSharedApp(
            static_cast<unsigned>(notification.userInfo.NSApplicationProcessIdentifier));
}
