// SPDX-License-Identifier: Apache-2.0
#include "src/mac/avfoundation/share_capturer_session.h"

#include "platform/core_graphics.h"
#include "platform/window_services.h"
#include "src/app_share_config.h"
#include "src/mac/share_capturer_context_mac.h"
#include "src/mac/share_util_mac.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>

#include <functional>
#include <new>
#include <utility>
#include <vector>

namespace {

/// Without one it counts as empty, and nobody knows what it was to cover.
bool HasShape(const TVLRegion& region) {
    TVLRect box{};
    return region.GetRgnBox(box);
}

/// A picture may be a little larger than what its box is projected to, which is cut to whole pixels: what
/// reaches the end of the box is to reach the end of the picture. False or std::bad_alloc without memory.
bool ReachTheEnd(TVLRegion& region, const TVLRect& box, float scale) {
    constexpr double PIXELS = 2;
    const int beyond = CmTruncate(PIXELS / static_cast<double>(scale)) + 1;
    bool isDone = true;
    for (TVLRect rect : region.AllRects()) {
        const bool isAtTheRight = rect.right == box.right;
        const bool isAtTheBottom = rect.bottom == box.bottom;
        rect.right = isAtTheRight ? ShareUtil::Sum(rect.right, beyond) : rect.right;
        rect.bottom = isAtTheBottom ? ShareUtil::Sum(rect.bottom, beyond) : rect.bottom;
        if (isAtTheRight || isAtTheBottom)
            isDone = region.AddRect(rect) && isDone;
    }
    return isDone;
}

/// Windows that the walk took for shared while nobody could tell whose they are; everything if it can't be
/// told where one is. Throws std::bad_alloc.
TVLRegion DoubtfulRegion(const ShareCapturerContext& context, const TVLRect& box) {
    TVLRegion region;
    if (context.GetUnSharedAppCount() == 0)
        return region;
    std::vector<unsigned> windows;
    context.GetCapturedWindows(windows);
    for (const unsigned window : windows) {
        if (!context.MayBeKeptOut(window))
            continue;
        platform::CGRect frame;
        const bool isKnown = platform::CGSGetScreenRectForWindow(platform::CGSDefaultConnection(), window,
                                                                 &frame) == platform::kCGErrorSuccess;
        if (!region.AddRect(isKnown ? ShareUtilMac::CGRectToTVLRect(frame) : box))
            throw std::bad_alloc();
    }
    return region;
}

} // namespace

ShareCapturerSession::~ShareCapturerSession() = default;

bool ShareCapturerSession::init() {
    CmTraceInfo("[", m_name, "::init] without context");
    bool isReady = false;
    CmCallGuarded("[ShareCapturerSession::init]>>fail>>",
                  [&] { isReady = init(MakeShareCapturerContext()); });
    return isReady;
}

void ShareCapturerSession::KeepContext(const std::shared_ptr<ShareCapturerContext>& context) {
    m_shareCapturerContext = context;
    shareUtilMacMonitorDraging.SetContext(context);
    if (context != nullptr) {
        context->m_bFindsExposed = true;
        m_interruptions = context->Interruptions();
        m_admissions = context->Admissions();
    }
    m_nCapturedDisplayId = platform::CGMainDisplayID();
    m_ShareAVFCapturer = std::make_shared<ShareAVFCapturer>();
}

void ShareCapturerSession::EndSession() {
    if (m_ShareAVFCapturer == nullptr)
        return;
    CmCallGuarded("[ShareCapturerSession::EndSession]>>fail>>", [this] { m_ShareAVFCapturer->stopRun(); });
    // A session that died is not stopped any more, and its queue would keep it for ever.
    CmCallGuarded("[ShareCapturerSession::EndSession]>>fail>>",
                  [this] { m_ShareAVFCapturer->destroyVideoInputAndOutput(); });
    m_ShareAVFCapturer = nullptr;
    if (m_shareCapturerContext != nullptr)
        m_shareCapturerContext->m_bFindsExposed = false;
}

bool ShareCapturerSession::IsDesktop() const {
    return m_shareCapturerContext == nullptr || m_shareCapturerContext->GetShareType() == SHARE_TYPE_DESKTOP;
}

unsigned ShareCapturerSession::setCaptureThreadCount(unsigned) {
    return static_cast<unsigned>(SHARE_RESULT_NOT_SUPPORTED);
}

