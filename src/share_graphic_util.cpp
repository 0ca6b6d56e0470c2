// SPDX-License-Identifier: Apache-2.0
#include "platform/bitmap_context.h"
#include "src/safe_memcpy.h"
#include "src/share_frame.h"
#include "src/share_util.h"
#include "util/cm_numeric.h"
#include "util/cm_trace.h"

#include <screenshare/share_graphic_util.h>

#include <algorithm>
#include <cmath>
#include <cstddef>

namespace {

// ---- The raw form

int WidthOf(const TVLRect& rect) {
    return ShareUtil::Extent(rect.left, rect.right);
}

int HeightOf(const TVLRect& rect) {
    return ShareUtil::Extent(rect.top, rect.bottom);
}

/// Both rectangles, of one size and inside their buffers. False when nothing is left of them.
bool ClipToBuffers(TVLRect& dst, TVLSize dstSize, TVLRect& src, TVLSize srcSize) {
    const TVLRect inDst = ShareUtil::Intersect(dst, {0, 0, dstSize.cx, dstSize.cy});
    if (inDst != dst) {
        dst = inDst;
        src.right = ShareUtil::Sum(src.left, WidthOf(dst));
        src.top = ShareUtil::Extent(HeightOf(dst), src.bottom);
    }
    const TVLRect inSrc = ShareUtil::Intersect(src, {0, 0, srcSize.cx, srcSize.cy});
    if (inSrc != src) {
        src = inSrc;
        dst.right = dst.left + WidthOf(src);
        dst.bottom = dst.top + HeightOf(src);
    }
    // Intersect has made all zeros of what had no area.
    return src.left < src.right && dst.left < dst.right;
}

/// What a blend does with each pixel.
struct PixelBlend {
    unsigned dstBpp;
    bool isDstPremultiplied;
    bool isSrcPremultiplied;
    int alphaIdx;
    int firstIdx; ///< The end of the pixel that alpha isn't at.
};

constexpr unsigned SRC_BPP = 4;

float Premultiplied(unsigned char colour, bool isPremultiplied, int alpha) {
    return static_cast<float>(isPremultiplied ? colour : colour * alpha / 255.0);
}

/// `srcAlpha` is neither 0 nor 255.
void MixPixel(const PixelBlend& blend, unsigned char* d, const unsigned char* s, int srcAlpha) {
    const int dstAlpha = d[blend.alphaIdx];
    const int rest = 255 - srcAlpha;
    const auto outAlpha = static_cast<unsigned char>(dstAlpha * rest / 255 + srcAlpha);
    for (const int colour : {blend.firstIdx, 1, 2}) {
        const double below = Premultiplied(d[colour], blend.isDstPremultiplied, dstAlpha);
        const double above = Premultiplied(s[colour], blend.isSrcPremultiplied, srcAlpha);
        // By way of int: the value may be above 255, and only its low byte is kept.
        const auto mixed = static_cast<int>((above + below * rest / 255.0) * 255.0 / outAlpha);
        const auto stored = static_cast<unsigned char>(mixed);
        d[colour] = blend.isDstPremultiplied ? static_cast<unsigned char>(stored * outAlpha) : stored;
    }
    d[blend.alphaIdx] = outAlpha;
}

void BlendLine(const PixelBlend& blend, unsigned char* d, const unsigned char* s, int count) {
    const auto copied = static_cast<int>(std::min(SRC_BPP, blend.dstBpp));
    for (int i = 0; i < count; ++i, d += blend.dstBpp, s += SRC_BPP) {
        const int alpha = s[blend.alphaIdx];
        if (alpha == 255)
            omnal_memcpy_s(d, copied, s, copied);
        else if (alpha != 0)
            MixPixel(blend, d, s, alpha);
    }
}

std::size_t Offset(int line, unsigned lineBytes, int column, unsigned bpp) {
    return static_cast<std::size_t>(line) * lineBytes + static_cast<std::size_t>(column) * bpp;
}

// ---- The frame form

bool IsInside(int value, int lowest, int highest) {
    return value >= lowest && value <= highest;
}

/// Whether `src` at (x, y) has pixels in common with `dst`.
bool Touches(TVLSize dst, long long x, long long y, TVLSize src) {
    const long long top = dst.cy - y;
    const long long bottom = top - src.cy;
    return std::max(x, 0LL) < std::min<long long>(x + src.cx, dst.cx) &&
           std::max(bottom, 0LL) < std::min<long long>(top, dst.cy);
}

/// Null when the frame has less memory than pixels of 4 bytes need.
platform::CGContextRef ContextOver(IShareFrame& frame, TVLSize size) {
    const int length = CShareFrame::BackedDataLen(frame);
    // Wrapped, the length of a line is too short for its pixels, and there is no context either.
    const auto lineBytes = static_cast<int>(static_cast<unsigned>(size.cx) * 4);
    return platform::CGBitmapContextCreate(frame.GetFrameData(), static_cast<std::size_t>(length), size.cx,
                                           size.cy, 8, lineBytes, platform::kCGImageAlphaPremultipliedLast);
}

// ---- Sizes

int Scaled(int side, int numerator, int denominator) {
    return CmTruncate(static_cast<double>(side) * numerator / denominator);
}

float Ratio(TVLSize size) {
    return static_cast<float>(static_cast<double>(size.cx) / size.cy);
}

} // namespace

