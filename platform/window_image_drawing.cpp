// SPDX-License-Identifier: Apache-2.0
#include "platform/window_image_drawing.h"

#include "platform/picture_changes.h"
#include "platform/window_image_layers.h"

#include <cstddef>
#include <optional>

namespace platform {

bool WindowImageDrawing::Layer::IsAtSamePlaceAs(const Layer& other) const {
    return window == other.window && width == other.width && height == other.height &&
           layout == other.layout && place == other.place && alpha == other.alpha;
}

bool WindowImageDrawing::Describe(const CGContext* context, const CGRect& rect, const CGWindowImage* image) {
    Clear();
    if (context == nullptr || image == nullptr || !IsFiniteArea(rect))
        return false;
    const PixelBox whole{0, 0, CGBitmapContextGetWidth(context), CGBitmapContextGetHeight(context)};
    m_clip = CommonBox(CGContextBoxOf(context, rect), whole);
    m_layers.reserve(image->layers.size());
    for (const WindowLayer& layer : image->layers) {
        const Picture& picture = *layer.picture;
        if (picture.serial == 0) {
            Clear();
            return false;
        }
        m_layers.push_back({layer.window, picture.serial, picture.width, picture.height, layer.image->layout,
                            CGContextBoxOf(context, PlaceOfLayer(layer, *image, rect)), layer.alpha});
    }
    return true;
}

/// What is seen of a box, which may reach far beyond the context.
PixelRect WindowImageDrawing::Seen(const PixelBox& box) const {
    const PixelBox seen = CommonBox(box, m_clip);
    if (seen.IsEmpty())
        return {};
    return {static_cast<int>(seen.left), static_cast<int>(seen.top), static_cast<int>(seen.right),
            static_cast<int>(seen.bottom)};
}

bool WindowImageDrawing::AddChanges(const WindowImageDrawing& earlier, const CGWindowImage* image,
                                    PixelRegion& changes) const {
    if (image == nullptr || image->layers.size() != m_layers.size() ||
        earlier.m_layers.size() != m_layers.size() || earlier.m_clip != m_clip)
        return false;
    for (std::size_t i = 0; i < m_layers.size(); ++i) {
        const std::uint64_t before = earlier.m_layers[i].serial;
        if (!m_layers[i].IsAtSamePlaceAs(earlier.m_layers[i]))
            return false;
        if (m_layers[i].serial != before && !AddChangesOf(i, *image->layers[i].picture, before, changes))
            return false;
    }
    return true;
}

/// Those that no window in front hides.
bool WindowImageDrawing::AddChangesOf(std::size_t index, const Picture& picture, std::uint64_t earlier,
                                      PixelRegion& changes) const {
    const Layer& layer = m_layers[index];
    const std::optional<PixelRegion> changed = ChangesSince(picture, earlier);
    if (!changed || layer.IsScaled())
        return false;
    PixelRegion seen;
    for (const PixelRect& rect : changed->Rects()) {
        const std::int64_t x = layer.place.left;
        const std::int64_t y = layer.place.top;
        const PixelBox moved{x + rect.left, y + rect.top, x + rect.right, y + rect.bottom};
        seen.Add(Seen(CommonBox(moved, layer.place)));
    }
    for (std::size_t i = index + 1; i < m_layers.size() && !seen.IsEmpty(); ++i) {
        if (m_layers[i].IsOpaque())
            seen.Subtract(Seen(m_layers[i].place));
    }
    changes.Add(seen);
    return true;
}

bool WindowImageDrawing::CanDrawPart(const PixelRegion& part) const {
    for (const Layer& layer : m_layers) {
        if (!layer.IsScaled())
            continue;
        PixelRegion touched(Seen(layer.place));
        touched.Intersect(part);
        if (!touched.IsEmpty())
            return false;
    }
    return true;
}

} // namespace platform
