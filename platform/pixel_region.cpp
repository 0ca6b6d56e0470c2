// SPDX-License-Identifier: Apache-2.0
#include "platform/pixel_region.h"

#include <pixman.h>

#include <new>
#include <utility>

namespace platform {

/// A region of pixman, which after a failed operation is broken: so results are made beside it.
struct PixelRegion::Region {
    Region() { pixman_region32_init(&shape); }
    explicit Region(const PixelRect& rect) {
        const pixman_box32_t box{rect.left, rect.top, rect.right, rect.bottom};
        if (box.x1 < box.x2 && box.y1 < box.y2)
            pixman_region32_init_with_extents(&shape, &box);
        else
            pixman_region32_init(&shape);
    }
    ~Region() { pixman_region32_fini(&shape); }
    Region(const Region&) = delete;
    Region& operator=(const Region&) = delete;

    template <class Operation>
    void Combine(Operation operation, const Region& other) {
        Region result;
        if (operation(&result.shape, Mutable(), other.Mutable()) == 0)
            throw std::bad_alloc();
        std::swap(shape, result.shape);
    }

    /// Older pixman takes pointers to what it only reads.
    pixman_region32_t* Mutable() const { return const_cast<pixman_region32_t*>(&shape); }

    pixman_region32_t shape;
};

PixelRegion::PixelRegion() : m_region(std::make_unique<Region>()) {}

PixelRegion::PixelRegion(const PixelRect& rect) : m_region(std::make_unique<Region>(rect)) {}

PixelRegion::PixelRegion(const PixelRegion& other) : PixelRegion() {
    if (pixman_region32_copy(&m_region->shape, other.m_region->Mutable()) == 0)
        throw std::bad_alloc();
}

PixelRegion::PixelRegion(PixelRegion&& other) noexcept = default;

PixelRegion& PixelRegion::operator=(PixelRegion other) noexcept {
    m_region.swap(other.m_region);
    return *this;
}

PixelRegion::~PixelRegion() = default;

void PixelRegion::Clear() noexcept {
    pixman_region32_clear(&m_region->shape);
}

void PixelRegion::Add(const PixelRect& rect) {
    m_region->Combine(pixman_region32_union, Region(rect));
}

void PixelRegion::Add(const PixelRegion& other) {
    m_region->Combine(pixman_region32_union, *other.m_region);
}

void PixelRegion::Subtract(const PixelRect& rect) {
    m_region->Combine(pixman_region32_subtract, Region(rect));
}

void PixelRegion::Subtract(const PixelRegion& other) {
    m_region->Combine(pixman_region32_subtract, *other.m_region);
}

void PixelRegion::Intersect(const PixelRect& rect) {
    m_region->Combine(pixman_region32_intersect, Region(rect));
}

void PixelRegion::Intersect(const PixelRegion& other) {
    m_region->Combine(pixman_region32_intersect, *other.m_region);
}

void PixelRegion::Translate(int x, int y) noexcept {
    pixman_region32_translate(&m_region->shape, x, y);
}

bool PixelRegion::IsEmpty() const noexcept {
    return pixman_region32_not_empty(m_region->Mutable()) == 0;
}

bool PixelRegion::Contains(int x, int y) const noexcept {
    return pixman_region32_contains_point(m_region->Mutable(), x, y, nullptr) != 0;
}

PixelRect PixelRegion::Bounds() const noexcept {
    if (IsEmpty())
        return {};
    const pixman_box32_t& box = *pixman_region32_extents(m_region->Mutable());
    return {box.x1, box.y1, box.x2, box.y2};
}

std::vector<PixelRect> PixelRegion::Rects() const {
    int count = 0;
    const pixman_box32_t* const boxes = pixman_region32_rectangles(m_region->Mutable(), &count);
    std::vector<PixelRect> rects;
    rects.reserve(static_cast<std::size_t>(count));
    for (int index = 0; index < count; ++index)
        rects.push_back({boxes[index].x1, boxes[index].y1, boxes[index].x2, boxes[index].y2});
    return rects;
}

bool PixelRegion::operator==(const PixelRegion& other) const noexcept {
    return pixman_region32_equal(m_region->Mutable(), other.m_region->Mutable()) != 0;
}

} // namespace platform
