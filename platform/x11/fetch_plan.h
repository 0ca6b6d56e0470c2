// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/pixel_region.h"

#include <cstddef>
#include <vector>

namespace platform::x11 {

/// A read costs the server and us about as much as so many pixels more.
inline constexpr std::size_t PIXELS_WORTH_A_READ = 4096;

/// Whether a part of so many pixels of a row costs less if the server writes the whole row where it belongs
/// than if the part is copied there once more.
inline bool IsReadAsRows(int partWidth, int rowWidth) {
    return partWidth >= rowWidth / 2;
}

/// Rectangles that cover all of `rects`, which lie from top to bottom: no more than `most` (at least 1), and
/// fewer where what lies between neighbours is less than a read is worth. They may overlap.
std::vector<PixelRect> FewerRects(const std::vector<PixelRect>& rects, std::size_t most);

} // namespace platform::x11
