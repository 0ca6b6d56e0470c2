// SPDX-License-Identifier: Apache-2.0
#include "src/share_region.h"

#include "src/share_util.h"
#include "util/cm_numeric.h"

#include <cstddef>
#include <new>
#include <utility>

namespace {

/// The distance as the 32 bits hold it: edges at both ends of the range are further apart than an int can
/// say.
int Distance(int from, int to) {
    return static_cast<int>(static_cast<unsigned>(to) - static_cast<unsigned>(from));
}

platform::CGRect ToShapeRect(const TVLRect& rect) {
    return {{static_cast<float>(rect.left), static_cast<float>(rect.top)},
            {static_cast<float>(Distance(rect.left, rect.right)),
             static_cast<float>(Distance(rect.top, rect.bottom))}};
}

TVLRect ToEnumeratedRect(const platform::CGRect& rect) {
    return {CmTruncate(rect.origin.x), CmTruncate(rect.origin.y), CmTruncate(rect.origin.x + rect.size.width),
            CmTruncate(rect.origin.y + rect.size.height)};
}

/// Unlike an enumerated rectangle, a box has its size added to the origin that is already cut.
TVLRect ToBox(const platform::CGRect& rect) {
    const int left = CmTruncate(rect.origin.x);
    const int top = CmTruncate(rect.origin.y);
    return {left, top, CmTruncate(static_cast<float>(left) + rect.size.width),
            CmTruncate(static_cast<float>(top) + rect.size.height)};
}

int Project(int coordinate, int origin, float scale) {
    return CmTruncate(static_cast<float>(Distance(origin, coordinate)) * scale);
}

TVLRect Project(const TVLRect& rect, const TVLRect& origin, float scale) {
    return {Project(rect.left, origin.left, scale), Project(rect.top, origin.top, scale),
            Project(rect.right, origin.left, scale), Project(rect.bottom, origin.top, scale)};
}

platform::OSStatus AppendRect(platform::HIShapeEnumerateMessage message, const platform::HIShape*,
                              const platform::CGRect* rect, void* rects) {
    if (message != platform::kHIShapeEnumerateRect)
        return platform::noErr;
    try {
        static_cast<std::vector<TVLRect>*>(rects)->push_back(ToEnumeratedRect(*rect));
        return platform::noErr;
    } catch (const std::bad_alloc&) {
        return platform::memFullErr;
    }
}

/// The union of halves of halves: to add the rectangles one by one would go through all that is there for
/// each. Null when there is no memory.
platform::HIMutableShapeRef UnionOf(const TVLRect* rects, std::size_t count) noexcept {
    platform::HIMutableShapeRef shape = platform::HIShapeCreateMutable();
    auto status = platform::noErr;
    if (count == 1) {
        status = platform::HIShapeUnionWithRect(shape.get(), ToShapeRect(*rects));
    } else if (count > 1) {
        const std::size_t half = count / 2;
        const platform::HIMutableShapeRef first = UnionOf(rects, half);
        const platform::HIMutableShapeRef second = UnionOf(rects + half, count - half);
        status = platform::HIShapeUnion(first.get(), second.get(), shape.get());
    }
    return status == platform::noErr ? std::move(shape) : nullptr;
}

} // namespace

TVLRegion::TVLRegion() noexcept : m_hShape(platform::HIShapeCreateMutable()) {}

TVLRegion::TVLRegion(TVLRegion&& other) noexcept
    : m_hShape(std::exchange(other.m_hShape, platform::HIShapeCreateMutable())) {}

bool TVLRegion::operator=(const TVLRegion& other) noexcept {
    return CopyRgn(other);
}

TVLRegion& TVLRegion::operator=(TVLRegion&& other) noexcept {
    if (this != &other)
        m_hShape = std::exchange(other.m_hShape, platform::HIShapeCreateMutable());
    return *this;
}

bool TVLRegion::CopyRgn(const TVLRegion& other) noexcept {
    if (this != &other)
        m_hShape = platform::HIShapeCreateMutableCopy(other.m_hShape.get());
    return true;
}

