// SPDX-License-Identifier: Apache-2.0
#pragma once

#include "platform/window_server.h"

#include <cstdint>
#include <memory>
#include <optional>

/// The pointer in pictures of displays: what is fetched from the server never has it.
namespace platform::x11 {

/// How the pointer lies in a picture.
struct DrawnPointer {
    std::shared_ptr<const CursorImage> cursor; ///< Null when the pointer isn't in the picture.
    PixelRect rect;                            ///< Of the cursor, in pixels of the picture; may reach out.

    bool operator==(const DrawnPointer&) const = default;
};

/// `place` is that of the picture in the root, `pointer` the pointer's there.
DrawnPointer PointerIn(const PixelRect& place, const std::optional<CGPoint>& pointer,
                       const std::shared_ptr<const CursorImage>& cursor);

/// Draws it into the pixels of a picture: over them, by its alpha.
void DrawPointer(const DrawnPointer& pointer, const Picture& picture, std::uint8_t* pixels);

} // namespace platform::x11
