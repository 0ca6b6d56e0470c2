// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>

/// Geometry and identities of the window server's world.
/// Unit: points of one global space, origin at the top left of the main display, y growing downwards.
namespace platform {

using CGFloat = float;

struct CGPoint {
    CGFloat x = 0;
    CGFloat y = 0;

    bool operator==(const CGPoint&) const = default;
};

struct CGSize {
    CGFloat width = 0;
    CGFloat height = 0;

    bool operator==(const CGSize&) const = default;
};

struct CGRect {
    CGPoint origin;
    CGSize size;

    bool operator==(const CGRect&) const = default;
};

/// Result of an operation; 0 is success.
using OSStatus = std::int32_t;

constexpr OSStatus noErr = 0;
constexpr OSStatus paramErr = -50;
constexpr OSStatus memFullErr = -108;

/// Never 0 and never all bits set.
using CGDirectDisplayID = std::uint32_t;
/// Never 0.
using CGWindowID = std::uint32_t;

} // namespace platform
