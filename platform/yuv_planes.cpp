// SPDX-License-Identifier: Apache-2.0
#include "platform/yuv_planes.h"

#include <libyuv.h>

#include <algorithm>
#include <array>

namespace platform {

namespace {

/// An even number: no block of chroma is cut between two pieces.
constexpr int COLUMNS_PER_PIECE = 1024;

using ToI420 = int (*)(const std::uint8_t*, int, std::uint8_t*, int, std::uint8_t*, int, std::uint8_t*, int,
                       int, int);

/// libyuv names the components of a 4-byte pixel from the highest byte of a little-endian word down, and
/// calls R, G, B in memory RAW.
ToI420 ConversionOf(YuvPixelOrder order) {
    switch (order) {
        case YuvPixelOrder::RGBA:
            return libyuv::ABGRToI420;
        case YuvPixelOrder::ARGB:
            return libyuv::BGRAToI420;
        case YuvPixelOrder::RGB:
            return libyuv::RAWToI420;
        case YuvPixelOrder::BGRA:
            return libyuv::ARGBToI420;
        case YuvPixelOrder::ABGR:
            return libyuv::RGBAToI420;
        case YuvPixelOrder::BGR:
            break;
    }
    return libyuv::RGB24ToI420;
}

int BytesPerPixel(YuvPixelOrder order) {
    return order == YuvPixelOrder::RGB || order == YuvPixelOrder::BGR ? 3 : 4;
}

std::uint8_t* RowOf(const YuvPlane& plane, int row) {
    return plane.samples + std::ptrdiff_t{row} * plane.stride;
}

} // namespace

void ConvertToI420(const YuvPicture& picture, const YuvPlane& y, const YuvPlane& u,
                   const YuvPlane& v) noexcept {
    ConversionOf(picture.order)(picture.pixels, picture.stride, y.samples, y.stride, u.samples, u.stride,
                                v.samples, v.stride, picture.width, picture.height);
}

// libyuv knows the way to NV12 from two orders only; piece by piece it is the same for all six.
void ConvertToNv12(const YuvPicture& picture, const YuvPlane& y, const YuvPlane& uv) noexcept {
    const ToI420 convert = ConversionOf(picture.order);
    std::array<std::uint8_t, COLUMNS_PER_PIECE / 2> u;
    std::array<std::uint8_t, COLUMNS_PER_PIECE / 2> v;
    for (int row = 0; row < picture.height; row += 2) {
        const int rows = std::min(picture.height - row, 2);
        const std::uint8_t* const pixels = picture.pixels + std::ptrdiff_t{row} * picture.stride;
        for (int x = 0; x < picture.width; x += COLUMNS_PER_PIECE) {
            const int count = std::min(picture.width - x, COLUMNS_PER_PIECE);
            convert(pixels + std::ptrdiff_t{x} * BytesPerPixel(picture.order), picture.stride,
                    RowOf(y, row) + x, y.stride, u.data(), 0, v.data(), 0, count, rows);
            libyuv::MergeUVPlane(u.data(), 0, v.data(), 0, RowOf(uv, row / 2) + x, 0, (count + 1) / 2, 1);
        }
    }
}

} // namespace platform
