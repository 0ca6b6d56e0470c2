// SPDX-License-Identifier: Apache-2.0
#include "src/mac/cgs_composition_note.h"

#include <cstddef>
#include <utility>

namespace {

/// Changes of more rectangles are drawn as the one around them.
constexpr std::size_t MOST_CHANGED_RECTS = 64;

} // namespace

bool ShareCompositionNote::IsSameAs(const ShareFrameNote& other) const {
    const auto* const note = dynamic_cast<const ShareCompositionNote*>(&other);
    return note != nullptr && IsSameGround(*note) && m_drawing == note->m_drawing &&
           m_pointer == note->m_pointer;
}

bool ShareCompositionNote::Describe(const platform::CGContext* context, const ShareComposition& composition) {
    SetNumber(0);
    m_size = composition.size;
    m_background = composition.background;
    m_pointer = {};
    if (const std::optional<ShareCursorDrawing>& pointer = composition.pointer)
        m_pointer = {pointer->image, pointer->rect,
                     platform::CommonBox(platform::CGContextBoxOf(context, pointer->rect),
                                         platform::CGContextGetClip(context))};
    m_drawing.Clear();
    if (composition.image == nullptr)
        return context != nullptr;
    return m_drawing.Describe(context, composition.place, composition.image);
}

std::optional<platform::PixelRegion> ShareCompositionNote::ChangesSince(
    const ShareCompositionNote& before, const platform::CGWindowImage* image) const {
    platform::PixelRegion changes;
    if (!IsSameGround(before) || !m_drawing.AddChanges(before.m_drawing, image, changes))
        return std::nullopt;
    if (changes.Rects().size() > MOST_CHANGED_RECTS)
        changes = platform::PixelRegion(changes.Bounds());
    if (m_pointer != before.m_pointer) {
        changes.Add(before.m_pointer.Rect());
        changes.Add(m_pointer.Rect());
    }
    std::optional<platform::PixelRegion> part = m_drawing.PartFor(std::move(changes));
    // It is drawn as a whole, on windows that are drawn anew.
    if (part && m_pointer.Touches(*part)) {
        part->Add(m_pointer.Rect());
        part = m_drawing.PartFor(*std::move(part));
    }
    return part;
}

platform::PixelRect ShareCompositionNote::Pointer::Rect() const {
    if (box.IsEmpty())
        return {};
    return {static_cast<int>(box.left), static_cast<int>(box.top), static_cast<int>(box.right),
            static_cast<int>(box.bottom)};
}

bool ShareCompositionNote::Pointer::Touches(const platform::PixelRegion& region) const {
    platform::PixelRegion common(Rect());
    common.Intersect(region);
    return !common.IsEmpty();
}
