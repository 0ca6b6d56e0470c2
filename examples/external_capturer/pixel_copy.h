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

/// Copies a picture and makes it opaque: byte `alphaByte` of each pixel becomes 255. A smaller target gets
/// the picture shrunk, each of its pixels the mean of those it covers. The target is at most as large as the
/// source.
void CopyOpaque(const PixelView<const std::uint8_t>& source, const PixelView<std::uint8_t>& target,
                int alphaByte);
