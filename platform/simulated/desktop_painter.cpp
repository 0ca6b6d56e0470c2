// SPDX-License-Identifier: Apache-2.0
#include "platform/simulated/desktop_painter.h"

#include "platform/picture_changes.h"
#include "util/cm_numeric.h"

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <memory>
#include <utility>

namespace platform {

namespace {

constexpr std::uint32_t SHADOW = 0x40000000;

float Overlap(float first, float size, float otherFirst, float otherSize) {
    return std::min(first + size, otherFirst + otherSize) - std::max(first, otherFirst);
}

float CommonArea(const CGRect& one, const CGRect& other) {
    const float width = Overlap(one.origin.x, one.size.width, other.origin.x, other.size.width);
    const float height = Overlap(one.origin.y, one.size.height, other.origin.y, other.size.height);
    return width > 0 && height > 0 ? width * height : 0.0F;
}

/// Of the display that shows most of it, else of the main one.
float ScaleOf(const SimulatedDesktop& desktop, const CGRect& frame) {
    float scale = desktop.displays.empty() ? 1.0F : desktop.displays.front().scale;
    float most = 0;
    for (const SimulatedDisplay& display : desktop.displays) {
        const float area = CommonArea(display.bounds, frame);
        if (area > most) {
            most = area;
            scale = display.scale;
        }
    }
    return scale;
}

int Rounded(float points, float scale) {
    return CmTruncate(std::floor(static_cast<double>(points) * static_cast<double>(scale) + 0.5));
}

/// A rectangle in points as pixels of a display.
PixelRect OnDisplay(const CGRect& rect, const SimulatedDisplay& display) {
    const int left = Rounded(rect.origin.x - display.bounds.origin.x, display.scale);
    const int top = Rounded(rect.origin.y - display.bounds.origin.y, display.scale);
    return {left, top, left + PixelsAcross(rect.size.width, display.scale),
            top + PixelsAcross(rect.size.height, display.scale)};
}

std::uint32_t AlphaByte(float alpha) {
    return static_cast<std::uint32_t>(CmTruncate(std::clamp(alpha, 0.0F, 1.0F) * 255.0F + 0.5F));
}

/// Among several, the one made for that scale or the next best.
const SimulatedCursor::Representation& BestFor(const SimulatedCursor& cursor, float scale) {
    return *std::min_element(
        cursor.representations.begin(), cursor.representations.end(),
        [scale](const SimulatedCursor::Representation& one, const SimulatedCursor::Representation& other) {
            return std::abs(one.scale - scale) < std::abs(other.scale - scale);
        });
}

bool IsOfShape(const Picture& picture, const SimulatedPixels& pixels, const SimulatedPictureShape& shape) {
    return picture.width == pixels.width && picture.height == pixels.height &&
           picture.format == shape.format && picture.scale == shape.scale &&
           picture.stride == static_cast<std::size_t>(pixels.width) * 4 + shape.rowGap;
}

} // namespace

CGRect WithShadow(const SimulatedWindow& window) {
    const CGRect& frame = window.info.frame;
    const SimulatedEdges& shadow = window.shadow;
    return {{frame.origin.x - shadow.left, frame.origin.y - shadow.top},
            {frame.size.width + shadow.left + shadow.right, frame.size.height + shadow.top + shadow.bottom}};
}

bool Touch(const CGRect& one, const CGRect& other) {
    return CommonArea(one, other) > 0;
}

bool DesktopPainter::Source::SameAs(const Source& other) const {
    return content == other.content && frame == other.frame && width == other.width &&
           height == other.height && inner == other.inner && shape.format == other.shape.format &&
           shape.rowGap == other.shape.rowGap && shape.scale == other.shape.scale;
}

PicturePtr DesktopPainter::WindowPicture(const Moment& moment, const SimulatedWindow& window,
                                         bool withShadow) {
    Painted* const painted = PaintedWindow(moment, window, withShadow);
    if (painted == nullptr)
        return nullptr;
    return PictureOf(painted->pixels, painted->source.shape, moment.now, painted->pictured);
}

/// The same object as long as the pixels and how they lie are the same.
PicturePtr DesktopPainter::PictureOf(const SimulatedPixelsPtr& pixels, const SimulatedPictureShape& shape,
                                     std::chrono::nanoseconds now, Pictured& pictured) const {
    const Picture* const before = pictured.picture.get();
    const bool isAlike = before != nullptr && IsOfShape(*before, *pixels, shape);
    if (isAlike && pictured.pixels == pixels)
        return pictured.picture;
    auto picture = std::make_shared<Picture>(MakePicture(*pixels, shape, now));
    picture->serial = NextPictureSerial();
    if (isAlike) {
        std::vector<PixelRect> rects = DifferentRects(*pictured.pixels, *pixels);
        if (m_forgetChanges && !rects.empty())
            rects.pop_back();
        PixelRegion changed;
        for (const PixelRect& rect : rects)
            changed.Add(rect);
        picture->steps = StepsAfter(*before, changed);
    }
    pictured = {pixels, std::move(picture)};
    return pictured.picture;
}

SimulatedPixelsPtr DesktopPainter::DisplayPixels(const Moment& moment, const SimulatedDisplay& display,
                                                 bool withPointer) {
    SimulatedPixelsPtr& kept = m_displays[{display.id, withPointer}];
    if (m_keepOld && kept != nullptr)
        return kept;
    auto pixels = std::make_shared<SimulatedPixels>(*Background(moment, display));
    std::for_each(moment.stack.rbegin(), moment.stack.rend(),
                  [&](const SimulatedWindow& window) { LayWindow(moment, window, display, *pixels); });
    if (withPointer)
        LayPointer(moment, display, *pixels);
    if (kept == nullptr || *kept != *pixels)
        kept = std::move(pixels);
    return kept;
}

PicturePtr DesktopPainter::DisplayPicture(const Moment& moment, const SimulatedDisplay& display) {
    const SimulatedPixelsPtr pixels = DisplayPixels(moment, display, false);
    return PictureOf(pixels, {display.format, display.rowGap, display.bounds, display.scale}, moment.now,
                     m_displayPictures[display.id]);
}

void DesktopPainter::Forget(const SimulatedDesktop& desktop) {
    const auto hasWindow = [&](CGWindowID id) {
        return std::any_of(desktop.windows.begin(), desktop.windows.end(),
                           [id](const SimulatedWindow& each) { return each.info.id == id; });
    };
    const auto hasDisplay = [&](CGDirectDisplayID id) {
        return std::any_of(desktop.displays.begin(), desktop.displays.end(),
                           [id](const SimulatedDisplay& each) { return each.id == id; });
    };
    std::erase_if(m_windows, [&](const auto& each) { return !hasWindow(each.first.first); });
    std::erase_if(m_backgrounds, [&](const auto& each) { return !hasDisplay(each.first); });
    std::erase_if(m_displays, [&](const auto& each) { return !hasDisplay(each.first.first); });
    std::erase_if(m_displayPictures, [&](const auto& each) { return !hasDisplay(each.first); });
}

DesktopPainter::Source DesktopPainter::SourceOf(const Moment& moment, const SimulatedWindow& window,
                                                bool withShadow) {
    Source source;
    const CGRect& frame = window.info.frame;
    const float scale = ScaleOf(moment.desktop, frame);
    const SimulatedEdges edges = withShadow ? window.shadow : SimulatedEdges{};
    source.content = window.content;
    source.frame = window.content.FrameAt(moment.elapsed);
    source.inner.left = PixelsAcross(edges.left, scale);
    source.inner.top = PixelsAcross(edges.top, scale);
    source.inner.right = source.inner.left + PixelsAcross(frame.size.width, scale);
    source.inner.bottom = source.inner.top + PixelsAcross(frame.size.height, scale);
    source.width = source.inner.right + PixelsAcross(edges.right, scale);
    source.height = source.inner.bottom + PixelsAcross(edges.bottom, scale);
    source.shape = {window.format, window.rowGap, withShadow ? WithShadow(window) : frame, scale};
    return source;
}

SimulatedPixels DesktopPainter::Paint(const Source& source) {
    SimulatedPixels pixels = NewPixels(source.width, source.height);
    const PixelRect whole{0, 0, source.width, source.height};
    if (source.inner != whole)
        std::fill(pixels.argb.begin(), pixels.argb.end(), SHADOW);
    PaintContent(source.content, source.frame, source.inner, pixels);
    return pixels;
}

/// Null when there is nothing to show.
DesktopPainter::Painted* DesktopPainter::PaintedWindow(const Moment& moment, const SimulatedWindow& window,
                                                       bool withShadow) {
    if (!window.content.IsPainted())
        return nullptr;
    const auto known = m_windows.find({window.info.id, withShadow});
    // A window that is off the screen paints no more: what was seen last stays.
    if (known != m_windows.end() && (m_keepOld || !window.info.onScreen))
        return &known->second;
    Source source = SourceOf(moment, window, withShadow);
    if (source.inner.right == source.inner.left || source.inner.bottom == source.inner.top)
        return nullptr;
    if (known != m_windows.end() && known->second.source.SameAs(source))
        return &known->second;
    auto pixels = std::make_shared<const SimulatedPixels>(Paint(source));
    Painted& painted = m_windows[{window.info.id, withShadow}];
    if (painted.pixels == nullptr || *painted.pixels != *pixels)
        painted.pixels = std::move(pixels);
    painted.source = std::move(source);
    return &painted;
}

SimulatedPixelsPtr DesktopPainter::Background(const Moment& moment, const SimulatedDisplay& display) {
    Source source;
    source.content = display.background;
    source.frame = display.background.FrameAt(moment.elapsed);
    source.width = PixelsAcross(display.bounds.size.width, display.scale);
    source.height = PixelsAcross(display.bounds.size.height, display.scale);
    source.inner = {0, 0, source.width, source.height};
    Painted& painted = m_backgrounds[display.id];
    if (painted.pixels == nullptr || !painted.source.SameAs(source)) {
        SimulatedPixels pixels = Paint(source);
        // Behind everything else, so opaque.
        SimulatedPixels black = NewPixels(source.width, source.height);
        std::fill(black.argb.begin(), black.argb.end(), Opaque(0));
        LayOver(pixels, source.inner, 255, black);
        painted.pixels = std::make_shared<const SimulatedPixels>(std::move(black));
        painted.source = std::move(source);
    }
    return painted.pixels;
}

void DesktopPainter::LayWindow(const Moment& moment, const SimulatedWindow& window,
                               const SimulatedDisplay& display, SimulatedPixels& target) {
    const CGRect outer = WithShadow(window);
    if (!window.info.onScreen || window.info.sharing == SharingState::None || !Touch(outer, display.bounds))
        return;
    if (const Painted* const painted = PaintedWindow(moment, window, true))
        LayOver(*painted->pixels, OnDisplay(outer, display), AlphaByte(window.info.alpha), target);
}

void DesktopPainter::LayPointer(const Moment& moment, const SimulatedDisplay& display,
                                SimulatedPixels& target) {
    const SimulatedDesktop& desktop = moment.desktop;
    if (!desktop.pointer || !desktop.cursor || desktop.cursor->representations.empty())
        return;
    const SimulatedCursor::Representation& best = BestFor(*desktop.cursor, display.scale);
    SimulatedPixels pixels = NewPixels(best.width, best.height);
    PaintContent(best.content, 0, {0, 0, best.width, best.height}, pixels);
    const CGRect place{
        {desktop.pointer->x - desktop.cursor->hotSpot.x, desktop.pointer->y - desktop.cursor->hotSpot.y},
        {static_cast<float>(best.width) / best.scale, static_cast<float>(best.height) / best.scale}};
    LayOver(pixels, OnDisplay(place, display), 255, target);
}

} // namespace platform
