// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

/// A picture with four bytes a pixel in somebody else's memory.
template <class Byte>
struct PixelView {
    Byte* pixels;
    int lineBytes;
    int width;
    int height;
};

/// Which byte of a source pixel holds which colour.
struct ColourBytes {
    int red;
    int green;
    int blue;
};

/// Copies a picture as red, green, blue and an alpha of 255. A smaller target gets the picture shrunk, each
/// of its pixels the mean of those it covers. The target is at most as large as the source.
void CopyAsRgba(const PixelView<const std::uint8_t>& source, const ColourBytes& order,
                const PixelView<std::uint8_t>& target);
