// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_rows.h"

#include <libyuv.h>

#include <algorithm>
#include <array>
#include <cstring>

namespace platform {

namespace {

using Piece = std::array<std::uint8_t, PIXELS_PER_PIECE * 4>;

/// Where the components of a 4-byte pixel lie.
struct Order {
    std::size_t red, green, blue, alpha;

    bool operator==(const Order&) const = default;
};

constexpr Order RGBA_ORDER{0, 1, 2, 3};

Order OrderOf(CGPixelLayout layout) {
    switch (layout) {
        case CGPixelLayout::ARGB:
            return {1, 2, 3, 0};
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return {2, 1, 0, 3};
        default:
            return RGBA_ORDER;
    }
}

/// The layout with alpha that has the same order.
CGPixelLayout WithAlpha(CGPixelLayout layout) {
    switch (layout) {
        case CGPixelLayout::ARGB:
            return CGPixelLayout::ARGB;
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return CGPixelLayout::BGRA;
        default:
            return CGPixelLayout::RGBA;
    }
}

/// Calls `work(offset, count)` for one piece of a row after the other.
template <class Work>
void ForEachPiece(std::size_t count, Work work) {
    for (std::size_t done = 0; done < count; done += PIXELS_PER_PIECE)
        work(done, std::min(count - done, PIXELS_PER_PIECE));
}

void Reorder(Order from, const std::uint8_t* source, Order to, std::uint8_t* target, std::size_t count) {
    if (from == to) {
        if (source != target)
            std::memcpy(target, source, count * 4);
        return;
    }
    std::array<std::uint8_t, 16> shuffler{};
    for (std::size_t pixel = 0; pixel < shuffler.size(); pixel += 4) {
        shuffler[pixel + to.red] = static_cast<std::uint8_t>(pixel + from.red);
        shuffler[pixel + to.green] = static_cast<std::uint8_t>(pixel + from.green);
        shuffler[pixel + to.blue] = static_cast<std::uint8_t>(pixel + from.blue);
        shuffler[pixel + to.alpha] = static_cast<std::uint8_t>(pixel + from.alpha);
    }
    libyuv::ARGBShuffle(source, 0, target, 0, shuffler.data(), static_cast<int>(count), 1);
}

void MakeOpaque(std::uint8_t* pixels, Order order, std::size_t count) {
    std::uint32_t opaque = 0;
    std::array<std::uint8_t, 4> bytes{};
    bytes[order.alpha] = 255;
    std::memcpy(&opaque, bytes.data(), bytes.size());
    for (std::size_t i = 0; i < count; ++i) {
        std::uint32_t pixel = 0;
        std::memcpy(&pixel, pixels + i * 4, 4);
        pixel |= opaque;
        std::memcpy(pixels + i * 4, &pixel, 4);
    }
}

/// libyuv tells the first component's byte by names of its own: what it calls RGB24 and ARGB share it.
void ExpandTo4Bytes(CGPixelLayout from, const std::uint8_t* source, std::uint8_t* rgba, std::size_t count) {
    if (from == CGPixelLayout::RGB)
        libyuv::RGB24ToARGB(source, 0, rgba, 0, static_cast<int>(count), 1);
    else
        libyuv::AR30ToABGR(source, 0, rgba, 0, static_cast<int>(count), 1);
}

void ContractTo3Bytes(const std::uint8_t* rgba, std::uint8_t* rgb, std::size_t count) {
    libyuv::ARGBToRGB24(rgba, 0, rgb, 0, static_cast<int>(count), 1);
}

bool HasFourComponentBytes(CGPixelLayout layout) {
    return layout != CGPixelLayout::RGB && layout != CGPixelLayout::X2R10G10B10;
}

/// Written so that compilers work on many bytes at once.
void BlendBytes(const std::uint8_t* source, const std::uint8_t* alpha, std::uint8_t* target,
                std::size_t count) {
    for (std::size_t i = 0; i < count; ++i) {
        const auto product = static_cast<std::uint16_t>(target[i] * (255 - alpha[i]) + 128);
        const auto rest = static_cast<std::uint16_t>((product + (product >> 8)) >> 8);
        // A colour above its alpha is nothing that premultiplied pixels may hold, but they come from outside.
        target[i] = static_cast<std::uint8_t>(std::min<std::uint16_t>(source[i] + rest, 255));
    }
}

void Blend4Bytes(const std::uint8_t* source, std::size_t alphaIndex, std::uint8_t* target,
                 std::size_t count) {
    std::array<std::uint8_t, 16> onlyAlpha{};
    for (std::size_t i = 0; i < onlyAlpha.size(); ++i)
        onlyAlpha[i] = static_cast<std::uint8_t>(i - i % 4 + alphaIndex);
    ForEachPiece(count, [&](std::size_t offset, std::size_t pixels) {
        Piece alpha;
        libyuv::ARGBShuffle(source + offset * 4, 0, alpha.data(), 0, onlyAlpha.data(),
                            static_cast<int>(pixels), 1);
        BlendBytes(source + offset * 4, alpha.data(), target + offset * 4, pixels * 4);
    });
}

} // namespace

void ConvertRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
                std::size_t count) noexcept {
    if (from == to && from == CGPixelLayout::RGB) {
        std::memcpy(target, source, count * 3);
    } else if (to == CGPixelLayout::RGB) {
        ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
            Piece rgba;
            ConvertRow(from, source + offset * 4, CGPixelLayout::RGBX, rgba.data(), pixels);
            ContractTo3Bytes(rgba.data(), target + offset * 3, pixels);
        });
    } else {
        const Order order = OrderOf(to);
        if (HasFourComponentBytes(from)) {
            Reorder(OrderOf(from), source, order, target, count);
        } else {
            ExpandTo4Bytes(from, source, target, count);
            Reorder(RGBA_ORDER, target, order, target, count);
        }
        if (!CGHasAlpha(from) || !CGHasAlpha(to))
            MakeOpaque(target, order, count);
    }
}