bool TvlGraphicUtil::TvlAlphaBlend(unsigned char* dst, TVLSize dstSize, TVLRect dstRect,
                                   unsigned int dstLineBytes, bool bDstPremultiplied, bool,
                                   unsigned char* src, TVLSize srcSize, TVLRect srcRect,
                                   unsigned int srcLineBytes, bool bSrcPremultiplied, bool bAlphaLast) {
    if (dst == nullptr || src == nullptr)
        return false;
    if (WidthOf(dstRect) != WidthOf(srcRect) || HeightOf(dstRect) != HeightOf(srcRect))
        return false;
    if (!ClipToBuffers(dstRect, dstSize, srcRect, srcSize))
        return false;
    CmTraceDetail("TvlAlphaBlend params=", " src.x=", srcRect.left, " src.y=", srcRect.top,
                  " src.w=", WidthOf(srcRect), " src.h=", HeightOf(srcRect), " src.data.x=", srcSize.cx,
                  " src.data.y=", srcSize.cy, " dest.x=", dstRect.left, " dest.y=", dstRect.top,
                  " dest.w=", WidthOf(dstRect), " dest.h=", HeightOf(dstRect), " dest.data.x=", dstSize.cx,
                  " dest.data.y=", dstSize.cy);
    const unsigned srcBpp = srcLineBytes / static_cast<unsigned>(srcSize.cx);
    const unsigned dstBpp = dstLineBytes / static_cast<unsigned>(dstSize.cx);
    if (srcBpp != SRC_BPP || (dstBpp != 3 && dstBpp != 4))
        return false;
    const PixelBlend blend{dstBpp, bDstPremultiplied, bSrcPremultiplied, bAlphaLast ? 3 : 0,
                           bAlphaLast ? 0 : 3};
    for (int line = 0; line < HeightOf(srcRect); ++line) {
        BlendLine(blend, dst + Offset(dstRect.top + line, dstLineBytes, dstRect.left, dstBpp),
                  src + Offset(srcRect.top + line, srcLineBytes, srcRect.left, srcBpp), WidthOf(srcRect));
    }
    return true;
}

bool TvlGraphicUtil::TvlAlphaBlend(IShareFrame* dst, int x, int y, IShareFrame* src) {
    if (dst == nullptr || src == nullptr)
        return false;
    TVLSize dstSize{};
    TVLSize srcSize{};
    dst->GetFrameSize(dstSize);
    src->GetFrameSize(srcSize);
    if (srcSize.cx > dstSize.cx || srcSize.cy > dstSize.cy)
        return false;
    CmTraceDetail("TvlAlphaBlend params=", " x=", x, " y=", y, " src.w=", srcSize.cx, " src.h=", srcSize.cy,
                  " dest.w=", dstSize.cx, " dest.h=", dstSize.cy);
    const SHARE_FRAME_FORMAT format = src->GetFrameDataFormat();
    if (!IsInside(dst->GetFrameDataFormat(), SHARE_FRAME_FORMAT_RGBA, SHARE_FRAME_FORMAT_BGR) ||
        (format != SHARE_FRAME_FORMAT_RGBA && format != SHARE_FRAME_FORMAT_ARGB &&
         format != SHARE_FRAME_FORMAT_BGRA))
        return false;
    if (!Touches(dstSize, x, y, srcSize))
        return false;

    CShareFrame::DropNoteOf(*dst);
    const platform::CGContextRef dstContext = ContextOver(*dst, dstSize);
    const platform::CGContextRef srcContext = ContextOver(*src, srcSize);
    const platform::CGImageRef picture = platform::CGBitmapContextCreateImage(srcContext.get());
    const int bottom = dstSize.cy - y - srcSize.cy;
    CmTraceDetail("TvlAlphaBlend draw rect=", " x=", x, " y=", bottom, " w=", srcSize.cx, " h=", srcSize.cy);
    platform::CGContextDrawImage(dstContext.get(),
                                 {{static_cast<float>(x), static_cast<float>(bottom)},
                                  {static_cast<float>(srcSize.cx), static_cast<float>(srcSize.cy)}},
                                 picture.get());
    return true;
}

TVLSize TvlGraphicUtil::TvlGetMaxCapSize(TVLSize size, TVLSize maxSize) {
    const bool isTooWide = maxSize.cx > 0 && size.cx > maxSize.cx;
    const bool isTooHigh = maxSize.cy > 0 && size.cy > maxSize.cy;
    if (!isTooWide && !isTooHigh)
        return size;
    // Ratios that close count as the same: the picture may be distorted by that little.
    constexpr double SAME_RATIO = 0.01;
    const float ratio = Ratio(size);
    const float maxRatio = Ratio(maxSize);
    if (std::fabs(ratio - maxRatio) <= SAME_RATIO)
        return maxSize;
    if (ratio > maxRatio)
        return {maxSize.cx, Scaled(maxSize.cx, size.cy, size.cx)};
    return {Scaled(maxSize.cy, size.cx, size.cy), maxSize.cy};
}
