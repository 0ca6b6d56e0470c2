// SPDX-License-Identifier: Apache-2.0
#include "platform/core_graphics.h"
#include "src/app_share_config.h"
#include "src/mac/monitor_enum_mac.h"
#include "src/mac/share_capturer_context_mac.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_graphic_util.h>

#include <cstddef>
#include <utility>

/// The tables of the shared displays.

namespace {

struct CaptureSize {
    TVLSize size;
    /// The width that tells the scale, which a fixed size may not have.
    int width;
};

/// A size that the debug file has fixed, with the ratio of the display.
CaptureSize FitFixedSize(double wide, double high) {
    const AppShareConfig& config = *AppShareConfig::Instance();
    const int w = config.GetResampleScreenCaptureWidth();
    const int h = config.GetResampleScreenCaptureHeight();
    if (static_cast<float>(wide) / static_cast<float>(w) > static_cast<float>(high) / static_cast<float>(h))
        return {{w, CmTruncate(high * w / wide)}, w};
    return {{CmTruncate(h * wide / high), h}, w};
}

CaptureSize SizeFor(unsigned display, double wide, double high, TVLSize maxSize) {
    const AppShareConfig& config = *AppShareConfig::Instance();
    const float scale = CMonitorEnumMac::screenScaleFactorForDisplayID(display);
    const TVLSize pixels{CmTruncate(scale * static_cast<float>(wide)),
                         CmTruncate(scale * static_cast<float>(high))};
    if (!config.m_bCaptureResampleEnable)
        return {pixels, pixels.cx};
    if (config.m_bCaptureResampleFixSizeEnable)
        return FitFixedSize(wide, high);
    const TVLSize limited = TvlGraphicUtil::TvlGetMaxCapSize(pixels, maxSize);
    return {limited, limited.cx};
}

/// Unlike elsewhere the size is added to the origin before it is cut.
TVLRect WholeRect(const platform::CGRect& bounds) {
    return {CmTruncate(bounds.origin.x), CmTruncate(bounds.origin.y),
            CmTruncate(bounds.origin.x + bounds.size.width),
            CmTruncate(bounds.origin.y + bounds.size.height)};
}

} // namespace

int ShareCapturerContextMac::InitDisplays() {
    // Held throughout: of two that make the tables, the one that saw the newer list must be the last.
    const std::lock_guard<std::recursive_mutex> lock(m_displayLock);
    std::map<unsigned, TVLSize> sizes;
    std::map<unsigned, TVLRect> rects;
    TVLRegion region;
    for (const unsigned display : m_vSharedDisplays) {
        const auto wide = static_cast<double>(platform::CGDisplayPixelsWide(display));
        const auto high = static_cast<double>(platform::CGDisplayPixelsHigh(display));
        const CaptureSize capture = SizeFor(display, wide, high, m_sizeCaptureMax);
        sizes[display] = capture.size;
        // A display that is gone has no points, and no scale either.
        if (wide > 0)
            AppShareConfig::Instance()->SetCurrentScale(static_cast<float>(capture.width / wide));
        const TVLRect rect = WholeRect(platform::CGDisplayBounds(display));
        rects[display] = rect;
        region.AddRect(rect);
        if (CmTraceOn(CM_TRACE_DETAIL))
            CmTraceDetail("ShareCapturerContextMac::InitDisplays,m_rgnDisplay=", region.ToString());
    }
    m_mapDisplaySizes.swap(sizes);
    m_mapDisplayRects.swap(rects);
    m_rgnDisplay = std::move(region);
    _NoteChange();
    return SHARE_RESULT_OK;
}

std::shared_ptr<ShareCapturerContext> MakeShareCapturerContext() {
    return std::make_shared<ShareCapturerContextMac>();
}
