// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition.h"

#include "platform/bitmap_context_clip.h"
#include "platform/core_graphics.h"
#include "platform/pixel_region.h"
#include "platform/window_services.h"
#include "src/app_share_config.h"
#include "src/mac/cgs_composition_note.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_util_mac.h"
#include "src/share_capturer_context.h"
#include "src/share_dump_time_usage.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_capturer.h>
#include <screenshare/share_frame.h>
#include <screenshare/share_graphic_util.h>

#include <algorithm>
#include <cstring>
#include <new>
#include <optional>
#include <utility>

namespace {

constexpr int BLACK = 0;
constexpr int BYTES_PER_PIXEL = 4;

bool HasArea(const platform::CGRect& rect) {
    return rect.size.width != 0 && rect.size.height != 0;
}

TVLSize PixelsOf(const platform::CGSize& points, float scale) {
    return {CmTruncate(points.width * scale), CmTruncate(points.height * scale)};
}

void FillWhole(platform::CGContext* context, TVLSize size, int colour) {
    float red = 0;
    float green = 0;
    float blue = 0;
    ShareUtilMac::GetRGBfromInt(colour, red, green, blue);
    platform::CGContextSetRGBFillColor(context, red, green, blue, 1.0F);
    platform::CGContextFillRect(context,
                                {{0, 0}, {static_cast<float>(size.cx), static_cast<float>(size.cy)}});
}

/// Where a length lies that is centred in another; whole pixels, the odd one behind it.
float CentredIn(int whole, int part) {
    const int margin = std::max(whole - part, 0) / 2;
    return static_cast<float>(margin);
}

bool HasFlag(SHARE_CONFIG_FLAGS flag) {
    return (AppShareConfig::Instance()->m_nShareConfigFlags & flag) != 0;
}

void TraceDrawing(ShareDumpTimeUsage& usage, const platform::CGWindowImage* image,
                  const platform::CGRect& place) {
    if (!HasFlag(SHARE_CONFIG_FLAG_PERFORMANCE_TRACE) || !CmTraceOn(CM_TRACE_INFO))
        return;
    CmTraceInfo("[Performance]CShareCGSCapturer.CGContextDrawImage usagetime=", usage.Stop(),
                " image={w=", platform::CGWindowImageGetWidth(image),
                " h=", platform::CGWindowImageGetHeight(image),
                "} destRect=", ShareUtilMac::CGRectToString(place).c_str());
}

} // namespace

struct CShareCGSCapturer::Pass {
    TVLSize bitmap{};
    TVLSize capture{};
    platform::CGWindowImageRef image;
    platform::CGRect imageRect; // what the image shows
    platform::CGRect drawRect;  // what the frame shows
    bool isDesktop = true;
    int background = BLACK; // read once: the note tells the colour that was painted
    platform::CGRect place; // where the image goes, counted from the bottom of the frame
    std::optional<ShareCursorDrawing> pointer;
    bool hasPlaces = false; // these two are known

    /// Whether the image leaves nothing of what is where the context can be painted on now.
    bool CoversClip(const platform::CGContext* context) const {
        return platform::CGContextIsCovered(context, place, image.get());
    }
};

CShareCGSCapturer::CShareCGSCapturer(const std::shared_ptr<ShareCapturerContext>& context)
    : m_shareCapturerContext(context),
      m_nCapturedDisplayId(platform::CGMainDisplayID()),
      m_fDisplayScale(CMonitorEnumMac::screenScaleFactorForDisplayID(m_nCapturedDisplayId)),
      m_rectCapturedDisplay(platform::CGDisplayBounds(m_nCapturedDisplayId)) {}

CShareCGSCapturer::~CShareCGSCapturer() = default;

// ---- Sizes

void CShareCGSCapturer::calcScreenSize(unsigned display, TVLSize max, platform::CGRect& rect, TVLSize& bitmap,
                                       TVLSize& capture) {
    const float scale = CMonitorEnumMac::screenScaleFactorForDisplayID(display);
    const platform::CGSize points{static_cast<float>(platform::CGDisplayPixelsWide(display)),
                                  static_cast<float>(platform::CGDisplayPixelsHigh(display))};
    calcCaptureSize(PixelsOf(points, scale), max, bitmap, capture);
    rect = platform::CGDisplayBounds(display);
}