int ShareCapturerSession::setFPS(int fps) {
    int rate = 0;
    if (m_ShareAVFCapturer != nullptr)
        CmCallGuarded("[ShareCapturerSession::setFPS]>>fail>>",
                      [&] { rate = m_ShareAVFCapturer->setFPS(fps); });
    return rate;
}

void ShareCapturerSession::setMaxSize(TVLSize size) {
    const TVLSize before = m_szMaxCapture;
    if (size == before)
        return;
    CmTraceInfo("[", m_name, "::setMaxSize],m_szMaxCapture:x=", before.cx, ",y=", before.cy,
                ",nMaxSize:x=", size.cx, ",y=", size.cy);
    m_szMaxCapture = size;
    if (m_ShareAVFCapturer == nullptr)
        return;
    CmCallGuarded("[ShareCapturerSession::setMaxSize]>>fail>>", [&] { m_ShareAVFCapturer->setScale(size); });
    m_fScale = m_ShareAVFCapturer->scaleFactor();
}

// ---- The display

int ShareCapturerSession::onDisplayPlugin(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[", m_name, "::onDisplayPlugin] captured display is plugin");
    return 1;
}

int ShareCapturerSession::onDisplayPlugout(unsigned display) {
    if (display != m_nCapturedDisplayId)
        return 0;
    CmTraceInfo("[", m_name, "::onDisplayPlugout] captured display is plugout");
    return 1;
}

int ShareCapturerSession::onScreenResolutionChanged(unsigned) {
    int code = SHARE_RESULT_FAILED;
    if (m_ShareAVFCapturer != nullptr)
        CmCallGuarded("[ShareCapturerSession::onScreenResolutionChanged]>>fail>>",
                      [&] { code = m_ShareAVFCapturer->setInputDisplay(m_nCapturedDisplayId); });
    return code == SHARE_RESULT_OK ? 1 : 0;
}

// ---- A pass

bool ShareCapturerSession::IsDraging() {
    std::function<void()> update;
    if (m_shareCapturerContext != nullptr) {
        m_withdrawals = m_shareCapturerContext->Withdrawals();
        m_box = BoxNow();
        update = [this] { m_shareCapturerContext->UpdateShareCapturerContext(); };
    }
    return shareUtilMacMonitorDraging.IsDraging(update);
}

/// What is on the lists counts as well: a window that is kept out may come right behind the walk.
bool ShareCapturerSession::KeepsOut() const {
    if (m_shareCapturerContext == nullptr)
        return false;
    std::vector<unsigned> keptOut;
    m_shareCapturerContext->GetCapturedExcludedWindows(keptOut);
    return !keptOut.empty() || m_shareCapturerContext->KeepsOut();
}

std::optional<ShareSampleGate> ShareCapturerSession::Gate() const {
    if (!KeepsOut())
        return std::nullopt;
    ShareSampleGate gate;
    gate.generation = m_shareCapturerContext->WalkedGeneration();
    gate.display = m_box;
    return gate;
}

/// What was on the screen while nobody was to see it, all or what has been let in since, may still wait in
/// the session.
void ShareCapturerSession::BeginAnewAfterInterruption() {
    if (m_shareCapturerContext == nullptr)
        return;
    const std::uint64_t interruptions = m_shareCapturerContext->Interruptions();
    const std::uint64_t admissions = m_shareCapturerContext->Admissions();
    if (interruptions == m_interruptions && admissions == m_admissions)
        return;
    m_interruptions = interruptions;
    m_admissions = admissions;
    BeginAnew();
}

void ShareCapturerSession::BeginAnew() {
    m_isFresh = true;
    m_ShareAVFCapturer->beginAnew();
}

/// A session is silent as long as the screen stands still, also when something else is to be hidden by now
/// and when a sample was lost because its windows were not those that were walked.
void ShareCapturerSession::BeginAnewWhenSilent() {
    if (!m_isFresh && m_shown != MasksNow())
        BeginAnew();
}

