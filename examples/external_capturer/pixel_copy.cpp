// SPDX-License-Identifier: Apache-2.0
#include "pixel_copy.h"

#include <array>
#include <cstddef>

namespace {

constexpr int pixelBytes = 4;

using Source = PixelView<const std::uint8_t>;
using Target = PixelView<std::uint8_t>;

template <class Byte>
Byte* PixelAt(const PixelView<Byte>& view, int x, int y) {
    return view.pixels + static_cast<std::ptrdiff_t>(y) * view.lineBytes +
           static_cast<std::ptrdiff_t>(x) * pixelBytes;
}

// Where the part of the source that target pixel `index` covers begins. That of the next one is where it
// ends.
int CoverBegin(int index, int sourceLength, int targetLength) {
    return static_cast<int>(static_cast<std::int64_t>(index) * sourceLength / targetLength);
}

void CopyLine(const Source& source, const ColourBytes& order, const Target& target, int y) {
    const std::uint8_t* from = PixelAt(source, 0, y);
    std::uint8_t* to = PixelAt(target, 0, y);
    for (int x = 0; x < target.width; ++x, from += pixelBytes, to += pixelBytes) {
        to[0] = from[order.red];
        to[1] = from[order.green];
        to[2] = from[order.blue];
        to[3] = 255;
    }
}

void ShrinkPixel(const Source& source, const ColourBytes& order, const Target& target, int x, int y) {
    const int left = CoverBegin(x, source.width, target.width);
    const int right = CoverBegin(x + 1, source.width, target.width);
    const int top = CoverBegin(y, source.height, target.height);
    const int bottom = CoverBegin(y + 1, source.height, target.height);

    std::array<std::uint64_t, pixelBytes> sums{};
    for (int row = top; row < bottom; ++row) {
        const std::uint8_t* from = PixelAt(source, left, row);
        for (int column = left; column < right; ++column, from += pixelBytes) {
            for (std::size_t i = 0; i < sums.size(); ++i) {
                sums[i] += from[i];
            }
        }
    }
    const auto count = static_cast<std::uint64_t>(right - left) * static_cast<std::uint64_t>(bottom - top);
    const auto mean = [&](int byte) {
        return static_cast<std::uint8_t>(sums[static_cast<std::size_t>(byte)] / count);
    };
    std::uint8_t* to = PixelAt(target, x, y);
    to[0] = mean(order.red);
    to[1] = mean(order.green);
    to[2] = mean(order.blue);
    to[3] = 255;
}

void ShrinkLine(const Source& source, const ColourBytes& order, const Target& target, int y) {
    for (int x = 0; x < target.width; ++x) {
        ShrinkPixel(source, order, target, x, y);
    }
}

} // namespace

void CopyAsRgba(const Source& source, const ColourBytes& order, const Target& target) {
    const bool sameSize = source.width == target.width && source.height == target.height;
    for (int y = 0; y < target.height; ++y) {
        if (sameSize) {
            CopyLine(source, order, target, y);
        } else {
            ShrinkLine(source, order, target, y);
        }
    }
}
