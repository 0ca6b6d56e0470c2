// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/core_types.h"

#include <memory>

namespace platform {

/// A rectilinear area of the plane: a set of whole units, kept as rectangles.
///
/// Rectangles come and go as CGRect. A shape keeps whole edges only: left = x, top = y, right = x + width,
/// bottom = y + height, each added in single precision, cut toward zero and held within 32 bits; so edges
/// beyond 2^24 lose precision. A rectangle whose right isn't beyond its left, or whose bottom isn't below its
/// top, covers nothing. Two shapes that cover the same units hold the same rectangles, however they came
/// about.
///
/// Ownership: a handle owns its shape; operations borrow it. They take null: see each.
/// Threads:   one at a time for a shape that is written; a shape that nobody writes may be read by many.
/// Errors:    noErr; paramErr for a null shape; memFullErr. After an error the result shape is as it was.
class HIShape;

struct HIShapeRelease {
    void operator()(const HIShape* shape) const noexcept;
};

using HIShapeRef = std::unique_ptr<const HIShape, HIShapeRelease>;
using HIMutableShapeRef = std::unique_ptr<HIShape, HIShapeRelease>;

/// Null when there is no memory.
HIShapeRef HIShapeCreateWithRect(const CGRect& rect) noexcept;
HIMutableShapeRef HIShapeCreateMutable() noexcept;
/// Independent of the original. Null when that is null, too.
HIMutableShapeRef HIShapeCreateMutableCopy(const HIShape* original) noexcept;

/// Null counts as empty.
bool HIShapeIsEmpty(const HIShape* shape) noexcept;

/// The smallest rectangle around the shape, all zeros when it is empty. Gives `bounds`; null for a null
/// shape, and `bounds` is untouched.
CGRect* HIShapeGetBounds(const HIShape* shape, CGRect* bounds) noexcept;

OSStatus HIShapeSetEmpty(HIShape* shape) noexcept;
OSStatus HIShapeUnionWithRect(HIShape* shape, const CGRect& rect) noexcept;

/// `result` may be one of the operands.
OSStatus HIShapeIntersect(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept;
OSStatus HIShapeUnion(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept;
/// What `shape1` covers and `shape2` doesn't.
OSStatus HIShapeDifference(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept;
/// What just one of the two covers.
OSStatus HIShapeXor(const HIShape* shape1, const HIShape* shape2, HIShape* result) noexcept;

/// What an enumeration tells.
enum HIShapeEnumerateMessage : int {
    kHIShapeEnumerateInit = 1,      ///< First; no rectangle.
    kHIShapeEnumerateRect = 2,      ///< Once for each rectangle.
    kHIShapeEnumerateTerminate = 3, ///< Last, also after a stop; no rectangle.
};

/// The order of an enumeration. No other is offered.
constexpr unsigned kHIShapeParseFromTopLeft = 0;

/// `rect` lives for the call and is null when the message has none. Anything but noErr stops the enumeration.
/// It must not throw and must not change the shape.
using HIShapeEnumerateProcPtr = OSStatus (*)(HIShapeEnumerateMessage message, const HIShape* shape,
                                             const CGRect* rect, void* refcon);

/// Tells the rectangles that the shape is made of: bands from top to bottom, as tall as they can be, and in a
/// band from left to right, as wide as they can be. They do not overlap. Gives what stopped it: the
/// callback's answer or paramErr for a null shape, a null callback or another order.
OSStatus HIShapeEnumerate(const HIShape* shape, unsigned options, HIShapeEnumerateProcPtr proc,
                          void* refcon) noexcept;

} // namespace platform
