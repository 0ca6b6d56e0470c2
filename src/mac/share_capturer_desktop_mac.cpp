// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_capturer_desktop_mac.h"

#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/avfoundation/share_capturer_mac_avfoundation.h"
#include "src/mac/avfoundation/share_capturer_mac_avfoundation_cgs_mix.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_capturer_cgs_gcd.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_capturer_tovel.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <utility>
#include <vector>

namespace {

std::shared_ptr<ShareCapturerMac> MakeBackEnd(int type) {
    switch (type) {
        case SCREEN_CAPTURER_TYPE_CGS_GCD:
            return std::make_shared<ShareCapturerCGSGCD>();
        case SCREEN_CAPTURER_TYPE_AVFOUNDATION:
            return std::make_shared<ShareCapturerAVFoundation>();
        case SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX:
            return std::make_shared<ShareCapturerAVFoundationCGSMix>();
        default:
            return std::make_shared<ShareCapturerTovel>();
    }
}

bool TakesARate(int type) {
    return type == SCREEN_CAPTURER_TYPE_AVFOUNDATION || type == SCREEN_CAPTURER_TYPE_AVFOUNDATION_CGS_MIX;
}

std::shared_ptr<ShareCapturerContext> OrNew(const std::shared_ptr<ShareCapturerContext>& context) {
    return context != nullptr ? context : MakeShareCapturerContext();
}

} // namespace

CShareCapturerDesktopMac::CShareCapturerDesktopMac(const std::shared_ptr<ShareCapturerContext>& context)
    : CShareCapturer(OrNew(context)) {
    m_shareCapturerContext->SetShareType(SHARE_TYPE_DESKTOP);
    platform::CGDisplayRegisterReconfigurationCallback(CShareCapturerDesktopMac_DisplayReconfigCallBack,
                                                       this);
    CShareCapturerDesktopMac::InitCapturer();
}

CShareCapturerDesktopMac::~CShareCapturerDesktopMac() {
    platform::CGDisplayRemoveReconfigurationCallback(CShareCapturerDesktopMac_DisplayReconfigCallBack, this);
    GiveUpBackEnd();
}

// ---- The back-end

std::shared_ptr<ShareCapturerMac> CShareCapturerDesktopMac::BackEnd() const {
    const std::lock_guard<std::mutex> lock(m_mutexBackEnd);
    return m_capturerMac;
}

void CShareCapturerDesktopMac::GiveUpBackEnd() {
    std::shared_ptr<ShareCapturerMac> last; // ends outside the lock
    const std::lock_guard<std::mutex> lock(m_mutexBackEnd);
    last.swap(m_capturerMac);
}

int CShareCapturerDesktopMac::InitCapturer() {
    if (BackEnd() != nullptr)
        return SHARE_RESULT_OK;
    const int type = AppShareConfig::Instance()->GetScreenCapturerType();
    std::shared_ptr<ShareCapturerMac> backEnd;
    CmCallGuarded("[CShareCapturerDesktopMac::InitCapturer]>>fail>>", [&] {
        backEnd = MakeBackEnd(type);
        if (backEnd != nullptr && !backEnd->init(m_shareCapturerContext))
            backEnd = nullptr;
    });
    const bool isMade = backEnd != nullptr;
    if (isMade) {
        const std::lock_guard<std::mutex> lock(m_mutexBackEnd);
        m_capturerMac = std::move(backEnd);
    }
    CmTraceInfo("[CShareCapturerDesktopMac::InitCapturer] create mac capturer", " eScreenCapturerType=", type,
                " Success=", isMade);
    return isMade ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

bool CShareCapturerDesktopMac::Reinit() {
    if (BackEnd() == nullptr && InitCapturer() != SHARE_RESULT_OK)
        GiveUpBackEnd();
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr)
        return false;
    if (m_shareCapturerContext == nullptr)
        return true;
    std::vector<unsigned> displays;
    m_shareCapturerContext->GetSharedMonitors(displays);
    if (!displays.empty())
        backEnd->setCaptureDisplay(displays.front());
    SetFPS(m_shareCapturerContext->GetCaptureFps());
    return true;
}

int CShareCapturerDesktopMac::Capture(IShareFrame* frame) {
    if (frame == nullptr || InitCapturer() != SHARE_RESULT_OK)
        return SHARE_CAPTURE_FAILED;
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    return backEnd != nullptr ? static_cast<int>(backEnd->captureToIShareFrame(frame)) : SHARE_CAPTURE_FAILED;
}

int CShareCapturerDesktopMac::SetCaptureMaxSize(TVLSize size) {
    if (const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd())
        backEnd->setMaxSize(size);
    return SHARE_RESULT_OK;
}

int CShareCapturerDesktopMac::SetFPS(int fps) {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr || !TakesARate(AppShareConfig::Instance()->GetScreenCapturerType()))
        return SHARE_RESULT_NOT_SUPPORTED;
    backEnd->setFPS(fps);
    return SHARE_RESULT_OK;
}

int CShareCapturerDesktopMac::SetCaptureThreadCount(unsigned count) {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr)
        return SHARE_RESULT_FAILED;
    backEnd->setCaptureThreadCount(count);
    return SHARE_RESULT_OK;
}

