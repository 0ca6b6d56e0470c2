// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_mac_avfoundation_cgs_mix.h"

#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/cgs_composition.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_util_mac.h"
#include "src/share_dump_time_usage.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>

#include <cstddef>
#include <utility>

namespace {

constexpr int SHADOW_WIDTH = 25; // on a display of scale 1

/// The frame's pixels as a bitmap to draw on; null when there is no memory for one.
platform::CGContextRef ContextOn(IShareFrame& frame) {
    CShareFrame::DropNoteOf(frame);
    TVLSize size{};
    frame.GetFrameSize(size);
    const auto length = static_cast<std::size_t>(CShareFrame::BackedDataLen(frame));
    return platform::CGBitmapContextCreate(frame.GetFrameData(), length, size.cx, size.cy, 8,
                                           frame.GetFrameLineBytes(),
                                           platform::kCGImageAlphaPremultipliedFirst);
}

/// Where `rect` of the displays lies in a bitmap that counts from its bottom left.
platform::CGRect PlaceOf(const TVLRect& rect, const TVLRect& box, float width, float height) {
    const auto across = static_cast<float>(ShareUtil::Extent(box.left, box.right));
    const auto down = static_cast<float>(ShareUtil::Extent(box.top, box.bottom));
    return {{static_cast<float>(ShareUtil::Extent(box.left, rect.left)) * width / across,
             static_cast<float>(ShareUtil::Extent(rect.bottom, box.bottom)) * height / down},
            {static_cast<float>(ShareUtil::Extent(rect.left, rect.right)) * width / across,
             static_cast<float>(ShareUtil::Extent(rect.top, rect.bottom)) * height / down}};
}

} // namespace

ShareCapturerAVFoundationCGSMix::~ShareCapturerAVFoundationCGSMix() {
    EndSession();
}

bool ShareCapturerAVFoundationCGSMix::init(const std::shared_ptr<ShareCapturerContext>& context) {
    return CmCallGuarded("[ShareCapturerAVFoundationCGSMix::init]>>fail>>", [&] {
        KeepContext(context);
        initCapturer();
        m_pIShareFrameFilter = ShareRef<IShareFrame>(new CShareFrame);
        m_fScale = 1.0F;
        m_nShadowWidth = SHADOW_WIDTH;
    });
}

void ShareCapturerAVFoundationCGSMix::initCapturer() {
    if (Session() == nullptr)
        return;
    Session()->initShareAVFCapturer();
    Session()->setCapturesCursor(false);
    Session()->startRun();
}

void ShareCapturerAVFoundationCGSMix::initCapturerByData(unsigned char*, unsigned long) {}

bool ShareCapturerAVFoundationCGSMix::setCaptureDisplay(unsigned display) {
    m_nCapturedDisplayId = display;
    m_nShadowWidth =
        CmTruncate(double{CMonitorEnumMac::screenScaleFactorForDisplayID(display)} * SHADOW_WIDTH);
    if (Session() != nullptr)
        CmCallGuarded("[ShareCapturerAVFoundationCGSMix::setCaptureDisplay]>>fail>>",
                      [&] { Session()->setInputDisplay(display); });
    return true;
}

platform::CGRect ShareCapturerAVFoundationCGSMix::getCaptureRect() {
    const platform::CGRect rect = Session() != nullptr ? Session()->getCaptureRect() : platform::CGRect{};
    m_rectCapturedDisplay = rect;
    return rect;
}

// ---- A pass

unsigned ShareCapturerAVFoundationCGSMix::captureToIShareFrame(IShareFrame* frame) {
    int result = SHARE_CAPTURE_FAILED;
    CmCallGuarded("[ShareCapturerAVFoundationCGSMix::captureToIShareFrame]>>fail>>",
                  [&] { result = _captureToIShareFrame(frame); });
    return static_cast<unsigned>(result);
}

int ShareCapturerAVFoundationCGSMix::_captureToIShareFrame(IShareFrame* frame) {
    ShareDumpTimeUsage total;
    ShareDumpTimeUsage step;
    if (IsDraging())
        return SHARE_CAPTURE_DRAGGING;
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.UpdateShareCapturerContext usageTime=", step.Stop());
    const auto code = static_cast<int>(CopySample(frame));
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.captureToIShareFrame usageTime=", step.Stop());
    if (code != SHARE_CAPTURE_OK)
        return code;
    Target target{frame, nullptr, {}, 1.0F};
    target.box = Stamp(*frame, pointerCaptured() != 0);
    target.scale = ScaleOf(*frame, target.box);
    if (!HideUnshared(target))
        return SHARE_CAPTURE_FAILED;
    step.Start();
    target.context = ContextOn(*frame);
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.CGBitmapContextCreate usageTime=", step.Stop());
    if (target.context != nullptr) {
        platform::CGContextSetInterpolationQuality(target.context.get(), platform::kCGInterpolationHigh);
        DrawOverlap(target);
        DrawPointer(target);
    }
    frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.captureToIShareFrame total usageTime=", total.Stop());
    return Give();
}

