// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <optional>
#include <set>
#include <string>
#include <vector>

/// Checks of what window servers give out. The conformance cases use them on servers that should pass, and
/// tests of lying servers on those that must not.

/// The bits of a pixel as 0xAARRGGBB, premultiplied; X counts as opaque.
inline std::uint32_t ArgbAt(const platform::Picture& picture, int x, int y) {
    using platform::PixelFormat;
    const std::uint8_t* const p =
        picture.pixels + static_cast<std::size_t>(y) * picture.stride + static_cast<std::size_t>(x) * 4;
    const auto argb = [](unsigned alpha, unsigned red, unsigned green, unsigned blue) {
        return alpha << 24 | red << 16 | green << 8 | blue;
    };
    switch (picture.format) {
        case PixelFormat::BGRX:
            return argb(255, p[2], p[1], p[0]);
        case PixelFormat::BGRA:
            return argb(p[3], p[2], p[1], p[0]);
        case PixelFormat::RGBX:
            return argb(255, p[0], p[1], p[2]);
        case PixelFormat::RGBA:
            return argb(p[3], p[0], p[1], p[2]);
        case PixelFormat::X2R10G10B10: {
            const unsigned word = p[0] | static_cast<unsigned>(p[1]) << 8 |
                                  static_cast<unsigned>(p[2]) << 16 | static_cast<unsigned>(p[3]) << 24;
            return argb(255, word >> 22 & 0xFF, word >> 12 & 0xFF, word >> 2 & 0xFF);
        }
    }
    return 0;
}

/// All rows, without what lies behind them.
inline std::vector<std::uint32_t> PixelsOf(const platform::Picture& picture) {
    std::vector<std::uint32_t> pixels;
    for (int y = 0; y < picture.height; ++y) {
        for (int x = 0; x < picture.width; ++x)
            pixels.push_back(ArgbAt(picture, x, y));
    }
    return pixels;
}

/// What a picture of the desktop shows at a point of it.
inline std::uint32_t ArgbAtPoint(const platform::Picture& picture, const platform::CGPoint& point) {
    const int x = static_cast<int>((point.x - picture.rect.origin.x) * picture.scale);
    const int y = static_cast<int>((point.y - picture.rect.origin.y) * picture.scale);
    return ArgbAt(picture, x, y);
}

inline testing::AssertionResult Shows(const platform::Picture& picture, std::uint32_t rgb) {
    for (const std::uint32_t pixel : PixelsOf(picture)) {
        if (pixel != (0xFF000000U | rgb))
            return testing::AssertionFailure() << "a pixel is " << std::hex << pixel << ", not " << rgb;
    }
    return testing::AssertionSuccess();
}

inline testing::AssertionResult IsLawful(const platform::Picture& picture) {
    const auto wide = static_cast<float>(picture.width);
    const auto high = static_cast<float>(picture.height);
    if (picture.width < 1 || picture.height < 1 || picture.pixels == nullptr || picture.memory == nullptr)
        return testing::AssertionFailure() << "a picture without pixels";
    if (picture.stride < static_cast<std::size_t>(picture.width) * 4)
        return testing::AssertionFailure() << "rows that overlap";
    if (!(picture.scale > 0) || std::abs(picture.rect.size.width * picture.scale - wide) > 1 ||
        std::abs(picture.rect.size.height * picture.scale - high) > 1)
        return testing::AssertionFailure() << "size, rectangle and scale don't go together";
    for (const platform::PixelRect& rect : picture.changed) {
        if (rect.left < 0 || rect.top < 0 || rect.right > picture.width || rect.bottom > picture.height ||
            rect.left >= rect.right || rect.top >= rect.bottom)
            return testing::AssertionFailure() << "a change outside the picture, or an empty one";
    }
    return testing::AssertionSuccess();
}

inline testing::AssertionResult IsLawful(const platform::DisplayList& displays) {
    std::set<platform::CGDirectDisplayID> ids;
    for (const platform::DisplayInfo& display : displays) {
        if (display.id == 0 || display.id == ~0U || !ids.insert(display.id).second)
            return testing::AssertionFailure() << "display id " << display.id;
        const platform::CGRect& all = display.bounds;
        const platform::CGRect& part = display.visibleBounds;
        if (part.origin.x < all.origin.x || part.origin.y < all.origin.y ||
            part.origin.x + part.size.width > all.origin.x + all.size.width ||
            part.origin.y + part.size.height > all.origin.y + all.size.height)
            return testing::AssertionFailure() << "more is visible than there is of display " << display.id;
        if (!(all.size.width > 0) || !(all.size.height > 0) || !(display.scale > 0))
            return testing::AssertionFailure() << "display " << display.id << " has no size";
        if (display.productName.empty())
            return testing::AssertionFailure() << "display " << display.id << " has no name";
    }
    if (!displays.empty() && displays[0].bounds.origin != platform::CGPoint{})
        return testing::AssertionFailure() << "the main display isn't the origin";
    return testing::AssertionSuccess();
}