void CShareCGSCapturer::calcCaptureSize(TVLSize source, TVLSize max, TVLSize& bitmap, TVLSize& capture) {
    const AppShareConfig& config = *AppShareConfig::Instance();
    bitmap = source;
    if (!config.m_bCaptureResampleEnable) {
        capture = bitmap;
        return;
    }
    if (!config.m_bCaptureResampleFixSizeEnable) {
        bitmap = TvlGraphicUtil::TvlGetMaxCapSize(source, max);
        capture = bitmap;
        return;
    }
    bitmap = {config.GetResampleScreenCaptureWidth(), config.GetResampleScreenCaptureHeight()};
    const float across = static_cast<float>(source.cx) / static_cast<float>(bitmap.cx);
    const float down = static_cast<float>(source.cy) / static_cast<float>(bitmap.cy);
    if (across > down)
        capture = {bitmap.cx, CmTruncate(static_cast<double>(bitmap.cx) * source.cy / source.cx)};
    else
        capture = {CmTruncate(static_cast<double>(source.cx) * bitmap.cy / source.cy), bitmap.cy};
}

bool CShareCGSCapturer::IsWindowArea() const {
    return !isDesktopSharing() && !m_shareCapturerContext->m_bNoWindowBaseArea;
}

/// The frame becomes as large as what the windows cover.
void CShareCGSCapturer::FitToWindows(Pass& pass) {
    const TVLSize source = PixelsOf(pass.imageRect.size, m_fDisplayScale);
    calcCaptureSize(source, m_szMaxCapture, pass.bitmap, pass.capture);
    pass.drawRect = pass.imageRect;
    if (pass.imageRect.size.width > 0)
        AppShareConfig::Instance()->SetCurrentScale(static_cast<float>(pass.bitmap.cx) /
                                                    pass.imageRect.size.width);
}

// ---- A pass

int CShareCGSCapturer::capture(IShareFrame* frame, unsigned display, TVLSize bitmap, TVLSize capture) {
    if (frame == nullptr)
        return SHARE_CAPTURE_FAILED;
    m_bPointerCaptured = false;
    m_nDrawnMoment = 0;
    if (display != m_nCapturedDisplayId) {
        m_nCapturedDisplayId = display;
        m_fDisplayScale = CMonitorEnumMac::screenScaleFactorForDisplayID(display);
    }
    m_rectCapturedDisplay = platform::CGDisplayBounds(display);

    Pass pass{bitmap, capture, nullptr, {}, m_rectCapturedDisplay, isDesktopSharing(), BLACK, {}, {}};
    if (!pass.isDesktop)
        pass.background = AppShareConfig::Instance()->m_nAppShareBackgroundColor;
    const int result = createShareImage(m_rectCapturedDisplay, pass.image, pass.imageRect);
    if (result == SHARE_CAPTURE_NO_DATA)
        pass.imageRect = m_rectLastCapture.size.width != 0 ? m_rectLastCapture : m_rectCapturedDisplay;
    else if (result != SHARE_CAPTURE_OK)
        return result;
    if (IsWindowArea())
        FitToWindows(pass);

    PutInto(*frame, pass);
    KeepPass(pass);
    return SHARE_CAPTURE_OK;
}

bool CShareCGSCapturer::captureAgain(IShareFrame& frame) {
    if (m_lastPass == nullptr)
        return false;
    Pass pass = *m_lastPass;
    pass.image = m_lastImage.Recall();
    if (pass.image == nullptr)
        return false;
    PutInto(frame, pass);
    return true;
}

bool CShareCGSCapturer::captureSameWindows(IShareFrame& frame) {
    if (m_lastPass == nullptr)
        return false;
    Pass pass = *m_lastPass;
    pass.image = createScreenShot(m_windows.data(), m_windows.size(), m_rectCapturedDisplay, pass.imageRect);
    if (pass.image == nullptr)
        return false;
    pass.hasPlaces = false;
    pass.pointer.reset();
    m_bPointerCaptured = false;
    PutInto(frame, pass);
    KeepPass(pass);
    return true;
}

void CShareCGSCapturer::PutInto(IShareFrame& frame, Pass& pass) {
    CShareFrame* const own = CShareFrame::OwnOf(&frame);
    std::unique_ptr<ShareCompositionNote> before = own != nullptr ? TakeNote(*own) : nullptr;
    PrepareFrame(frame, pass);
    m_rectLastCapture = pass.drawRect;
    if (!pass.hasPlaces)
        FindPlaces(pass);
    Show(pass, own, before.get());
    if (m_note == nullptr)
        m_note = std::move(before);
    m_nDrawnMoment = platform::CGWindowImageGetMoment(pass.image.get());
    frame.SetMetaInfo({ShareUtilMac::CGRectToTVLRect(pass.drawRect), m_bPointerCaptured});
}