/// The overlap, too: an image of the shared windows need not come, nor be opaque.
bool ShareCapturerAVFoundationCGSMix::HideUnshared(const Target& target) const {
    ShareDumpTimeUsage usage;
    TVLRegion overlap;
    if (Context() != nullptr)
        Context()->GetOverlapRegion(overlap);
    const bool isHidden = Hide(*target.frame, std::move(overlap), target.box, target.scale, BLACK) &&
                          HideAroundShare(*target.frame, target.box, target.scale);
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.fillbackground usageTime=", usage.Stop());
    return isHidden;
}

void ShareCapturerAVFoundationCGSMix::DrawOverlap(const Target& target) const {
    if (Context() == nullptr)
        return;
    TVLRegion overlap;
    std::vector<unsigned> windows;
    Context()->GetOverlapRegion(overlap);
    Context()->GetCapturedWindows(windows);
    std::erase_if(windows, [this](unsigned window) { return Context()->MayBeKeptOut(window); });
    if (overlap.IsEmpty() || windows.empty())
        return;
    ShareDumpTimeUsage usage;
    std::vector<TVLRect> rcItems;
    overlap.GetRects(rcItems);
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.GetRects usageTime=", usage.Stop());
    for (const TVLRect& rcItem : rcItems)
        DrawOverlapRect(target, windows, rcItem);
}

void ShareCapturerAVFoundationCGSMix::DrawOverlapRect(const Target& target,
                                                      const std::vector<unsigned>& windows,
                                                      const TVLRect& rcItem) const {
    const TVLRect rcItemExtend = WithShadow(rcItem, target.box);
    ShareDumpTimeUsage usage;
    const platform::CGImageRef image = CShareCGSCapturer::captureRect(
        windows.data(), windows.size(), ShareUtilMac::TVLRectToCGRect(rcItemExtend), false);
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.captureScreenRect usageTime=", usage.Stop(),
                  " WindowsCount=", windows.size());
    TVLSize size{};
    target.frame->GetFrameSize(size);
    const platform::CGRect destRect =
        PlaceOf(rcItemExtend, target.box, static_cast<float>(size.cx), static_cast<float>(size.cy));
    if (CmTraceOn(CM_TRACE_DETAIL))
        CmTraceDetail("ShareCapturerAVFoundationCGSMix.CGContextDrawImage",
                      " rcItem=", ShareUtil::TVLRectToString(rcItem),
                      " rcItemExtend=", ShareUtil::TVLRectToString(rcItemExtend),
                      " image=", ShareUtilMac::CGImageToString(image),
                      " destRect=", ShareUtilMac::CGRectToString(destRect));
    usage.Start();
    if (image != nullptr)
        platform::CGContextDrawImage(target.context.get(), destRect, image.get());
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.CGContextDrawImage usageTime=", usage.Stop());
}

/// The shadow of the shared window below reaches beyond what is hidden of it.
TVLRect ShareCapturerAVFoundationCGSMix::WithShadow(const TVLRect& rcItem, const TVLRect& box) const {
    const int margin = m_nShadowWidth;
    if (ShareUtil::Extent(rcItem.left, rcItem.right) <= margin ||
        ShareUtil::Extent(rcItem.top, rcItem.bottom) <= margin)
        return rcItem;
    return ShareUtil::Intersect(
        {rcItem.left - margin, rcItem.top - margin, rcItem.right + margin, rcItem.bottom + margin}, box);
}

void ShareCapturerAVFoundationCGSMix::DrawPointer(const Target& target) {
    ShareDumpTimeUsage usage;
    const platform::CGPoint location = platform::CGEventGetLocation(platform::CGEventCreate(nullptr));
    const float scale = AppShareConfig::Instance()->GetCurrentScale();
    const platform::CGRect display = m_rectCapturedDisplay;
    if ((AppShareConfig::Instance()->m_nShareConfigFlags & SHARE_CONFIG_FLAG_NO_POINTER) == 0)
        m_bPointerCaptured = ShareUtilMac::CaptureCursorToCGContext(
            target.context.get(),
            {(location.x - display.origin.x) * scale, (location.y - display.origin.y) * scale}, scale);
    CmTraceDetail("ShareCapturerAVFoundationCGSMix.CaptureCursorToCGContext usageTime=", usage.Stop());
}