inline testing::AssertionResult IsLawful(const platform::WindowSnapshot& snapshot) {
    std::set<platform::CGWindowID> ids;
    for (const platform::WindowInfo& window : snapshot.Windows()) {
        if (window.id == 0 || !ids.insert(window.id).second)
            return testing::AssertionFailure() << "window id " << window.id;
        if (!(window.alpha >= 0) || !(window.alpha <= 1))
            return testing::AssertionFailure() << "window " << window.id << " has alpha " << window.alpha;
        if (snapshot.Find(window.id) != &window)
            return testing::AssertionFailure() << "window " << window.id << " isn't found";
    }
    return testing::AssertionSuccess();
}

/// Whether two snapshots tell alike who covers whom.
inline bool SameStack(const platform::WindowSnapshot& one, const platform::WindowSnapshot& other) {
    return std::equal(
        one.Windows().begin(), one.Windows().end(), other.Windows().begin(), other.Windows().end(),
        [](const platform::WindowInfo& a, const platform::WindowInfo& b) {
            return a.id == b.id && a.owner == b.owner && a.level == b.level && a.alpha == b.alpha &&
                   a.frame == b.frame && a.sharing == b.sharing && a.onScreen == b.onScreen;
        });
}

/// A picture of windows against what was asked for and against the stack that it claims to show. Nothing is
/// said where the stack has gone on since.
inline testing::AssertionResult IsLawful(const platform::WindowPicture& picture,
                                         const platform::WindowPictureRequest& request,
                                         const platform::WindowSnapshot& snapshot) {
    if (picture.generation != snapshot.Generation())
        return testing::AssertionSuccess();
    const platform::WindowInfo* behind = nullptr;
    for (const platform::PictureLayer& layer : picture.layers) {
        const platform::WindowInfo* const window = snapshot.Find(layer.window);
        if (std::count(request.windows.begin(), request.windows.end(), layer.window) == 0)
            return testing::AssertionFailure() << "window " << layer.window << " wasn't asked for";
        if (window == nullptr || window->sharing == platform::SharingState::None)
            return testing::AssertionFailure() << "window " << layer.window << " may not be shown";
        if (layer.picture == nullptr)
            return testing::AssertionFailure() << "a layer without a picture";
        if (const auto lawful = IsLawful(*layer.picture); !lawful)
            return lawful;
        if (request.options == platform::WindowPictureBoundsIgnoreFraming && layer.frame != window->frame)
            return testing::AssertionFailure() << "window " << layer.window << " lies elsewhere";
        if (layer.alpha != window->alpha || (!window->onScreen && !layer.stale))
            return testing::AssertionFailure() << "window " << layer.window << " looks different";
        if (behind != nullptr && window >= behind)
            return testing::AssertionFailure() << "window " << layer.window << " isn't further in front";
        behind = window;
    }
    return testing::AssertionSuccess();
}

/// Looks at a stream like somebody who keeps a copy and only touches what has changed.
class StreamCopy {
public:
    /// Whether the copy is like the picture once the changes are copied.
    testing::AssertionResult Take(const platform::Picture& picture) {
        const std::vector<std::uint32_t> now = PixelsOf(picture);
        if (m_pixels.size() != now.size() || m_width != picture.width) {
            m_pixels.assign(now.size(), 0x12345678); // no opaque pixel, so nothing passes by chance
            m_width = picture.width;
        }
        for (const platform::PixelRect& rect : picture.changed) {
            for (int y = rect.top; y < rect.bottom; ++y) {
                for (int x = rect.left; x < rect.right; ++x)
                    m_pixels[Place(x, y)] = now[Place(x, y)];
            }
        }
        if (m_pixels != now)
            return testing::AssertionFailure() << "something is different that isn't told";
        return testing::AssertionSuccess();
    }

private:
    std::size_t Place(int x, int y) const {
        return static_cast<std::size_t>(y) * static_cast<std::size_t>(m_width) + static_cast<std::size_t>(x);
    }

    std::vector<std::uint32_t> m_pixels;
    int m_width = 0;
};