/// Where the picture and the pointer go in a frame that is ready for them.
void CShareCGSCapturer::FindPlaces(Pass& pass) {
    if (pass.image == nullptr)
        return;
    pass.place = PlaceOf(pass);
    FindPointer(pass);
    pass.hasPlaces = true;
}

void CShareCGSCapturer::KeepPass(const Pass& pass) {
    m_lastImage.Keep(pass.image.get());
    if (m_nDrawnMoment == 0) {
        m_lastPass.reset();
        return;
    }
    if (m_lastPass == nullptr)
        m_lastPass = std::make_unique<Pass>(pass);
    else
        *m_lastPass = pass;
    m_lastPass->image = nullptr;
}

/// Null also for a note of somebody else.
std::unique_ptr<ShareCompositionNote> CShareCGSCapturer::TakeNote(CShareFrame& frame) {
    std::unique_ptr<ShareFrameNote> note = frame.TakeNote();
    auto* const ours = dynamic_cast<ShareCompositionNote*>(note.get());
    if (ours != nullptr)
        static_cast<void>(note.release());
    return std::unique_ptr<ShareCompositionNote>(ours);
}

void CShareCGSCapturer::PrepareFrame(IShareFrame& frame, const Pass& pass) {
    frame.Reset();
    frame.SetFrameDataFormat(SHARE_FRAME_FORMAT_RGBA);
    frame.SetFrameSize(pass.bitmap);
    initCapturerByData(frame.GetFrameData(), static_cast<unsigned long>(std::max(frame.GetFrameDataLen(), 0)),
                       pass.bitmap);
}

void CShareCGSCapturer::initCapturerByData(unsigned char* data, unsigned long length, TVLSize size) {
    const unsigned long rowBytes = static_cast<unsigned long>(std::max(size.cx, 0)) * BYTES_PER_PIXEL;
    const bool isLongEnough = length >= rowBytes * static_cast<unsigned long>(std::max(size.cy, 0));
    if (m_bmpContext != nullptr && data == m_pFrameData && size == m_sizeBmpContext && isLongEnough)
        return;
    m_sizeBmpContext = size;
    m_pFrameData = data;
    m_bmpContext = platform::CGBitmapContextCreate(data, length, size.cx, size.cy, 8,
                                                   CmTruncate(static_cast<double>(rowBytes)), m_nBitmapInfo);
    platform::CGContextSetInterpolationQuality(m_bmpContext.get(), platform::kCGInterpolationHigh);
    // Nothing will be painted then, and what the memory held was some earlier picture.
    if (m_bmpContext == nullptr && data != nullptr)
        std::memset(data, 0, length);
}

/// Where the picture goes, counted from the bottom of the frame.
platform::CGRect CShareCGSCapturer::PlaceOf(const Pass& pass) const {
    const platform::CGRect whole{
        {CentredIn(pass.bitmap.cx, pass.capture.cx), CentredIn(pass.bitmap.cy, pass.capture.cy)},
        {static_cast<float>(pass.capture.cx), static_cast<float>(pass.capture.cy)}};
    if (pass.isDesktop || IsWindowArea())
        return whole;
    const platform::CGRect& bounds = m_rectCapturedDisplay;
    const platform::CGRect& image = pass.imageRect;
    const float fromBottom = bounds.origin.y + bounds.size.height - image.origin.y - image.size.height;
    return {{(image.origin.x - bounds.origin.x) * whole.size.width / bounds.size.width + whole.origin.x,
             fromBottom * whole.size.height / bounds.size.height + whole.origin.y},
            {whole.size.width * image.size.width / bounds.size.width,
             whole.size.height * image.size.height / bounds.size.height}};
}

