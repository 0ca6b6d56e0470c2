// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <screenshare/share_frame.h>
#include <screenshare/share_types.h>

/// Puts small pictures onto larger ones, and fits sizes.
///
/// Threads: any; nothing is kept. The caller keeps pictures alive and to itself for the length of a call.
/// Units:   pixels for sizes, positions and rectangles, bytes for line lengths.
/// Errors:  false, and no pixel was touched.
class TvlGraphicUtil {
public:
    /// Lays the part `srcRect` of one buffer over the part `dstRect` of another, of the same size. The sizes
    /// are those of the buffers.
    ///
    /// Bytes per pixel are line length divided by width: 4 in the source, 3 or 4 in the target. Alpha is the
    /// last byte of a pixel in both buffers, or the first in both. Alpha 0 leaves a pixel alone and 255
    /// replaces it.
    ///
    /// A target rectangle that sticks out of its buffer is clipped, and the source rectangle then keeps its
    /// left and its bottom, wherever the target was cut: cut off at the left or at the bottom, the picture is
    /// shifted. In a premultiplied target the colours of a blended pixel are multiplied by its alpha without
    /// being divided by 255 again, so they wrap. Clients rely on both.
    ///
    /// A target of 3 bytes a pixel has no alpha of its own: the byte in that place, which belongs to the next
    /// pixel, is read and written. It must not be the one behind the end of the buffer.
    ///
    /// `bDstReserved` has no effect. True also when no pixel had to be touched.
    SCREENSHARE_API static bool TvlAlphaBlend(unsigned char* dst, TVLSize dstSize, TVLRect dstRect,
                                              unsigned int dstLineBytes, bool bDstPremultiplied,
                                              bool bDstReserved, unsigned char* src, TVLSize srcSize,
                                              TVLRect srcRect, unsigned int srcLineBytes,
                                              bool bSrcPremultiplied, bool bAlphaLast);

    /// Lays a picture over a frame that is at least as large, with its left top corner at (x, y), which may
    /// lie outside. `dst` has a format, `src` is RGBA, ARGB or BGRA.
    ///
    /// Both are taken as 4 bytes a pixel, alpha last and premultiplied, in lines without gaps, whatever their
    /// format and line length say. Where a frame has less memory than that, nothing is painted; the result is
    /// true all the same.
    SCREENSHARE_API static bool TvlAlphaBlend(IShareFrame* dst, int x, int y, IShareFrame* src);

    /// `size` made to fit into `maxSize`, cut to whole pixels. The ratio of its sides is kept unless it is
    /// within 0.01 of that of `maxSize`, which is then the result. A side of `maxSize` below 1 is no limit,
    /// but once the other side is exceeded it brings the result down to nothing.
    SCREENSHARE_API static TVLSize TvlGetMaxCapSize(TVLSize size, TVLSize maxSize);
};
