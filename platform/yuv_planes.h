// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstddef>
#include <cstdint>

/// Pictures as encoders want them: a plane of luma, and chroma for each block of two by two pixels.
///
/// BT.601, limited range (luma from 16 to 235, chroma from 16 to 240). A block's chroma is the mean of its
/// pixels, so it sits in the block's middle; of an odd width or height the last blocks are cut, and there are
/// half as many of them as pixels, rounded up. Alpha is dropped: premultiplied pixels come out as on black.
/// Threads: any. Errors: none; the caller answers for sizes and memory. Planes and picture have no byte in
/// common.
namespace platform {

/// Bytes of a pixel in memory order.
enum class YuvPixelOrder {
    RGBA,
    ARGB,
    RGB,
    BGRA,
    ABGR,
    BGR
};

struct YuvPicture {
    const std::uint8_t* pixels = nullptr; ///< The top row.
    int stride = 0;                       ///< Bytes from one row to the next.
    YuvPixelOrder order = YuvPixelOrder::RGBA;
    int width = 0; ///< At least 1.
    int height = 0;
};

struct YuvPlane {
    std::uint8_t* samples = nullptr;
    int stride = 0;
};

void ConvertToI420(const YuvPicture& picture, const YuvPlane& y, const YuvPlane& u,
                   const YuvPlane& v) noexcept;

/// `uv` takes u and v in turns. The samples are those of ConvertToI420.
void ConvertToNv12(const YuvPicture& picture, const YuvPlane& y, const YuvPlane& uv) noexcept;

} // namespace platform
