// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/simulated_pixels.h"

#include "util/cm_numeric.h"

#include <algorithm>
#include <stdexcept>
#include <utility>

namespace platform {

namespace {

constexpr std::uint32_t Component(std::uint32_t argb, int shift) {
    return argb >> shift & 0xFF;
}

/// `value` * `factor` / 255 to the nearest.
constexpr std::uint32_t Scaled(std::uint32_t value, std::uint32_t factor) {
    return (value * factor + 127) / 255;
}

constexpr std::uint32_t Scaled4(std::uint32_t argb, std::uint32_t factor) {
    return Scaled(Component(argb, 24), factor) << 24 | Scaled(Component(argb, 16), factor) << 16 |
           Scaled(Component(argb, 8), factor) << 8 | Scaled(Component(argb, 0), factor);
}

constexpr std::uint32_t Premultiplied(SimulatedArgb argb) {
    const std::uint32_t alpha = Component(argb, 24);
    return alpha == 255 ? argb : alpha << 24 | (Scaled4(argb, alpha) & 0x00FFFFFF);
}

constexpr std::uint32_t Over(std::uint32_t source, std::uint32_t target) {
    return source + Scaled4(target, 255 - Component(source, 24));
}

/// The word whose little-endian bytes are a pixel of that format.
constexpr std::uint32_t Encoded(std::uint32_t argb, PixelFormat format) {
    const std::uint32_t red = Component(argb, 16);
    const std::uint32_t green = Component(argb, 8);
    const std::uint32_t blue = Component(argb, 0);
    const std::uint32_t alpha = argb & 0xFF000000U;
    const auto ten = [](std::uint32_t eight) { return eight << 2 | eight >> 6; };
    switch (format) {
        case PixelFormat::BGRX:
            return red << 16 | green << 8 | blue;
        case PixelFormat::BGRA:
            return argb;
        case PixelFormat::RGBX:
            return blue << 16 | green << 8 | red;
        case PixelFormat::RGBA:
            return alpha | blue << 16 | green << 8 | red;
        case PixelFormat::X2R10G10B10:
            return ten(red) << 20 | ten(green) << 10 | ten(blue);
    }
    return 0;
}

void PutWord(std::uint32_t word, std::uint8_t* bytes) {
    for (int i = 0; i < 4; ++i)
        bytes[i] = static_cast<std::uint8_t>(Component(word, 8 * i));
}

/// Where each place from `first` to `end` of a stretched row or column comes from.
std::vector<int> SourcePlaces(int sourceSize, int stretchedFirst, int stretchedEnd, int first, int end) {
    const std::int64_t size = std::int64_t{stretchedEnd} - stretchedFirst;
    std::vector<int> places;
    places.reserve(static_cast<std::size_t>(std::max(end - first, 0)));
    for (std::int64_t place = first; place < end; ++place)
        places.push_back(static_cast<int>((place - stretchedFirst) * sourceSize / size));
    return places;
}

/// The columns that differ in the rows from `top` to `bottom`; empty when none does.
PixelRect DifferentBand(const SimulatedPixels& before, const SimulatedPixels& after, int top, int bottom) {
    PixelRect band{after.width, top, 0, bottom};
    for (int y = top; y < bottom; ++y) {
        const std::uint32_t* const one = before.Row(y);
        const std::uint32_t* const other = after.Row(y);
        const auto first = std::mismatch(one, one + after.width, other).first - one;
        if (first == after.width)
            continue;
        int last = after.width - 1;
        while (one[last] == other[last])
            --last;
        band.left = std::min(band.left, static_cast<int>(first));
        band.right = std::max(band.right, last + 1);
    }
    return band;
}

} // namespace

SimulatedPixels NewPixels(int width, int height) {
    constexpr std::size_t MOST_PIXELS = 64'000'000;
    const auto columns = static_cast<std::size_t>(std::max(width, 0));
    const auto rows = static_cast<std::size_t>(std::max(height, 0));
    if (rows != 0 && columns > MOST_PIXELS / rows)
        throw std::length_error("a simulated picture is too large");
    SimulatedPixels pixels;
    pixels.width = static_cast<int>(columns);
    pixels.height = static_cast<int>(rows);
    pixels.argb.resize(columns * rows);
    return pixels;
}

int PixelsAcross(float points, float scale) {
    return std::max(0, CmTruncate(static_cast<double>(points) * static_cast<double>(scale) + 0.5));
}

void PaintContent(const SimulatedContent& content, std::uint64_t frame, const PixelRect& where,
                  SimulatedPixels& target) {
    for (int y = std::max(where.top, 0); y < std::min(where.bottom, target.height); ++y) {
        std::uint32_t* const row = target.Row(y);
        for (int x = std::max(where.left, 0); x < std::min(where.right, target.width); ++x)
            row[x] = Premultiplied(content.At(x - where.left, y - where.top, frame));
    }
}

void LayOver(const SimulatedPixels& source, const PixelRect& where, std::uint32_t alpha,
             SimulatedPixels& target) {
    const int left = std::max(where.left, 0);
    const int right = std::min(where.right, target.width);
    if (left >= right || source.width == 0 || source.height == 0)
        return;
    const std::vector<int> columns = SourcePlaces(source.width, where.left, where.right, left, right);
    const int top = std::max(where.top, 0);
    const int bottom = std::min(where.bottom, target.height);
    const std::vector<int> rows = SourcePlaces(source.height, where.top, where.bottom, top, bottom);
    for (int y = top; y < bottom; ++y) {
        const std::uint32_t* const from = source.Row(rows[static_cast<std::size_t>(y - top)]);
        std::uint32_t* to = target.Row(y) + left;
        for (const int column : columns) {
            const std::uint32_t pixel = alpha == 255 ? from[column] : Scaled4(from[column], alpha);
            *to = Component(pixel, 24) == 255 ? pixel : Over(pixel, *to);
            ++to;
        }
    }
}

std::vector<PixelRect> DifferentRects(const SimulatedPixels& before, const SimulatedPixels& after) {
    constexpr int BAND = 16;
    if (before.width != after.width || before.height != after.height)
        return {{0, 0, after.width, after.height}};
    std::vector<PixelRect> rects;
    for (int top = 0; top < after.height; top += BAND) {
        const PixelRect band = DifferentBand(before, after, top, std::min(top + BAND, after.height));
        if (band.left >= band.right)
            continue;
        PixelRect* const above = rects.empty() ? nullptr : &rects.back();
        if (above != nullptr && above->bottom == top && above->left == band.left &&
            above->right == band.right)
            above->bottom = band.bottom;
        else
            rects.push_back(band);
    }
    return rects;
}

Picture MakePicture(const SimulatedPixels& pixels, const SimulatedPictureShape& shape,
                    std::chrono::nanoseconds time) {
    Picture picture;
    picture.width = pixels.width;
    picture.height = pixels.height;
    picture.stride = static_cast<std::size_t>(pixels.width) * 4 + shape.rowGap;
    picture.format = shape.format;
    picture.rect = shape.rect;
    picture.scale = shape.scale;
    picture.time = time;
    auto bytes =
        std::make_shared<std::vector<std::uint8_t>>(picture.stride * static_cast<std::size_t>(pixels.height));
    for (int y = 0; y < pixels.height; ++y) {
        std::uint8_t* target = bytes->data() + static_cast<std::size_t>(y) * picture.stride;
        const std::uint32_t* const row = pixels.Row(y);
        for (int x = 0; x < pixels.width; ++x, target += 4)
            PutWord(Encoded(row[x], shape.format), target);
    }
    picture.pixels = bytes->data();
    picture.memory = std::move(bytes);
    return picture;
}

} // namespace platform
