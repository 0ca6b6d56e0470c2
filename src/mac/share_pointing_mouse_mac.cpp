// SPDX-License-Identifier: Apache-2.0
#include "src/mac/share_pointing_mouse_mac.h"

#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/share_ref.h"
#include "src/share_util.h"
#include "util/cm_guarded_call.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <cmath>
#include <cstdint>
#include <vector>

namespace {

constexpr int NO_HOT_POINT = -4;
constexpr double SAME_POINTS = 0.02; // less than any cursor is drawn finer
constexpr float STILL_POINTS = 0.5F;

std::optional<platform::NSCursor> CopyOf(const std::optional<platform::NSCursor>& cursor) {
    if (!cursor)
        return std::nullopt;
    return platform::NSCursor(cursor->image(), cursor->hotSpot());
}

// What isn't there has no size and its hot spot at the origin.

platform::CGPoint HotSpotOf(const platform::NSCursor* cursor) {
    return cursor != nullptr ? cursor->hotSpot() : platform::CGPoint();
}

const platform::NSImage* ImageOf(const platform::NSCursor* cursor) {
    return cursor != nullptr ? cursor->image().get() : nullptr;
}

platform::CGSize SizeOf(const platform::NSImage* image) {
    return image != nullptr ? image->size() : platform::CGSize();
}

std::vector<std::uint8_t> BytesOf(const platform::NSImage* image) {
    if (image == nullptr)
        return {};
    return platform::CGDataProviderCopyData(
        platform::CGImageGetDataProvider(image->CGImageForProposedRect()));
}

bool Differ(float one, float other) {
    return std::abs(static_cast<double>(one) - static_cast<double>(other)) > SAME_POINTS;
}

bool IsStill(float distance) {
    return distance > -STILL_POINTS && distance < STILL_POINTS;
}

/// The image goes as the system has it: a bitmap with more pixels than the size in points doesn't fit, and
/// the frame stays empty then.
void FillFrame(IShareFrame& frame, SHARE_FRAME_FORMAT format, const platform::NSImage* image) {
    const platform::CGSize size = SizeOf(image);
    frame.SetFrameDataFormat(format);
    frame.SetFrameSize(CmTruncate(size.width), CmTruncate(size.height));
    const std::vector<std::uint8_t> bytes = BytesOf(image);
    if (bytes.empty())
        return;
    frame.WriteFrameData(bytes.data(), static_cast<int>(bytes.size()));
    frame.SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
}

} // namespace

// ---- The cursor of a moment

CCursorImageMac::CCursorImageMac(signed char) : m_cursor(CopyOf(platform::NSCursor::currentSystemCursor())) {}

CCursorImageMac::CCursorImageMac(const CCursorImageMac& other) : m_cursor(CopyOf(other.m_cursor)) {}

int CCursorImageMac::GetHotPointX() const {
    return m_cursor ? CmTruncate(m_cursor->hotSpot().x) : NO_HOT_POINT;
}

int CCursorImageMac::GetHotPointY() const {
    return m_cursor ? CmTruncate(m_cursor->hotSpot().y) : NO_HOT_POINT;
}

bool CCursorImageMac::IsSame(const platform::NSCursor* other) const {
    const platform::CGPoint hotSpot = HotSpotOf(Cursor());
    const platform::CGPoint otherHotSpot = HotSpotOf(other);
    if (Differ(hotSpot.x, otherHotSpot.x) || Differ(hotSpot.y, otherHotSpot.y))
        return false;
    const platform::NSImage* const image = ImageOf(Cursor());
    const platform::NSImage* const otherImage = ImageOf(other);
    const platform::CGSize size = SizeOf(image);
    const platform::CGSize otherSize = SizeOf(otherImage);
    if (Differ(size.width, otherSize.width) || Differ(size.height, otherSize.height))
        return false;
    // Bytes last: this is asked at each poll.
    return image == otherImage || BytesOf(image) == BytesOf(otherImage);
}

bool CCursorImageMac::IsSame(const CCursorImageMac& other) const {
    return IsSame(other.Cursor());
}

// ---- Life

CSharePointingMouseMac::CSharePointingMouseMac(unsigned baseDisplay) : CSharePointingMouse(baseDisplay) {
    platform::CGDisplayRegisterReconfigurationCallback(DisplayReconfigCallBack, this);
}

