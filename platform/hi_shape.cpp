// SPDX-License-Identifier: Apache-2.0
#include "platform/hi_shape.h"

#include "util/cm_numeric.h"

#include <pixman.h>

#include <new>
#include <utility>

namespace platform {

class HIShape {
public:
    HIShape() noexcept { pixman_region32_init(&region); }
    /// pixman complains on standard error about a box without area, so such a one never gets there.
    explicit HIShape(const pixman_box32_t& box) noexcept {
        if (box.x1 < box.x2 && box.y1 < box.y2)
            pixman_region32_init_with_extents(&region, &box);
        else
            pixman_region32_init(&region);
    }
    ~HIShape() { pixman_region32_fini(&region); }
    HIShape(const HIShape&) = delete;
    HIShape& operator=(const HIShape&) = delete;

    pixman_region32_t region;
};

namespace {

using RegionOperation = pixman_bool_t (*)(pixman_region32_t*, const pixman_region32_t*,
                                          const pixman_region32_t*);

pixman_box32_t ToBox(const CGRect& rect) {
    return {CmTruncate(rect.origin.x), CmTruncate(rect.origin.y), CmTruncate(rect.origin.x + rect.size.width),
            CmTruncate(rect.origin.y + rect.size.height)};
}

CGRect ToRect(const pixman_box32_t& box) {
    // Unsigned: an extent may need all 32 bits.
    const auto width = static_cast<unsigned>(box.x2) - static_cast<unsigned>(box.x1);
    const auto height = static_cast<unsigned>(box.y2) - static_cast<unsigned>(box.y1);
    return {{static_cast<float>(box.x1), static_cast<float>(box.y1)},
            {static_cast<float>(width), static_cast<float>(height)}};
}

/// pixman spoils the region it writes to when memory runs out, so it never writes to one that somebody holds.
OSStatus Combine(RegionOperation operation, const HIShape& shape1, const HIShape& shape2, HIShape& result) {
    HIShape combined;
    if (!operation(&combined.region, &shape1.region, &shape2.region))
        return memFullErr;
    std::swap(result.region, combined.region);
    return noErr;
}

OSStatus Combine(RegionOperation operation, const HIShape* shape1, const HIShape* shape2, HIShape* result) {
    if (shape1 == nullptr || shape2 == nullptr || result == nullptr)
        return paramErr;
    return Combine(operation, *shape1, *shape2, *result);
}

OSStatus EnumerateRects(const HIShape* shape, HIShapeEnumerateProcPtr proc, void* refcon) {
    int count = 0;
    const pixman_box32_t* boxes = pixman_region32_rectangles(&shape->region, &count);
    for (int i = 0; i < count; ++i) {
        const CGRect rect = ToRect(boxes[i]);
        if (const OSStatus status = proc(kHIShapeEnumerateRect, shape, &rect, refcon); status != noErr)
            return status;
    }
    return noErr;
}

} // namespace

void HIShapeRelease::operator()(const HIShape* shape) const noexcept {
    delete shape;
}

HIShapeRef HIShapeCreateWithRect(const CGRect& rect) noexcept {
    return HIShapeRef(new (std::nothrow) HIShape(ToBox(rect)));
}

HIMutableShapeRef HIShapeCreateMutable() noexcept {
    return HIMutableShapeRef(new (std::nothrow) HIShape);
}

HIMutableShapeRef HIShapeCreateMutableCopy(const HIShape* original) noexcept {
    if (original == nullptr)
        return nullptr;
    HIMutableShapeRef copy = HIShapeCreateMutable();
    if (copy == nullptr || !pixman_region32_copy(&copy->region, &original->region))
        return nullptr;
    return copy;
}

bool HIShapeIsEmpty(const HIShape* shape) noexcept {
    return shape == nullptr || !pixman_region32_not_empty(&shape->region);
}

CGRect* HIShapeGetBounds(const HIShape* shape, CGRect* bounds) noexcept {
    if (shape == nullptr || bounds == nullptr)
        return nullptr;
    // An empty region keeps an edge of what it once was.
    *bounds = HIShapeIsEmpty(shape) ? CGRect{} : ToRect(*pixman_region32_extents(&shape->region));
    return bounds;
}

OSStatus HIShapeSetEmpty(HIShape* shape) noexcept {
    if (shape == nullptr)
        return paramErr;
    pixman_region32_clear(&shape->region);
    return noErr;
}

OSStatus HIShapeUnionWithRect(HIShape* shape, const CGRect& rect) noexcept {
    if (shape == nullptr)
        return paramErr;
    return Combine(pixman_region32_union, *shape, HIShape(ToBox(rect)), *shape);
}

OSStatus HIShapeIntersect(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept {
    return Combine(pixman_region32_intersect, shape1, shape2, result);
}

OSStatus HIShapeUnion(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept {
    return Combine(pixman_region32_union, shape1, shape2, result);
}

OSStatus HIShapeDifference(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept {
    return Combine(pixman_region32_subtract, shape1, shape2, result);
}

OSStatus HIShapeXor(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept {
    if (shape1 == nullptr || shape2 == nullptr || result == nullptr)
        return paramErr;
    HIShape only1;
    HIShape only2;
    if (!pixman_region32_subtract(&only1.region, &shape1->region, &shape2->region) ||
        !pixman_region32_subtract(&only2.region, &shape2->region, &shape1->region))
        return memFullErr;
    return Combine(pixman_region32_union, only1, only2, *result);
}

OSStatus HIShapeEnumerate(const HIShape* shape, unsigned options, HIShapeEnumerateProcPtr proc,
                          void* refcon) noexcept {
    if (shape == nullptr || proc == nullptr || options != kHIShapeParseFromTopLeft)
        return paramErr;
    OSStatus status = proc(kHIShapeEnumerateInit, shape, nullptr, refcon);
    if (status == noErr)
        status = EnumerateRects(shape, proc, refcon);
    const OSStatus last = proc(kHIShapeEnumerateTerminate, shape, nullptr, refcon);
    return status != noErr ? status : last;
}

} // namespace platform
