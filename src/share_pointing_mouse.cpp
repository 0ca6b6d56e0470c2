// SPDX-License-Identifier: Apache-2.0
#include "src/share_pointing_mouse.h"

#include "src/app_share_config.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_clock.h"
#include "util/cm_guarded_call.h"
#include "util/cm_trace.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <initializer_list>
#include <random>

namespace {

constexpr int CURSOR_EDGE = 16; // pixels
constexpr std::size_t CURSOR_PIXELS = std::size_t{CURSOR_EDGE} * CURSOR_EDGE;
constexpr std::size_t MAX_PIXEL_BYTES = 4;

using CursorBytes = std::array<unsigned char, CURSOR_PIXELS * MAX_PIXEL_BYTES>;

CursorBytes FilledWith(std::initializer_list<unsigned char> pixel) {
    CursorBytes bytes{};
    auto place = bytes.begin();
    for (std::size_t i = 0; i < CURSOR_PIXELS; ++i)
        place = std::copy(pixel.begin(), pixel.end(), place);
    return bytes;
}

/// Opaque, and the same bytes of colour for layouts that only differ in their order. A format that is none
/// stays empty.
CursorBytes PaintCursor(SHARE_FRAME_FORMAT format) {
    switch (format) {
        case SHARE_FRAME_FORMAT_RGBA:
        case SHARE_FRAME_FORMAT_BGRA:
            return FilledWith({0x00, 0x00, 0xFF, 0xFF});
        case SHARE_FRAME_FORMAT_ARGB:
        case SHARE_FRAME_FORMAT_ABGR:
            return FilledWith({0xFF, 0x00, 0x00, 0xFF});
        case SHARE_FRAME_FORMAT_RGB:
        case SHARE_FRAME_FORMAT_BGR:
            return FilledWith({0x00, 0x00, 0xFF});
        case SHARE_FRAME_FORMAT_NONE:
            break;
    }
    return {};
}

} // namespace

CCursorImage::CCursorImage() : m_pImgFrame(new CShareFrame) {
    m_pImgFrame->AddRef();
}

CCursorImage::~CCursorImage() {
    m_pImgFrame->Release();
}

CSharePointingMouse::CSharePointingMouse(unsigned baseDisplay) : m_nBaseDisplayID(baseDisplay) {}

CSharePointingMouse::~CSharePointingMouse() {
    CSharePointingMouse::CleanSink();
}

int CSharePointingMouse::AddSink(ISharePointingSink* sink) {
    CmTraceDebug("CSharePointingMouse::AddSink(", static_cast<const void*>(sink), ")");
    const bool isThere = std::find(m_listSink.begin(), m_listSink.end(), sink) != m_listSink.end();
    if (sink != nullptr && !isThere)
        CmCallGuarded("CSharePointingMouse::AddSink fail ", [&] { m_listSink.push_back(sink); });
    return SHARE_RESULT_OK;
}

int CSharePointingMouse::RemoveSink(ISharePointingSink* sink) {
    CmTraceDebug("CSharePointingMouse::RemoveSink(", static_cast<const void*>(sink), ")");
    const auto found = std::find(m_listSink.begin(), m_listSink.end(), sink);
    if (found != m_listSink.end())
        m_listSink.erase(found);
    return SHARE_RESULT_OK;
}

int CSharePointingMouse::CleanSink() {
    m_listSink.clear();
    return SHARE_RESULT_OK;
}

int CSharePointingMouse::SetBaseDisplayID(unsigned display) {
    m_nBaseDisplayID = display;
    return SHARE_RESULT_OK;
}

// A copy of the list is walked, in case a sink takes itself off against the rules.

void CSharePointingMouse::_TellPosition(int x, int y) {
    for (ISharePointingSink* const sink : std::list(m_listSink))
        sink->OnPointingPosChanged(x, y);
}

void CSharePointingMouse::_TellImage(ISharePointingImg* image) {
    for (ISharePointingSink* const sink : std::list(m_listSink))
        sink->OnPointingImgChanged(image);
}

CSharePointingMouseDummy::~CSharePointingMouseDummy() {
    if (m_pCursorImg != nullptr)
        m_pCursorImg->Release();
}

int CSharePointingMouseDummy::CapturePoint(SHARE_FRAME_FORMAT format) {
    const bool polled = CmCallGuarded("CSharePointingMouseDummy::CapturePoint() fail ", [&] {
        if (m_pCursorImg == nullptr)
            _MakeCursorImage(format);
        _MovePointer();
    });
    return polled ? SHARE_RESULT_OK : SHARE_RESULT_FAILED;
}

void CSharePointingMouseDummy::_MakeCursorImage(SHARE_FRAME_FORMAT format) {
    m_pCursorImg = new CCursorImage;
    m_pCursorImg->AddRef();
    m_pCursorImg->SetHotPointX(0);
    m_pCursorImg->SetHotPointY(0);
    const CursorBytes bytes = PaintCursor(format);
    IShareFrame* const frame = m_pCursorImg->GetImgData();
    frame->SetFrameDataFormat(format);
    frame->SetFrameSize(CURSOR_EDGE, CURSOR_EDGE);
    frame->WriteFrameData(bytes.data(), std::min(frame->GetFrameDataLen(), static_cast<int>(bytes.size())));
    frame->SetTimestamp(ShareUtil::GetCaptureFrameTimeStamp());
    if (m_listSink.empty())
        CmTraceInfo("CSharePointingMouseDummy::CapturePoint() cursor changed but no sink to notify");
    else
        CmTraceInfo("CSharePointingMouseDummy::CapturePoint() call sink's OnPointingImgChanged()");
    _TellImage(m_pCursorImg);
}

void CSharePointingMouseDummy::_MovePointer() {
    // Begins anew at each call, so that the pointer rests for a second. A generator of our own: the one of
    // the C library belongs to the process that we are a guest in.
    std::mt19937 random(static_cast<std::mt19937::result_type>(CmWallSeconds()));
    AppShareConfig& config = *AppShareConfig::Instance();
    const auto x = static_cast<int>(random() % static_cast<unsigned>(config.GetDummyCaptureWidth()));
    const auto y = static_cast<int>(random() % static_cast<unsigned>(config.GetDummyCaptureHeight()));
    if (static_cast<float>(x) == m_fLastX && static_cast<float>(y) == m_fLastY)
        return;
    m_fLastX = static_cast<float>(x);
    m_fLastY = static_cast<float>(y);
    _TellPosition(x, y);
}