CSharePointingMouseMac::~CSharePointingMouseMac() {
    platform::CGDisplayRemoveReconfigurationCallback(DisplayReconfigCallBack, this);
}

int CSharePointingMouseMac::Start() {
    InitPointingContext();
    return SHARE_RESULT_OK;
}

int CSharePointingMouseMac::SetBaseDisplayID(unsigned display) {
    m_nBaseDisplayID = display;
    InitPointingContext();
    return SHARE_RESULT_OK;
}

void CSharePointingMouseMac::OnDisplayChanged() {
    InitPointingContext();
}

int CSharePointingMouseMac::InitPointingContext() {
    CmTraceDebug("CSharePointingMouseMac::InitPointingContext()");
    // Of two that look the bounds up, the one that saw the newer display must be the last to store them.
    const std::lock_guard<std::mutex> lock(m_contextMutex);
    const unsigned baseDisplay = m_nBaseDisplayID;
    for (const platform::NSScreen& screen : platform::NSScreen::screens()) {
        if (screen.deviceDescription().NSScreenNumber != baseDisplay)
            continue;
        m_rcScreenBounds = platform::CGDisplayBounds(baseDisplay);
        break;
    }
    return SHARE_RESULT_OK;
}

void CSharePointingMouseMac::DisplayReconfigCallBack(unsigned /*display*/, unsigned flags, void* userInfo) {
    if (userInfo != nullptr)
        static_cast<CSharePointingMouseMac*>(userInfo)->InitPointingContext();
    CmTraceInfo("[CSharePointingMouseMac::_DisplayReconfigCallBack] flag=", flags);
}

// ---- Polling

int CSharePointingMouseMac::CapturePoint(SHARE_FRAME_FORMAT format) {
    const bool polled = CmCallGuarded("CSharePointingMouseMac::CapturePoint() fail ", [&] {
        CaptureCursor(format);
        CapturePosition();
    });
    return polled ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

void CSharePointingMouseMac::CaptureCursor(SHARE_FRAME_FORMAT format) {
    const CCursorImageMac current(0);
    if (m_pLastCursor != nullptr && current.IsSame(*m_pLastCursor))
        return;
    const ShareRef<CCursorImage> image(new CCursorImage);
    image.Get()->SetHotPointX(current.GetHotPointX());
    image.Get()->SetHotPointY(current.GetHotPointY());
    FillFrame(*image.Get()->GetImgData(), format, ImageOf(current.Cursor()));
    if (m_listSink.empty())
        CmTraceDebug("CSharePointingMouseMac::CapturePoint() cursor changed but no sink to notify");
    else
        CmTraceDebug("CSharePointingMouseMac::CapturePoint() call sink's OnPointingImgChanged()");
    _TellImage(image.Get());
    m_pLastCursor = std::make_unique<CCursorImageMac>(current);
}

void CSharePointingMouseMac::CapturePosition() {
    const platform::CGPoint position = platform::CGEventGetLocation(platform::CGEventCreate(nullptr));
    // Drift adds up: what counts as still isn't stored.
    if (IsStill(position.y - m_fLastY) && IsStill(position.x - m_fLastX))
        return;
    m_fLastX = position.x;
    m_fLastY = position.y;
    const platform::CGRect screen = m_rcScreenBounds;
    CmTraceDetail("CSharePointingMouseMac::CapturePoint() m_rcScreenBounds=", screen.origin.x,
                  " y=", screen.origin.y, " w=", screen.size.width, " h=", screen.size.height);
    CmTraceDetail("CSharePointingMouseMac::CapturePoint() origin gc_position=", position.x,
                  " y=", position.y);
    if (platform::CGRectContainsPoint(screen, position))
        TellPositionInFrame(position, screen);
}

void CSharePointingMouseMac::TellPositionInFrame(const platform::CGPoint& position,
                                                 const platform::CGRect& screen) {
    const float x = position.x - screen.origin.x;
    const float y = position.y - screen.origin.y;
    CmTraceDebug("CSharePointingMouseMac::CapturePoint() Converted gc_position=", x, " y=", y);
    const float scale = AppShareConfig::Instance()->GetCurrentScale();
    const float scaledX = x * scale;
    const float scaledY = y * scale;
    CmTraceDetail("CSharePointingMouseMac::CapturePoint() Scaled gc_position=", scaledX, " y=", scaledY,
                  " scale=", scale);
    _TellPosition(CmTruncate(scaledX), CmTruncate(scaledY));
}