void CShareCGSCapturer::FindPointer(Pass& pass) {
    const std::optional<platform::CGPoint> told = platform::CGWindowImageGetPointer(pass.image.get());
    const platform::CGPoint location =
        told ? *told : platform::CGEventGetLocation(platform::CGEventCreate(nullptr));
    const platform::CGRect& drawRect = pass.drawRect;
    if (!platform::CGRectContainsPoint(drawRect, location)) {
        m_bPointerCaptured = true;
        return;
    }
    if (HasFlag(SHARE_CONFIG_FLAG_NO_POINTER))
        return;
    const float scale = AppShareConfig::Instance()->GetCurrentScale();
    const platform::CGPoint place{(location.x - drawRect.origin.x) * scale,
                                  (location.y - drawRect.origin.y) * scale};
    pass.pointer = ShareUtilMac::FindCursor(m_bmpContext.get(), place, scale);
    m_bPointerCaptured = pass.pointer.has_value();
}

// ---- Drawing

/// The frame has no note meanwhile, so that none is left by a drawing that doesn't come to its end.
void CShareCGSCapturer::Show(const Pass& pass, CShareFrame* frame, const ShareCompositionNote* before) {
    ShareDumpTimeUsage usage;
    const bool isKnown = frame != nullptr && frame->AllowsNote() && Describe(pass);
    const bool isShown =
        isKnown && before != nullptr && (m_note->IsSameAs(*before) || DrawChanges(pass, *before));
    const bool isWhole = isShown || DrawAll(pass);
    if (pass.image != nullptr)
        TraceDrawing(usage, pass.image.get(), pass.place);
    if (isKnown && isWhole)
        frame->PutNote(std::move(m_note));
}

/// False when it can't be told what the frame will show.
bool CShareCGSCapturer::Describe(const Pass& pass) noexcept {
    try {
        if (m_note == nullptr)
            m_note = std::make_unique<ShareCompositionNote>();
        ShareComposition composition{pass.bitmap, std::nullopt, pass.place, pass.image.get(), pass.pointer};
        if (!pass.CoversClip(m_bmpContext.get()))
            composition.background = pass.background;
        if (!m_note->Describe(m_bmpContext.get(), composition))
            return false;
        Number();
        return true;
    } catch (const std::bad_alloc&) {
        return false;
    }
}

/// Frames take turns, so that the one before last may show the same.
void CShareCGSCapturer::Number() {
    if (m_lastDescribed == nullptr)
        m_lastDescribed = std::make_unique<ShareCompositionNote>();
    if (m_lastDescribed->Number() == 0 || !m_note->IsSameAs(*m_lastDescribed)) {
        m_lastDescribed->SetNumber(0); // until it is whole
        m_note->SetNumber(ShareFrameNote::NewNumber());
        *m_lastDescribed = *m_note;
    }
    m_note->SetNumber(m_lastDescribed->Number());
}

/// False when all has to be drawn.
bool CShareCGSCapturer::DrawChanges(const Pass& pass, const ShareCompositionNote& before) {
    try {
        const std::optional<platform::PixelRegion> changes = m_note->ChangesSince(before, pass.image.get());
        return changes && DrawPart(pass, *changes);
    } catch (const std::bad_alloc&) {
        return false;
    }
}

/// False when memory ran out and something may be missing. Throws std::bad_alloc before anything is drawn.
bool CShareCGSCapturer::DrawPart(const Pass& pass, const platform::PixelRegion& part) {
    const std::vector<platform::PixelRect> rects = part.Rects();
    const bool hasPointer = m_note->HasPointerIn(part);
    bool isWhole = true;
    for (const platform::PixelRect& rect : rects) {
        platform::CGContextSetClip(m_bmpContext.get(), {rect.left, rect.top, rect.right, rect.bottom});
        PaintBackground(pass);
        isWhole &= platform::CGContextDrawWindowImage(m_bmpContext.get(), pass.place, pass.image.get());
    }
    platform::CGContextResetClip(m_bmpContext.get());
    return (!hasPointer || DrawPointer(pass)) && isWhole;
}

bool CShareCGSCapturer::DrawAll(const Pass& pass) {
    PaintBackground(pass);
    if (pass.image == nullptr)
        return true;
    const bool isWhole = platform::CGContextDrawWindowImage(m_bmpContext.get(), pass.place, pass.image.get());
    // Where a layer is missing, the frame may still show an earlier picture.
    if (!isWhole && pass.CoversClip(m_bmpContext.get()))
        FillWhole(m_bmpContext.get(), pass.bitmap, pass.background);
    return DrawPointer(pass) && isWhole;
}

/// Frames are used again and again: what the picture doesn't cover would still show an earlier one, of
/// windows that may be kept out by now.
void CShareCGSCapturer::PaintBackground(const Pass& pass) {
    if (!pass.CoversClip(m_bmpContext.get()))
        FillWhole(m_bmpContext.get(), pass.bitmap, pass.background);
}

