// SPDX-License-Identifier: Apache-2.0
#include "platform/window_image_drawing.h"

#include "platform/picture_changes.h"
#include "platform/window_image_layers.h"

#include <algorithm>
#include <cstddef>
#include <optional>

namespace platform {

namespace {

/// Pixels of a picture that is scaled look at others up to this far from where they stand: up, the two
/// nearest; down, all that they take the place of, and no more than two of those around.
constexpr std::int64_t SCALING_REACH = 2;
/// Of windows that are scaled, more bands of rows are drawn as the one around them: each takes as long to
/// begin as some rows do.
constexpr std::size_t MOST_BANDS = 8;

std::int64_t DivideDown(std::int64_t number, std::int64_t by) {
    return number >= 0 ? number / by : -((-number + by - 1) / by);
}

} // namespace

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

/// Where what is drawn of a part may lie: pixels, and rows of scaled ones.
PixelBox WindowImageDrawing::Layer::PlaceOf(const PixelRect& part) const {
    if (!IsScaled())
        return {place.left + part.left, place.top + part.top, place.left + part.right,
                place.top + part.bottom};
    const std::int64_t first = DivideDown((part.top - SCALING_REACH) * place.Height(), height) - 1;
    const std::int64_t end = DivideDown((part.bottom + SCALING_REACH) * place.Height(), height) + 2;
    return {place.left, place.top + first, place.right, place.top + end};
}

/// Those that no window in front hides.
bool WindowImageDrawing::AddChangesOf(std::size_t index, const Picture& picture, std::uint64_t earlier,
                                      PixelRegion& changes) const {
    const Layer& layer = m_layers[index];
    const std::optional<PixelRegion> changed = ChangesSince(picture, earlier);
    if (!changed)
        return false;
    PixelRegion seen;
    for (const PixelRect& rect : changed->Rects())
        seen.Add(Seen(CommonBox(layer.PlaceOf(rect), layer.place)));
    for (std::size_t i = index + 1; i < m_layers.size() && !seen.IsEmpty(); ++i) {
        if (m_layers[i].IsOpaque())
            seen.Subtract(Seen(m_layers[i].place));
    }
    changes.Add(seen);
    return true;
}

bool WindowImageDrawing::IsAnyScaled() const {
    return std::any_of(m_layers.begin(), m_layers.end(), [](const Layer& layer) { return layer.IsScaled(); });
}

std::optional<PixelRegion> WindowImageDrawing::PartFor(PixelRegion changes) const {
    if (!IsAnyScaled())
        return changes;
    const PixelRect whole = Seen(m_clip);
    PixelRegion rows;
    for (const PixelRect& rect : changes.Rects())
        rows.Add({std::min(rect.left, whole.left), rect.top, std::max(rect.right, whole.right), rect.bottom});
    if (rows.Rects().size() > MOST_BANDS)
        rows = PixelRegion(rows.Bounds());
    for (const Layer& layer : m_layers) {
        if (!layer.IsScaled() || CGHasFourBytes(layer.layout))
            continue;
        // To scale any row of it, the whole picture is turned into other pixels first.
        PixelRegion touched(Seen(layer.place));
        touched.Intersect(rows);
        if (!touched.IsEmpty())
            return std::nullopt;
    }
    return rows;
}

} // namespace platform