ShareCapturerSession::Masks ShareCapturerSession::MasksNow() const {
    Masks masks;
    if (m_shareCapturerContext == nullptr)
        return masks;
    TVLRegion region;
    m_shareCapturerContext->GetOverlapRegion(region);
    masks.overlap = region.AllRects();
    m_shareCapturerContext->GetExposedRegion(region);
    masks.exposed = region.AllRects();
    if (IsDesktop())
        return masks;
    m_shareCapturerContext->GetBackgroundInvisiableRegion(region);
    masks.background = region.AllRects();
    return masks;
}

unsigned ShareCapturerSession::CopySample(IShareFrame* frame) {
    if (m_ShareAVFCapturer == nullptr)
        return static_cast<unsigned>(SHARE_CAPTURE_FAILED);
    BeginAnewAfterInterruption();
    m_ShareAVFCapturer->setGate(Gate());
    const unsigned code = m_ShareAVFCapturer->captureToIShareFrame(frame);
    if (code == static_cast<unsigned>(SHARE_CAPTURE_NO_DATA)) {
        BeginAnewWhenSilent();
        // Between two samples that can't be used: while that goes on, the session gives nothing.
        return m_ShareAVFCapturer->isStackUntold() ? static_cast<unsigned>(SHARE_CAPTURE_FAILED) : code;
    }
    m_isFresh = false;
    m_shown.reset();
    return code;
}

TVLRect ShareCapturerSession::Stamp(IShareFrame& frame, bool pointer) const {
    IShareFrame::MetaInfo meta{};
    if (m_shareCapturerContext != nullptr)
        m_shareCapturerContext->GetDisplayBoxRect(meta.rectCapture);
    meta.bPointerCaptured = pointer;
    frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    frame.SetMetaInfo(meta);
    return meta.rectCapture;
}

float ShareCapturerSession::ScaleOf(IShareFrame& frame, const TVLRect& box) const {
    if (box.right <= box.left)
        return m_fScale;
    TVLSize size{};
    frame.GetFrameSize(size);
    return static_cast<float>(size.cx) / static_cast<float>(ShareUtil::Extent(box.left, box.right));
}

bool ShareCapturerSession::IsOutdated() const {
    return m_shareCapturerContext != nullptr &&
           (m_shareCapturerContext->Withdrawals() != m_withdrawals ||
            m_shareCapturerContext->Interruptions() != m_interruptions || !(BoxNow() == m_box));
}

TVLRect ShareCapturerSession::BoxNow() const {
    TVLRect box{};
    m_shareCapturerContext->GetDisplayBoxRect(box);
    return box;
}

int ShareCapturerSession::Give() {
    if (IsOutdated())
        return SHARE_CAPTURE_NO_DATA;
    m_shown = MasksNow();
    return SHARE_CAPTURE_OK;
}

// ---- Hiding

bool ShareCapturerSession::Hide(IShareFrame& frame, TVLRegion region, const TVLRect& box, float scale,
                                int colour) {
    bool isDone = HasShape(region) && ReachTheEnd(region, box, scale);
    if (isDone) {
        region.ProjectRgn(box, scale);
        isDone = HasShape(region) &&
                 (region.IsEmpty() || ShareUtilMac::FillFrame(&frame, colour, &region) == SHARE_RESULT_OK);
    }
    if (!isDone)
        ShareUtilMac::FillFrame(&frame, BLACK, nullptr);
    return isDone;
}

bool ShareCapturerSession::HideAroundShare(IShareFrame& frame, const TVLRect& box, float scale) const {
    if (m_shareCapturerContext == nullptr)
        return true;
    TVLRegion exposed;
    m_shareCapturerContext->GetExposedRegion(exposed);
    if (IsDesktop()) {
        TVLRegion overlap;
        m_shareCapturerContext->GetOverlapRegion(overlap);
        exposed.CombineRgn(overlap, REGION_COMBINE_DIFF);
        return Hide(frame, std::move(exposed), box, scale, BLACK) &&
               Hide(frame, DoubtfulRegion(*m_shareCapturerContext, box), box, scale, BLACK);
    }
    TVLRegion background;
    m_shareCapturerContext->GetBackgroundInvisiableRegion(background);
    TVLRegion visible;
    m_shareCapturerContext->GetVisiableRegion(visible);
    exposed.CombineRgn(visible, REGION_COMBINE_AND);
    return Hide(frame, std::move(background), box, scale,
                AppShareConfig::Instance()->m_nAppShareBackgroundColor) &&
           Hide(frame, std::move(exposed), box, scale, BLACK);
}