bool TVLRegion::operator==(const TVLRegion& other) const noexcept {
    if (IsEmpty() || other.IsEmpty())
        return IsEmpty() && other.IsEmpty();
    const platform::HIMutableShapeRef rest = platform::HIShapeCreateMutable();
    return platform::HIShapeXor(m_hShape.get(), other.m_hShape.get(), rest.get()) == platform::noErr &&
           platform::HIShapeIsEmpty(rest.get());
}

void TVLRegion::Empty() noexcept {
    if (m_hShape == nullptr)
        m_hShape = platform::HIShapeCreateMutable();
    else
        platform::HIShapeSetEmpty(m_hShape.get());
}

bool TVLRegion::SetRectRgn(int left, int top, int right, int bottom) noexcept {
    Empty();
    AddRect({left, top, right, bottom});
    return true;
}

bool TVLRegion::AddRect(const TVLRect& rect) noexcept {
    return platform::HIShapeUnionWithRect(m_hShape.get(), ToShapeRect(rect)) == platform::noErr;
}

bool TVLRegion::ExcludeRect(const TVLRect& rect) noexcept {
    const platform::HIShapeRef excluded = platform::HIShapeCreateWithRect(ToShapeRect(rect));
    return platform::HIShapeDifference(m_hShape.get(), excluded.get(), m_hShape.get()) == platform::noErr;
}

bool TVLRegion::IsEmpty() const noexcept {
    return platform::HIShapeIsEmpty(m_hShape.get());
}

bool TVLRegion::GetRects(std::vector<TVLRect>& rects) const noexcept {
    const std::size_t before = rects.size();
    if (platform::HIShapeEnumerate(m_hShape.get(), platform::kHIShapeParseFromTopLeft, AppendRect, &rects) ==
        platform::noErr)
        return true;
    rects.resize(before);
    return false;
}

std::vector<TVLRect> TVLRegion::AllRects() const {
    std::vector<TVLRect> rects;
    if (!GetRects(rects) && m_hShape != nullptr)
        throw std::bad_alloc();
    return rects;
}

bool TVLRegion::GetRgnBox(TVLRect& box) const noexcept {
    platform::CGRect bounds;
    if (platform::HIShapeGetBounds(m_hShape.get(), &bounds) == nullptr)
        return false;
    box = ToBox(bounds);
    return true;
}

bool TVLRegion::CombineRgn(const TVLRegion& other, RegionCombinOpt option) noexcept {
    if (m_hShape == nullptr || other.m_hShape == nullptr)
        return false;
    platform::HIShape* const own = m_hShape.get();
    const platform::HIShape* const others = other.m_hShape.get();
    switch (option) {
        case REGION_COMBINE_AND:
            return platform::HIShapeIntersect(own, others, own) == platform::noErr;
        case REGION_COMBINE_COPY:
            return TakeCopyOf(others);
        case REGION_COMBINE_DIFF:
            return platform::HIShapeDifference(own, others, own) == platform::noErr;
        case REGION_COMBINE_OR:
            return platform::HIShapeUnion(own, others, own) == platform::noErr;
        case REGION_COMBINE_XOR:
            return platform::HIShapeXor(own, others, own) == platform::noErr;
    }
    return false;
}

bool TVLRegion::TakeCopyOf(const platform::HIShape* shape) noexcept {
    platform::HIMutableShapeRef copy = platform::HIShapeCreateMutableCopy(shape);
    if (copy == nullptr)
        return false;
    m_hShape = std::move(copy);
    return true;
}

bool TVLRegion::ProjectRgn(const TVLRect& origin, float scale) noexcept {
    std::vector<TVLRect> rects;
    const bool isLost = !GetRects(rects) && m_hShape != nullptr;
    for (TVLRect& rect : rects)
        rect = Project(rect, origin, scale);
    m_hShape = isLost ? nullptr : UnionOf(rects.data(), rects.size());
    return true;
}

std::string TVLRegion::ToString() const noexcept {
    try {
        std::vector<TVLRect> rects;
        GetRects(rects);
        std::string text = "{ region:{size:" + std::to_string(rects.size()) + ",rects:[";
        for (const TVLRect& rect : rects)
            text += "{" + ShareUtil::TVLRectToString(rect) + "},\n";
        return text + "]}}";
    } catch (const std::bad_alloc&) {
        return {};
    }
}
