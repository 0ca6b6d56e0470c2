// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/bitmap_context.h"
#include "platform/bitmap_context_clip.h"
#include "platform/cg_image.h"
#include "platform/core_graphics_images.h"
#include "platform/core_types.h"
#include "platform/pixel_region.h"

#include <cstddef>
#include <cstdint>
#include <optional>
#include <vector>

namespace platform {

/// What drawing an image of windows leaves in a bitmap context, told by numbers: enough to know later,
/// without the pictures, where the drawing of a newer image would leave something else.
///
/// Equal drawings on equal grounds leave equal pixels.
/// Threads: one at a time. Errors: std::bad_alloc where it is told; what is described is then unknown.
class WindowImageDrawing {
public:
    /// Nothing is drawn.
    void Clear() noexcept {
        m_clip = {};
        m_layers.clear();
    }

    /// Becomes the drawing of `image` into `rect`. False when it can't be told from others, and it is then
    /// that of nothing: where a picture has no number, or there is nothing to draw on. Throws std::bad_alloc.
    bool Describe(const CGContext* context, const CGRect& rect, const CGWindowImage* image);

    /// Adds to `changes` the pixels where this drawing, of `image`, may leave something else than an earlier
    /// one. False when that isn't known, and all of them may differ. Throws std::bad_alloc.
    bool AddChanges(const WindowImageDrawing& earlier, const CGWindowImage* image,
                    PixelRegion& changes) const;

    /// What has to be drawn for changes: each rectangle of it, when the drawing is clipped to it, comes out
    /// as in a drawing of the whole. Windows that are scaled are drawn in whole rows. Nothing when all has to
    /// be drawn. Throws std::bad_alloc.
    std::optional<PixelRegion> PartFor(PixelRegion changes) const;

    bool operator==(const WindowImageDrawing&) const = default;

private:
    /// A window's part. Everything that makes its pixels is here or is told by the number of its picture.
    struct Layer {
        CGWindowID window = 0;
        std::uint64_t serial = 0;
        int width = 0; // of the picture, pixels
        int height = 0;
        CGPixelLayout layout = CGPixelLayout::RGBA;
        PixelBox place;
        float alpha = 1.0F;

        /// Leaves nothing of what is behind it. What is scaled may fail to be drawn, for want of memory.
        bool IsOpaque() const { return alpha >= 1.0F && !CGHasAlpha(layout) && !IsScaled(); }
        bool IsScaled() const { return place.Width() != width || place.Height() != height; }
        bool IsAtSamePlaceAs(const Layer& other) const;
        PixelBox PlaceOf(const PixelRect& part) const;
        bool operator==(const Layer&) const = default;
    };

    bool IsAnyScaled() const;
    bool AddChangesOf(std::size_t index, const Picture& picture, std::uint64_t earlier,
                      PixelRegion& changes) const;
    PixelRect Seen(const PixelBox& box) const;

    PixelBox m_clip; // where it is seen, within the context
    std::vector<Layer> m_layers;
};

} // namespace platform
