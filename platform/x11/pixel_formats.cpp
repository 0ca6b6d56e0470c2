// SPDX-License-Identifier: Apache-2.0
#include "platform/x11/pixel_formats.h"

#include "platform/cg_image.h"
#include "platform/pixel_rows.h"

#include <libyuv.h>

#include <array>
#include <cstring>

namespace platform::x11 {

namespace {

using Packing = ServerPixels::Packing;

/// What a visual of a depth is.
struct KnownPixels {
    std::uint8_t depth;
    std::uint8_t bitsPerPixel;
    std::uint32_t red, green, blue;
    ServerPixels pixels;
};

constexpr std::array<KnownPixels, 7> KNOWN{{
    {24, 32, 0xFF0000, 0x00FF00, 0x0000FF, {Packing::Whole, PixelFormat::BGRX}},
    {24, 32, 0x0000FF, 0x00FF00, 0xFF0000, {Packing::Whole, PixelFormat::RGBX}},
    {32, 32, 0xFF0000, 0x00FF00, 0x0000FF, {Packing::Whole, PixelFormat::BGRA}},
    {32, 32, 0x0000FF, 0x00FF00, 0xFF0000, {Packing::Whole, PixelFormat::RGBA}},
    {30, 32, 0x3FF00000, 0x000FFC00, 0x000003FF, {Packing::Whole, PixelFormat::X2R10G10B10}},
    {16, 16, 0xF800, 0x07E0, 0x001F, {Packing::R5G6B5, PixelFormat::BGRX}},
    {15, 16, 0x7C00, 0x03E0, 0x001F, {Packing::X1R5G5B5, PixelFormat::BGRX}},
}};

constexpr std::uint8_t ROW_PAD = 32;

const xcb_format_t* FormatOf(const xcb_setup_t& setup, std::uint8_t depth) {
    xcb_format_iterator_t each = xcb_setup_pixmap_formats_iterator(&setup);
    for (; each.rem != 0; xcb_format_next(&each)) {
        if (each.data->depth == depth)
            return each.data;
    }
    return nullptr;
}

const xcb_visualtype_t* VisualOf(const xcb_screen_t& screen, std::uint8_t depth, xcb_visualid_t visual) {
    xcb_depth_iterator_t each = xcb_screen_allowed_depths_iterator(&screen);
    for (; each.rem != 0; xcb_depth_next(&each)) {
        if (each.data->depth != depth)
            continue;
        xcb_visualtype_iterator_t type = xcb_depth_visuals_iterator(each.data);
        for (; type.rem != 0; xcb_visualtype_next(&type)) {
            const bool isTrueColor = type.data->_class == XCB_VISUAL_CLASS_TRUE_COLOR ||
                                     type.data->_class == XCB_VISUAL_CLASS_DIRECT_COLOR;
            if (type.data->visual_id == visual || (visual == 0 && isTrueColor))
                return type.data;
        }
    }
    return nullptr;
}

bool IsOf(const KnownPixels& known, const xcb_visualtype_t& visual) {
    return visual.red_mask == known.red && visual.green_mask == known.green && visual.blue_mask == known.blue;
}

void DrawRowOf(const ServerPixels& from, const std::uint8_t* source, PixelFormat format, std::uint8_t* target,
               int count) {
    const auto pixels = static_cast<std::size_t>(count);
    switch (from.packing) {
        case Packing::Whole:
            if (from.format == format)
                std::memcpy(target, source, pixels * 4);
            else
                ConvertRow(CGPixelLayoutOf(from.format), source, CGPixelLayoutOf(format), target, pixels);
            return;
        case Packing::R5G6B5:
            libyuv::RGB565ToARGB(source, 0, target, 0, count, 1);
            return;
        case Packing::X1R5G5B5:
            libyuv::ARGB1555ToARGB(source, 0, target, 0, count, 1);
            // The bit above the colours says nothing here.
            ConvertRow(CGPixelLayout::BGRX, target, CGPixelLayout::BGRA, target, pixels);
            return;
    }
}

} // namespace

std::optional<ServerPixels> ServerPixelsOf(const xcb_setup_t& setup, const xcb_screen_t& screen,
                                           std::uint8_t depth, xcb_visualid_t visual) {
    const xcb_format_t* const format = FormatOf(setup, depth);
    const xcb_visualtype_t* const type = VisualOf(screen, depth, visual);
    if (format == nullptr || type == nullptr || format->scanline_pad != ROW_PAD ||
        setup.image_byte_order != XCB_IMAGE_ORDER_LSB_FIRST)
        return std::nullopt;
    for (const KnownPixels& known : KNOWN) {
        // A server of depth 16 may have visuals of 15 bits.
        const bool isDepth = known.depth == depth || (known.depth == 15 && depth == 16);
        if (isDepth && known.bitsPerPixel == format->bits_per_pixel && IsOf(known, *type))
            return known.pixels;
    }
    return std::nullopt;
}

PixelFormat WithAlpha(PixelFormat format) {
    const bool isRedFirst = format == PixelFormat::RGBX || format == PixelFormat::RGBA;
    return isRedFirst ? PixelFormat::RGBA : PixelFormat::BGRA;
}

PixelFormat WithoutAlpha(PixelFormat format) {
    if (format == PixelFormat::BGRA)
        return PixelFormat::BGRX;
    return format == PixelFormat::RGBA ? PixelFormat::RGBX : format;
}

void DrawServerPixels(const ServerPixels& from, const std::uint8_t* source, std::size_t sourceStride,
                      const PixelRegion& part, PixelFormat format, std::uint8_t* target,
                      std::size_t targetStride, const PixelRect& origin) {
    for (const PixelRect& rect : part.Rects()) {
        const auto left = static_cast<std::size_t>(rect.left);
        for (int y = rect.top; y < rect.bottom; ++y) {
            const std::uint8_t* const row = source + static_cast<std::size_t>(y) * sourceStride;
            std::uint8_t* const into = target + static_cast<std::size_t>(y - origin.top) * targetStride;
            DrawRowOf(from, row + left * from.BytesPerPixel(), format,
                      into + static_cast<std::size_t>(rect.left - origin.left) * 4, rect.right - rect.left);
        }
    }
}

} // namespace platform::x11
