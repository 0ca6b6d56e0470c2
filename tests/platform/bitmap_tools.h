// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <memory>
#include <ostream>
#include <utility>
#include <vector>

/// What tests of pixels share: colours, canvases, images, memory with nothing around it.

using Bytes = std::vector<std::uint8_t>;
using platform::CGPixelLayout;

/// Components as they lie in memory, by their meaning; premultiplied where there is alpha.
struct Colour {
    int red = 0;
    int green = 0;
    int blue = 0;
    int alpha = 255;

    bool operator==(const Colour&) const = default;
};

inline std::ostream& operator<<(std::ostream& out, const Colour& colour) {
    return out << "(" << colour.red << "," << colour.green << "," << colour.blue << "," << colour.alpha
               << ")";
}

/// Reads a pixel the plain way. The byte that carries nothing is given as alpha.
inline Colour ReadPixel(CGPixelLayout layout, const std::uint8_t* at) {
    switch (layout) {
        case CGPixelLayout::RGB:
            return {at[0], at[1], at[2], 255};
        case CGPixelLayout::RGBX:
        case CGPixelLayout::RGBA:
            return {at[0], at[1], at[2], at[3]};
        case CGPixelLayout::ARGB:
            return {at[1], at[2], at[3], at[0]};
        case CGPixelLayout::BGRX:
        case CGPixelLayout::BGRA:
            return {at[2], at[1], at[0], at[3]};
        case CGPixelLayout::X2R10G10B10: {
            const unsigned word = at[0] | at[1] << 8 | at[2] << 16 | static_cast<unsigned>(at[3]) << 24;
            const auto eight = [word](int shift) { return static_cast<int>((word >> shift & 0x3FF) >> 2); };
            return {eight(20), eight(10), eight(0), 255};
        }
    }
    return {};
}

inline void WritePixel(CGPixelLayout layout, std::uint8_t* at, const Colour& colour) {
    const auto red = static_cast<std::uint8_t>(colour.red);
    const auto green = static_cast<std::uint8_t>(colour.green);
    const auto blue = static_cast<std::uint8_t>(colour.blue);
    const auto alpha = static_cast<std::uint8_t>(colour.alpha);
    std::array<std::uint8_t, 4> bytes{red, green, blue, alpha};
    if (layout == CGPixelLayout::ARGB)
        bytes = {alpha, red, green, blue};
    if (layout == CGPixelLayout::BGRX || layout == CGPixelLayout::BGRA)
        bytes = {blue, green, red, alpha};
    if (layout == CGPixelLayout::X2R10G10B10) {
        const unsigned word = static_cast<unsigned>(red) << 22 | static_cast<unsigned>(green) << 12 |
                              static_cast<unsigned>(blue) << 2 | 3u << 30;
        for (std::size_t i = 0; i < bytes.size(); ++i)
            bytes[i] = static_cast<std::uint8_t>(word >> (8 * i));
    }
    std::memcpy(at, bytes.data(), platform::CGBytesPerPixel(layout));
}

/// Memory of which any byte before or behind it ends the process when it is touched.
class LonelyMemory {
public:
    enum class At {
        Start,
        End
    };

    /// Only one side can be exact to the byte.
    LonelyMemory(std::size_t size, At exactSide) {
        const auto page = static_cast<std::size_t>(sysconf(_SC_PAGESIZE));
        const std::size_t room = (size + page - 1) / page * page;
        m_size = room + 2 * page;
        m_block =
            static_cast<std::uint8_t*>(mmap(nullptr, m_size, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0));
        mprotect(m_block + page, room, PROT_READ | PROT_WRITE);
        m_data = exactSide == At::Start ? m_block + page : m_block + page + room - size;
    }
    ~LonelyMemory() { munmap(m_block, m_size); }
    LonelyMemory(const LonelyMemory&) = delete;
    LonelyMemory& operator=(const LonelyMemory&) = delete;

    std::uint8_t* Data() const { return m_data; }

private:
    std::uint8_t* m_block = nullptr;
    std::size_t m_size = 0;
    std::uint8_t* m_data = nullptr;
};

inline CGPixelLayout LayoutOfInfo(unsigned bitmapInfo) {
    switch (bitmapInfo) {
        case platform::kCGImageAlphaNone:
            return CGPixelLayout::RGB;
        case platform::kCGImageAlphaPremultipliedFirst:
            return CGPixelLayout::ARGB;
        case platform::kCGImageAlphaNoneSkipLast:
            return CGPixelLayout::RGBX;
        default:
            return CGPixelLayout::RGBA;
    }
}

/// A context on memory of its own, seen from the top left.
struct Canvas {
    Canvas(int widthWanted, int heightWanted, unsigned bitmapInfo, int spareBytes = 0)
        : width(widthWanted),
          height(heightWanted),
          layout(LayoutOfInfo(bitmapInfo)),
          rowBytes(width * static_cast<int>(platform::CGBytesPerPixel(layout)) + spareBytes),
          memory(static_cast<std::size_t>(rowBytes) * static_cast<std::size_t>(height)),
          context(platform::CGBitmapContextCreate(memory.data(), memory.size(), width, height, 8, rowBytes,
                                                  bitmapInfo)) {}

    platform::CGContext* Get() const { return context.get(); }
    std::size_t Place(int x, int y) const {
        return static_cast<std::size_t>(y * rowBytes) +
               static_cast<std::size_t>(x) * platform::CGBytesPerPixel(layout);
    }
    Colour At(int x, int y) const { return ReadPixel(layout, memory.data() + Place(x, y)); }

    int width;
    int height;
    CGPixelLayout layout;
    int rowBytes;
    Bytes memory;
    platform::CGContextRef context;
};

/// An image of colours, top row first; `colourAt(x, y)` tells them.
template <class ColourAt>
platform::CGImageRef MakeImage(int width, int height, CGPixelLayout layout, ColourAt colourAt,
                               std::size_t spareBytes = 0) {
    const std::size_t pixelBytes = platform::CGBytesPerPixel(layout);
    const std::size_t rowBytes = static_cast<std::size_t>(width) * pixelBytes + spareBytes;
    const auto bytes =
        std::make_shared<Bytes>(rowBytes * static_cast<std::size_t>(height), std::uint8_t{0xEE});
    for (int y = 0; y < height; ++y) {
        for (int x = 0; x < width; ++x)
            WritePixel(layout,
                       bytes->data() + static_cast<std::size_t>(y) * rowBytes +
                           static_cast<std::size_t>(x) * pixelBytes,
                       colourAt(x, y));
    }
    return platform::CGImageCreate(width, height, rowBytes, layout, bytes->data(), bytes);
}

inline Colour PixelOf(const platform::CGImage& image, int x, int y) {
    return ReadPixel(image.layout, image.pixels + static_cast<std::size_t>(y) * image.bytesPerRow +
                                       static_cast<std::size_t>(x) * platform::CGBytesPerPixel(image.layout));
}

constexpr std::array<unsigned, 4> ALL_INFOS{
    platform::kCGImageAlphaNone, platform::kCGImageAlphaPremultipliedLast,
    platform::kCGImageAlphaPremultipliedFirst, platform::kCGImageAlphaNoneSkipLast};

constexpr std::array<CGPixelLayout, 7> ALL_LAYOUTS{
    CGPixelLayout::RGB,  CGPixelLayout::RGBX, CGPixelLayout::RGBA,       CGPixelLayout::ARGB,
    CGPixelLayout::BGRX, CGPixelLayout::BGRA, CGPixelLayout::X2R10G10B10};