bool CShareCapturerDesktopMac::PointerCaptured() {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    return backEnd != nullptr && backEnd->pointerCaptured() != 0;
}

bool CShareCapturerDesktopMac::IsWindowAreaBaseContentSupport() {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    return backEnd != nullptr && backEnd->IsWindowAreaBaseContentSupport();
}

// ---- What is captured

unsigned CShareCapturerDesktopMac::GetCurrentCaptureDisplayId() {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    return backEnd != nullptr ? backEnd->getCaptureDisplay() : 0;
}

int CShareCapturerDesktopMac::GetCurrentCaptureSourcePosition(int& x, int& y, int& width, int& height) {
    platform::CGRect rect;
    if (const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd())
        rect = backEnd->getCaptureRect();
    x = CmTruncate(rect.origin.x);
    y = CmTruncate(rect.origin.y);
    width = CmTruncate(rect.size.width);
    height = CmTruncate(rect.size.height);
    return SHARE_RESULT_OK;
}

int CShareCapturerDesktopMac::SelectSharedDisplay(unsigned display) {
    if (display == SHARE_INVALID_DISPLAY)
        return SHARE_RESULT_INVALID_PARAM;
    if (InitCapturer() != SHARE_RESULT_OK)
        return SHARE_RESULT_FAILED;
    const bool isSelected = CmCallGuarded("[CShareCapturerDesktopMac::SelectSharedDisplay]>>fail>>",
                                          [&] { SelectSharedMonitor(display); });
    return isSelected ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

int CShareCapturerDesktopMac::SelectSharedMonitor(unsigned display) {
    if (const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd())
        backEnd->setCaptureDisplay(display);
    if (m_shareCapturerContext == nullptr)
        return SHARE_RESULT_OK;
    m_shareCapturerContext->ClearSharedDisplay();
    // Whoever searches traces knows this line by the name of the application capturer.
    if (m_shareCapturerContext->AddSharedDisplay(display) != SHARE_RESULT_OK)
        CmTraceWarning("[CShareCapturerAppMac::SelectSharedMonitor] AddSharedDisplay failed");
    return SHARE_RESULT_OK;
}

int CShareCapturerDesktopMac::AddCaptureShareSource(IShareSource* source) {
    if (source == nullptr || source->GetSourceType() != SHARE_SOURCE_TYPE_MONITOR)
        return SHARE_RESULT_FAILED;
    if (InitCapturer() != SHARE_RESULT_OK)
        return SHARE_RESULT_FAILED;
    int result = SHARE_RESULT_FAILED;
    CmCallGuarded("[CShareCapturerDesktopMac::AddCaptureShareSource]>>fail>>", [&] {
        SelectSharedMonitor(static_cast<unsigned>(source->GetSourceUniqueId()));
        result = CShareCapturer::AddCaptureShareSource(source);
    });
    return result;
}

int CShareCapturerDesktopMac::RemoveCaptureShareSource(IShareSource*) {
    return InitCapturer() == SHARE_RESULT_OK ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

// ---- Displays that change, on the notice thread

void CShareCapturerDesktopMac::OnDisplayPlugin(unsigned display) {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr)
        return;
    backEnd->onDisplayPlugin(display);
    NotifyCaptureDisplayChanged(true);
}

void CShareCapturerDesktopMac::OnDisplayPlugout(unsigned display) {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr)
        return;
    backEnd->onDisplayPlugout(display);
    if (backEnd->getCaptureDisplay() == display)
        NotifyCaptureDisplayChanged(false);
}

void CShareCapturerDesktopMac::OnScreenResolutionChanged(unsigned display) {
    const std::shared_ptr<ShareCapturerMac> backEnd = BackEnd();
    if (backEnd == nullptr)
        return;
    backEnd->onScreenResolutionChanged(display);
    if (backEnd->getCaptureDisplay() != display)
        return;
    const TVLRect rect = CMonitorEnumMac::screenImageRectForDisplayID(display);
    NotifyCaptureDisplaySizedChanged(
        {ShareUtil::Extent(rect.left, rect.right), ShareUtil::Extent(rect.top, rect.bottom)});
}

void CShareCapturerDesktopMac::OnDisplayPosChanged(unsigned display) {
    if (m_shareCapturerContext != nullptr)
        m_shareCapturerContext->UpdateSharedDisplay(display);
}

void CShareCapturerDesktopMac_DisplayReconfigCallBack(unsigned display, unsigned flags, void* user) {
    if (user == nullptr)
        return;
    CmTraceInfo("[ShareCapturerTovel_DisplayReconfigCallBack] flag=", flags, " displayid=", display);
    auto& capturer = *static_cast<CShareCapturerDesktopMac*>(user);
    if ((flags & platform::kCGDisplayAddFlag) != 0)
        capturer.OnDisplayPlugin(display);
    if ((flags & platform::kCGDisplayRemoveFlag) != 0)
        capturer.OnDisplayPlugout(display);
    if ((flags & platform::kCGDisplayDesktopShapeChangedFlag) != 0)
        capturer.OnScreenResolutionChanged(display);
    if ((flags & (platform::kCGDisplayMovedFlag | platform::kCGDisplaySetMainFlag)) != 0)
        capturer.OnDisplayPosChanged(display);
}
