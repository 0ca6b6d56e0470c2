// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <cstddef>
#include <memory>
#include <vector>

namespace platform {

/// A set of pixels, kept as the rectangles that cover it without overlap. Right and bottom are exclusive; a
/// rectangle that isn't wider than 0 and higher than 0 covers nothing.
/// Threads: one at a time.
/// Errors:  std::bad_alloc, and the region is as it was.
class PixelRegion {
public:
    PixelRegion();
    explicit PixelRegion(const PixelRect& rect);
    PixelRegion(const PixelRegion& other);
    PixelRegion(PixelRegion&& other) noexcept;
    PixelRegion& operator=(PixelRegion other) noexcept;
    ~PixelRegion();

    void Clear() noexcept;
    void Add(const PixelRect& rect);
    void Add(const PixelRegion& other);
    void Subtract(const PixelRect& rect);
    void Subtract(const PixelRegion& other);
    void Intersect(const PixelRect& rect);
    void Intersect(const PixelRegion& other);
    /// No corner may leave the range of an int.
    void Translate(int x, int y) noexcept;

    bool IsEmpty() const noexcept;
    bool Contains(int x, int y) const noexcept;
    /// All zeros when it is empty.
    PixelRect Bounds() const noexcept;
    /// Bands from top to bottom, from left to right in each.
    std::vector<PixelRect> Rects() const;

    bool operator==(const PixelRegion& other) const noexcept;

private:
    struct Region;
    std::unique_ptr<Region> m_region; // never null but after a move
};

} // namespace platform