bool CShareCGSCapturer::DrawPointer(const Pass& pass) {
    return !pass.pointer ||
           platform::CGContextDrawImage(m_bmpContext.get(), pass.pointer->rect, pass.pointer->image.get());
}

// ---- Windows

bool CShareCGSCapturer::isDesktopSharing() const {
    return m_shareCapturerContext == nullptr || m_shareCapturerContext->GetShareType() == SHARE_TYPE_DESKTOP;
}

bool CShareCGSCapturer::isWindowShared(unsigned window) const {
    return m_shareCapturerContext == nullptr || m_shareCapturerContext->IsWindowShared(window);
}

int CShareCGSCapturer::createShareImage(const platform::CGRect& rect, platform::CGWindowImageRef& image,
                                        platform::CGRect& outRect) {
    image = nullptr;
    m_windows.clear();
    if (isDesktopSharing()) {
        std::vector<int> onScreen;
        getCaptureWindows(onScreen);
        m_windows.assign(onScreen.begin(), onScreen.end());
    } else {
        TVLRect box{};
        m_shareCapturerContext->GetCapturedWindows(m_windows);
        m_shareCapturerContext->GetSharedWindowBoxRect(box);
        outRect = ShareUtilMac::TVLRectToCGRect(box);
    }
    if (m_windows.empty())
        return SHARE_CAPTURE_NO_DATA;
    image = createScreenShot(m_windows.data(), m_windows.size(), rect, outRect);
    return image != nullptr ? SHARE_CAPTURE_OK : SHARE_CAPTURE_FAILED;
}

bool CShareCGSCapturer::getCaptureWindows(std::vector<int>& windows) {
    ShareUtilMac::GetOnScreenWindowList(windows);
    if (m_shareCapturerContext != nullptr)
        m_shareCapturerContext->KeepShared(windows);
    return true;
}

platform::CGWindowImageRef CShareCGSCapturer::createScreenShot(const unsigned* windows, unsigned long count,
                                                               const platform::CGRect& rect,
                                                               platform::CGRect& outRect) {
    if (windows == nullptr || count == 0)
        return nullptr;
    const std::span<const platform::CGWindowID> list(windows, count);
    const bool isDesktop = isDesktopSharing();
    if (isDesktop)
        outRect = rect;
    else if (!HasArea(outRect))
        outRect = getAppRect(list, rect);
    const unsigned options =
        isDesktop ? platform::kCGWindowImageBoundsIgnoreFraming : platform::kCGWindowImageDefault;
    return platform::CGWindowListTakeImage(
        outRect, list, options, m_shareCapturerContext != nullptr && m_shareCapturerContext->KeepsOut());
}

platform::CGRect CShareCGSCapturer::getAppRect(std::span<const platform::CGWindowID> windows,
                                               const platform::CGRect& rect) {
    const TVLRect clip = ShareUtilMac::CGRectToTVLRect(rect);
    TVLRect box{};
    bool isFirst = true;
    for (const platform::CGWindowDescription& window :
         platform::CGWindowListCreateDescriptionFromArray(windows)) {
        const TVLRect part =
            ShareUtil::Intersect(ShareUtilMac::CGRectToTVLRect(window.kCGWindowBounds), clip);
        if (part == TVLRect{})
            continue;
        box = isFirst ? part
                      : TVLRect{std::min(box.left, part.left), std::min(box.top, part.top),
                                std::max(box.right, part.right), std::max(box.bottom, part.bottom)};
        isFirst = false;
    }
    platform::CGRect result = ShareUtilMac::TVLRectToCGRect(box);
    // Each component for itself: an origin that moves doesn't take the far corner along.
    result.origin = {std::max(result.origin.x, rect.origin.x), std::max(result.origin.y, rect.origin.y)};
    result.size = {std::min(result.size.width, rect.size.width),
                   std::min(result.size.height, rect.size.height)};
    return result;
}

platform::CGImageRef CShareCGSCapturer::captureRect(const unsigned* windows, unsigned long count,
                                                    const platform::CGRect& rect, bool ignoreFraming) {
    if (windows == nullptr || count == 0)
        return nullptr;
    return platform::CGWindowListCreateImageFromArray(rect, {windows, count}, ignoreFraming ? 1 : 0);
}
