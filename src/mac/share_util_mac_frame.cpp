// SPDX-License-Identifier: Apache-2.0
#include "platform/app_kit.h"
#include "platform/image_codec.h"
#include "src/mac/share_util_mac.h"
#include "src/share_frame.h"
#include "src/share_region.h"
#include "src/share_util.h"
#include "util/cm_trace.h"

#include <screenshare/share_frame.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <optional>
#include <string>

/// The side of ShareUtilMac that works on pixels.

namespace {

/// Rectangles of a frame, in the space of a context over it, which counts from the bottom. What lies outside
/// the frame is left off while the numbers are still whole.
std::vector<platform::CGRect> FlippedRects(const std::vector<TVLRect>& rects, TVLSize frame) {
    const TVLRect whole{0, 0, frame.cx, frame.cy};
    std::vector<platform::CGRect> flipped;
    flipped.reserve(rects.size());
    for (const TVLRect& rect : rects) {
        const TVLRect inside = ShareUtil::Intersect(rect, whole);
        flipped.push_back(ShareUtilMac::TVLRectToCGRect(
            {inside.left, frame.cy - inside.bottom, inside.right, frame.cy - inside.top}));
    }
    return flipped;
}

platform::CGContextRef ContextOver(IShareFrame& frame, TVLSize size) {
    const int length = CShareFrame::BackedDataLen(frame);
    // The frame formats with alpha bear the numbers of the bitmap infos with the same order.
    return platform::CGBitmapContextCreate(frame.GetFrameData(), static_cast<std::size_t>(length), size.cx,
                                           size.cy, 8, frame.GetFrameLineBytes(),
                                           static_cast<unsigned>(frame.GetFrameDataFormat()));
}

/// A cursor's picture for a context of some scale.
struct CursorPicture {
    platform::CGImageRef image;
    platform::CGSize size;
    float drawScale;
};

/// The representation whose pixels per point come nearest to the scale, the first of equal ones; the image
/// itself when none is anywhere near.
CursorPicture ChooseRepresentation(const platform::NSImage& image, float scale) {
    const platform::NSImageRep* best = nullptr;
    float bestDifference = 100.0F;
    float bestRatio = 1.0F;
    for (const platform::NSImageRep& representation : image.representations()) {
        const float ratio = representation.size().width / image.size().width;
        const float difference = std::fabs(ratio - scale);
        if (!(difference < bestDifference))
            continue;
        best = &representation;
        bestDifference = difference;
        bestRatio = ratio;
    }
    if (best == nullptr)
        return {image.CGImageForProposedRect(), image.size(), scale};
    return {best->CGImageForProposedRect(), best->size(), scale / bestRatio};
}

constexpr unsigned CURSOR_TRACE_PERIOD = 200;

} // namespace

int ShareUtilMac::FillFrame(IShareFrame* frame, int colour, const TVLRegion* region) {
    if (frame == nullptr)
        return SHARE_RESULT_INVALID_PARAM;
    TVLSize size{};
    frame->GetFrameSize(size);
    if (size.cx < 1 || size.cy < 1)
        return SHARE_RESULT_INVALID_PARAM;
    const SHARE_FRAME_FORMAT format = frame->GetFrameDataFormat();
    if (format != SHARE_FRAME_FORMAT_RGBA && format != SHARE_FRAME_FORMAT_ARGB)
        return SHARE_RESULT_INVALID_PARAM;

    std::vector<TVLRect> rects;
    if (region != nullptr)
        region->GetRects(rects);
    else
        rects.push_back({0, 0, size.cx, size.cy});
    if (rects.empty())
        return SHARE_RESULT_FAILED;

    CShareFrame::DropNoteOf(*frame);
    const platform::CGContextRef context = ContextOver(*frame, size);
    if (context == nullptr)
        return SHARE_RESULT_FAILED;
    float red = 0;
    float green = 0;
    float blue = 0;
    GetRGBfromInt(colour, red, green, blue);
    platform::CGContextSetRGBFillColor(context.get(), red, green, blue, 1.0F);
    const std::vector<platform::CGRect> flipped = FlippedRects(rects, size);
    platform::CGContextFillRects(context.get(), flipped.data(), flipped.size());
    return SHARE_RESULT_OK;
}

std::optional<ShareCursorDrawing> ShareUtilMac::FindCursor(const platform::CGContext* context,
                                                           platform::CGPoint position, float scale) {
    if (context == nullptr) {
        static CCmRepeatedTraceSite site(CURSOR_TRACE_PERIOD);
        if (site.Due())
            CmTraceError("CaptureCursorToCGContext cgContextRef is nil");
        return std::nullopt;
    }
    const std::optional<platform::NSCursor> cursor = platform::NSCursor::currentSystemCursor();
    if (!cursor) {
        static CCmRepeatedTraceSite site(CURSOR_TRACE_PERIOD);
        if (site.Due())
            CmTraceError("CaptureCursorToCGContext sysCursor is nil");
        return std::nullopt;
    }
    const CursorPicture picture = ChooseRepresentation(*cursor->image(), scale);
    const auto height = static_cast<float>(platform::CGBitmapContextGetHeight(context));
    // The hot spot is in points, so the scale of the context holds for it, whichever picture was chosen.
    const float x = position.x - cursor->hotSpot().x * scale;
    const float top = height - (position.y - cursor->hotSpot().y * scale);
    const platform::CGSize drawn{picture.size.width * picture.drawScale,
                                 picture.size.height * picture.drawScale};
    return ShareCursorDrawing{picture.image, {{x, top - drawn.height}, drawn}};
}

bool ShareUtilMac::CaptureCursorToCGContext(platform::CGContext* context, platform::CGPoint position,
                                            float scale) {
    const std::optional<ShareCursorDrawing> cursor = FindCursor(context, position, scale);
    if (cursor)
        platform::CGContextDrawImage(context, cursor->rect, cursor->image.get());
    return cursor.has_value();
}

bool ShareUtilMac::CGImageWriteToFile(const platform::CGImageRef& image, const char* path) {
    if (image == nullptr || path == nullptr)
        return false;
    const platform::CGImageDestinationRef destination =
        platform::CGImageDestinationCreateWithURL(path, platform::kUTTypePNG, 1);
    if (destination == nullptr) {
        CmTraceError("CGImageWriteToFile fail to create destination, path=", path);
        return false;
    }
    platform::CGImageDestinationAddImage(destination.get(), image);
    if (!platform::CGImageDestinationFinalize(destination.get())) {
        CmTraceError("CGImageWriteToFile fail to write, path=", path);
        return false;
    }
    return true;
}

std::string ShareUtilMac::CGImageToString(const platform::CGImageRef& image) {
    if (image == nullptr)
        return "null";
    return "{w=" + std::to_string(platform::CGImageGetWidth(image.get())) +
           " h=" + std::to_string(platform::CGImageGetHeight(image.get())) + "}";
}