void BlendRow(const std::uint8_t* source, CGPixelLayout layout, std::uint8_t* target,
              std::size_t count) noexcept {
    const Order order = OrderOf(layout);
    if (layout != CGPixelLayout::RGB) {
        Blend4Bytes(source, order.alpha, target, count);
        if (!CGHasAlpha(layout))
            MakeOpaque(target, order, count);
        return;
    }
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece rgba;
        ExpandTo4Bytes(CGPixelLayout::RGB, target + offset * 3, rgba.data(), pixels);
        Blend4Bytes(source + offset * 4, order.alpha, rgba.data(), pixels);
        ContractTo3Bytes(rgba.data(), target + offset * 3, pixels);
    });
}

void DrawRow(CGPixelLayout from, const std::uint8_t* source, CGPixelLayout to, std::uint8_t* target,
             std::size_t count) noexcept {
    if (!CGHasAlpha(from)) {
        ConvertRow(from, source, to, target, count);
        return;
    }
    const Order sourceOrder = OrderOf(from);
    const Order targetOrder = OrderOf(to);
    if (sourceOrder == targetOrder) {
        BlendRow(source, to, target, count);
        return;
    }
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece reordered;
        Reorder(sourceOrder, source + offset * 4, targetOrder, reordered.data(), pixels);
        BlendRow(reordered.data(), to, target + offset * CGBytesPerPixel(to), pixels);
    });
}

void DrawFadedRow(CGPixelLayout from, const std::uint8_t* source, std::uint8_t alpha, CGPixelLayout to,
                  std::uint8_t* target, std::size_t count) noexcept {
    if (alpha == 255) {
        DrawRow(from, source, to, target, count);
        return;
    }
    const CGPixelLayout between = WithAlpha(to);
    ForEachPiece(count, [=](std::size_t offset, std::size_t pixels) {
        Piece faded;
        ConvertRow(from, source + offset * CGBytesPerPixel(from), between, faded.data(), pixels);
        for (std::size_t i = 0; i < pixels * 4; ++i)
            faded[i] = static_cast<std::uint8_t>((faded[i] * alpha + 127) / 255);
        BlendRow(faded.data(), to, target + offset * CGBytesPerPixel(to), pixels);
    });
}

} // namespace platform
