// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/hi_shape.h"

#include <screenshare/share_types.h>

#include <string>
#include <vector>

/// How CombineRgn joins a region with another.
enum RegionCombinOpt : int {
    REGION_COMBINE_AND = 1,  ///< What both cover.
    REGION_COMBINE_COPY = 2, ///< The other.
    REGION_COMBINE_DIFF = 3, ///< What the other doesn't cover.
    REGION_COMBINE_OR = 4,   ///< What either covers.
    REGION_COMBINE_XOR = 5,  ///< What just one covers.
};

/// A set of whole units of the plane, built from rectangles: points of the global display space, or pixels of
/// a frame after ProjectRgn.
///
/// A rectangle whose right isn't beyond its left, or whose bottom isn't below its top, covers nothing.
/// Coordinates pass through single precision: beyond 2^24 they lose their last digits. The rectangles of a
/// region come in bands from top to bottom and in a band from left to right; they do not overlap, and regions
/// that cover the same units give the same rectangles.
///
/// When memory runs out a region may be left without a shape, and copying such a region makes another. It
/// counts as empty and refuses to be changed until Empty, SetRectRgn, a copy or ProjectRgn gives it a shape.
/// Threads: one at a time. Errors: false, and the region is as it was. Nothing is traced, nor thrown but
/// where
///          it says so.
class TVLRegion {
public:
    TVLRegion() noexcept;
    /// `other` is empty afterwards and can be used.
    TVLRegion(TVLRegion&& other) noexcept;
    ~TVLRegion() = default;
    TVLRegion(const TVLRegion&) = delete;

    /// CopyRgn.
    bool operator=(const TVLRegion& other) noexcept;
    /// `other` is empty afterwards and can be used; moving a region to itself does nothing.
    TVLRegion& operator=(TVLRegion&& other) noexcept;

    /// Makes this an independent copy, without a shape if `other` has none. Always true.
    bool CopyRgn(const TVLRegion& other) noexcept;

    /// Whether both cover the same units. False, too, when there is no memory to find out.
    bool operator==(const TVLRegion& other) const noexcept;

    void Empty() noexcept;
    /// Makes this the one rectangle. Always true.
    bool SetRectRgn(int left, int top, int right, int bottom) noexcept;

    bool AddRect(const TVLRect& rect) noexcept;
    bool ExcludeRect(const TVLRect& rect) noexcept;

    bool IsEmpty() const noexcept;

    /// Appends to `rects`.
    bool GetRects(std::vector<TVLRect>& rects) const noexcept;
    /// The same on their own, none without a shape. Throws std::bad_alloc.
    std::vector<TVLRect> AllRects() const;

    /// The smallest rectangle around the region, all zeros when it is empty. False without a shape, and `box`
    /// is untouched.
    bool GetRgnBox(TVLRect& box) const noexcept;

    /// False when either has no shape or `option` is none of the named. `other` may be this region.
    bool CombineRgn(const TVLRegion& other, RegionCombinOpt option) noexcept;

    /// Maps global display coordinates into a frame whose left top corner is at that of `origin`: each edge
    /// of each rectangle is moved, scaled and cut toward zero for itself, so a thin rectangle may vanish.
    /// Always true; without memory there is no shape afterwards.
    bool ProjectRgn(const TVLRect& origin, float scale) noexcept;

    /// "{ region:{size:2,rects:[{{left:…}},\n{{left:…}},\n]}}"; not complete when memory runs out.
    std::string ToString() const noexcept;

private:
    /// Unlike CopyRgn, keeps the present shape when there is no copy.
    bool TakeCopyOf(const platform::HIShape* shape) noexcept;

    platform::HIMutableShapeRef m_hShape;
};
